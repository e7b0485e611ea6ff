// One connection's request stream as the host reads it, between the socket
// and the HTTP library: every head is held back until it is complete and has
// passed the host's head rules (and reaches the library with only the
// fields it needs), and every body is followed to its end (by its
// Content-Length, or chunk by chunk), so that the next head is looked for
// exactly where a proxy in front would look for it. The library only ever
// parses heads and chunk lines that the rules accepted. A refused head
// reaches the library as a short stand-in request, which the host answers
// with the refusal and a close; a malformed chunk ends the body early, and
// that request is refused the same way. Nothing after a refusal is passed on.
//
// Each head's query is kept apart, in the guard, and the library sees the
// request line without it: its per-connection memory then holds the path
// and the fields it needs, however long the query.
//
// The library expects recv()'s contract, read-readiness included: a read
// shorter than asked means the socket is drained. read() keeps that promise:
// it returns less than asked only after the socket itself returned less.
//
// Thread-safety: one connection's reads come from one thread at a time;
// received() may be read from any thread.
#ifndef WS_RUNTIME_HOST_STREAM_GUARD_H_
#define WS_RUNTIME_HOST_STREAM_GUARD_H_

#include <sys/types.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "head_rules.h"

namespace ws::host {

class StreamGuard {
 public:
  // Reads at most `size` bytes into `buffer` as recv() does (errno set when
  // it returns -1).
  using Source = ssize_t (*)(void* context, char* buffer, size_t size);

  explicit StreamGuard(const HeadLimits& limits) : limits_(limits) {}

  // recv() for the library: at most `size` bytes of the stream it may see.
  ssize_t read(char* buffer, size_t size, Source source, void* context);

  // The refusal of the `head`-th head (counted from 1) handed to the
  // library, if that head or its body was refused.
  Refusal refusalFor(uint64_t head) const { return head == refusedHead_ ? refusal_ : Refusal::kNone; }
  // What the guard noted of a head for the host.
  struct HeadNotes {
    bool hasQuery = false;  // its target had a '?'
    bool hostReads = false;  // as in HeadReading
  };
  // The notes of the `head`-th head, its query moved into `query` when it
  // has one. Heads are asked for in order; the notes of earlier heads are
  // forgotten.
  [[nodiscard]] HeadNotes takeNotes(uint64_t head, std::string& query);
  // The request line of a refused head, for the access log.
  const std::string& refusedMethod() const { return refusedMethod_; }
  const std::string& refusedTarget() const { return refusedTarget_; }
  // Whether the client has ended its side of the stream (or reset it).
  bool peerClosed() const { return peerClosed_; }
  // Bytes taken from the socket so far.
  const std::atomic<uint64_t>& receivedCounter() const { return received_; }

 private:
  enum class State : uint8_t { kHead, kBody, kChunkSize, kChunkData, kChunkEnd, kTrailer, kRefused };

  // Turns data[0, size) into what the library may read, in place, and
  // returns its length; data[consumed, size) is an unfinished head or chunk
  // line to be kept until more arrives.
  size_t process(char* data, size_t size, size_t& consumed);
  // Each takes one unit at data[at]; false when it needs more bytes.
  bool takeHead(char* data, size_t size, size_t& at, size_t& out);
  // Writes the head as the library is to see it at `to` (never past the
  // head's own bytes) and returns the end of what it wrote.
  char* passHead(const char* head, size_t length, const HeadReading& reading, char* to);
  bool takeChunkLine(char* data, size_t size, size_t& at, size_t& out);
  bool takeTrailerLine(char* data, size_t size, size_t& at, size_t& out);
  void refuseHead(Refusal refusal, std::string_view head);
  void refuseBody();
  // Copies into the caller's buffer while room lasts, the rest into pending_.
  void emit(const char* data, size_t length);

  struct Noted {
    uint64_t head;
    HeadNotes notes;
    std::string query;
  };

  const HeadLimits limits_;
  State state_ = State::kHead;
  uint64_t remaining_ = 0;  // of the body or of the current chunk
  size_t scanned_ = 0;      // of held_, when it holds a head with no end yet
  size_t trailerBytes_ = 0;
  uint64_t heads_ = 0;  // handed to the library
  uint64_t refusedHead_ = 0;
  Refusal refusal_ = Refusal::kNone;
  std::string refusedMethod_;
  std::string refusedTarget_;
  // Notes of the heads passed on and not yet taken, from notedFront_: more
  // than one only when the client pipelines. A head with nothing to note
  // (no query, no field the host reads) has none.
  std::vector<Noted> noted_;
  size_t notedFront_ = 0;
  size_t queryBytes_ = 0;
  std::string_view inject_;  // a stand-in to follow the output of process()
  std::string held_;     // an unfinished unit, not yet shown to the library
  std::string pending_;  // shown next, before anything new is read
  size_t pendingAt_ = 0;
  bool peerClosed_ = false;
  std::atomic<uint64_t> received_{0};
  // The caller's buffer during read().
  char* out_ = nullptr;
  size_t outSize_ = 0;
  size_t outUsed_ = 0;
};

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_STREAM_GUARD_H_
