#include "stream_guard.h"

#include <cerrno>
#include <cstdio>
#include <cstring>

namespace ws::host {

namespace {

// What the library parses in place of a refused head: it then calls the host
// as for any request, and the host answers with the refusal.
constexpr std::string_view kStandIn = "GET / HTTP/1.1\r\nHost: -\r\n\r\n";
// Chunk lines are a size and at most a few extensions.
constexpr size_t kMaxChunkLine = 4096;
// The queries of pipelined heads wait in the guard until their requests
// begin; a client that sends more than this ahead gets 431 for the head
// that would exceed it. One head's query alone always fits.
constexpr size_t kMaxQueuedQueryBytes = 64 * 1024;
// Kept of a refused request line for the access log, which cuts at 1024.
constexpr size_t kMaxLoggedLine = 1025;

bool isHexDigit(char c) {
  return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'f') || (c >= 'A' && c <= 'F');
}

unsigned hexValue(char c) {
  if (c <= '9') return static_cast<unsigned>(c - '0');
  return static_cast<unsigned>((c | 0x20) - 'a' + 10);
}

// The line at data[at, size) without its CRLF; false with `length` 0 when no
// LF has come yet, false with a length when the line does not end in CRLF.
bool crlfLine(const char* data, size_t size, size_t at, std::string_view& line, size_t& length) {
  const auto* lf = static_cast<const char*>(std::memchr(data + at, '\n', size - at));
  length = 0;
  if (lf == nullptr) return false;
  length = static_cast<size_t>(lf - (data + at)) + 1;
  if (length < 2 || lf[-1] != '\r') return false;
  line = std::string_view(data + at, length - 2);
  return line.find('\r') == std::string_view::npos;
}

// A slow client's head can make a buffer grow to the head limit once; an
// idle connection should not keep that for the rest of its life.
void releaseIfLarge(std::string& buffer) {
  if (buffer.capacity() > 4096) std::string().swap(buffer);
  buffer.clear();
}

}  // namespace

ssize_t StreamGuard::read(char* buffer, size_t size, Source source, void* context) {
  out_ = buffer;
  outSize_ = size;
  outUsed_ = 0;
  if (pendingAt_ < pending_.size()) {
    const size_t n = std::min(size, pending_.size() - pendingAt_);
    std::memcpy(buffer, pending_.data() + pendingAt_, n);
    pendingAt_ += n;
    outUsed_ = n;
    if (pendingAt_ == pending_.size()) {
      releaseIfLarge(pending_);
      pendingAt_ = 0;
    }
  }
  while (state_ != State::kRefused && outUsed_ < size) {
    char* space = buffer + outUsed_;
    const size_t room = size - outUsed_;
    const ssize_t got = source(context, space, room);
    if (got <= 0) {
      if (got == 0 || (errno != EAGAIN && errno != EWOULDBLOCK && errno != EINTR)) {
        peerClosed_ = true;
      }
      // The end of the stream or the error shows again on the next call.
      if (outUsed_ > 0) return static_cast<ssize_t>(outUsed_);
      return got;
    }
    received_.fetch_add(static_cast<uint64_t>(got), std::memory_order_relaxed);
    size_t consumed = 0;
    if (held_.empty()) {
      outUsed_ += process(space, static_cast<size_t>(got), consumed);
      if (consumed < static_cast<size_t>(got)) {
        held_.assign(space + consumed, static_cast<size_t>(got) - consumed);
      }
    } else {
      held_.append(space, static_cast<size_t>(got));
      const size_t produced = process(held_.data(), held_.size(), consumed);
      emit(held_.data(), produced);
      held_.erase(0, consumed);
      if (held_.empty()) releaseIfLarge(held_);
    }
    if (!inject_.empty()) {
      emit(inject_.data(), inject_.size());
      inject_ = {};
    }
    if (static_cast<size_t>(got) < room) break;  // the socket is drained
  }
  if (outUsed_ == 0) {
    errno = EAGAIN;
    return -1;
  }
  return static_cast<ssize_t>(outUsed_);
}

void StreamGuard::emit(const char* data, size_t length) {
  const size_t fits = std::min(length, outSize_ - outUsed_);
  std::memmove(out_ + outUsed_, data, fits);
  outUsed_ += fits;
  if (fits < length) pending_.append(data + fits, length - fits);
}

size_t StreamGuard::process(char* data, size_t size, size_t& consumed) {
  size_t at = 0;
  size_t out = 0;
  bool complete = true;
  while (at < size && complete) {
    switch (state_) {
      case State::kHead:
        complete = takeHead(data, size, at, out);
        break;
      case State::kBody:
      case State::kChunkData: {
        const size_t take = static_cast<size_t>(std::min<uint64_t>(remaining_, size - at));
        std::memmove(data + out, data + at, take);
        out += take;
        at += take;
        remaining_ -= take;
        if (remaining_ == 0) state_ = state_ == State::kBody ? State::kHead : State::kChunkEnd;
        break;
      }
      case State::kChunkSize:
        complete = takeChunkLine(data, size, at, out);
        break;
      case State::kChunkEnd:
        if (size - at < 2) {
          if (data[at] != '\r') refuseBody();
          complete = state_ == State::kRefused;
          break;
        }
        if (data[at] != '\r' || data[at + 1] != '\n') {
          refuseBody();
          break;
        }
        data[out++] = '\r';
        data[out++] = '\n';
        at += 2;
        state_ = State::kChunkSize;
        break;
      case State::kTrailer:
        complete = takeTrailerLine(data, size, at, out);
        break;
      case State::kRefused:
        at = size;
        break;
    }
  }
  consumed = state_ == State::kRefused ? size : at;
  return out;
}

bool StreamGuard::takeHead(char* data, size_t size, size_t& at, size_t& out) {
  if (scanned_ == 0) {
    // Empty lines before a request line are ignored (RFC 9112 2.2).
    while (at < size && (data[at] == '\r' || data[at] == '\n')) ++at;
    if (at == size) return true;
  }
  const std::string_view rest(data + at, size - at);
  const size_t end = findHeadEnd(rest, scanned_);
  if (end == 0) {
    // Past the limit and the empty line that would end it.
    if (rest.size() > limits_.maxBytes + 2) {
      refuseHead(Refusal::kHeadTooLarge, rest);
      return true;
    }
    scanned_ = rest.size();
    return false;
  }
  scanned_ = 0;
  const std::string_view head = rest.substr(0, end - (rest[end - 2] == '\n' ? 1 : 2));
  const HeadReading reading = readHead(head, limits_);
  if (reading.refusal != Refusal::kNone) {
    refuseHead(reading.refusal, head);
    return true;
  }
  if (reading.queryTo != 0 || reading.hostReads) {
    const size_t size = reading.queryTo != 0 ? reading.queryTo - reading.queryFrom - 1 : 0;
    if (notedFront_ < noted_.size() && queryBytes_ + size > kMaxQueuedQueryBytes) {
      refuseHead(Refusal::kHeadTooLarge, head);
      return true;
    }
    Noted& noted = noted_.emplace_back();
    noted.head = heads_ + 1;
    noted.notes = HeadNotes{reading.queryTo != 0, reading.hostReads};
    if (size != 0) noted.query.assign(head.substr(reading.queryFrom + 1, size));
    queryBytes_ += size;
  }
  out = passHead(data + at, end, reading, data + out) - data;
  at += end;
  ++heads_;
  remaining_ = reading.length;
  trailerBytes_ = 0;
  state_ = reading.chunked ? State::kChunkSize : remaining_ > 0 ? State::kBody : State::kHead;
  return true;
}

StreamGuard::HeadNotes StreamGuard::takeNotes(uint64_t head, std::string& query) {
  HeadNotes notes;
  while (notedFront_ < noted_.size() && noted_[notedFront_].head <= head) {
    Noted& front = noted_[notedFront_++];
    queryBytes_ -= front.query.size();
    if (front.head == head) {
      notes = front.notes;
      if (notes.hasQuery) query.swap(front.query);
      break;
    }
  }
  // A client that always keeps a head in flight never lets the list run
  // empty: what was taken goes once it is half of the list.
  if (notedFront_ == noted_.size()) {
    noted_.clear();
    notedFront_ = 0;
  } else if (notedFront_ >= 16 && notedFront_ * 2 >= noted_.size()) {
    noted_.erase(noted_.begin(), noted_.begin() + static_cast<std::ptrdiff_t>(notedFront_));
    notedFront_ = 0;
  }
  return notes;
}

char* StreamGuard::passHead(const char* head, size_t length, const HeadReading& reading, char* to) {
  if (reading.eraseTo == 0 && reading.queryTo == 0 && reading.allNeeded) {
    if (to != head) std::memmove(to, head, length);
    return to + length;
  }
  const auto copy = [&to, head](size_t from, size_t until) {
    std::memmove(to, head + from, until - from);
    to += until - from;
  };
  // The request line, routed by its path when it came in absolute form, and
  // without its query. Nothing is ever written past what is still to be
  // read: a "/" only replaces a scheme and authority.
  const size_t lineEnd = static_cast<size_t>(
      static_cast<const char*>(std::memchr(head, '\n', length)) - head) + 1;
  size_t from = 0;
  if (reading.eraseTo != 0) {
    copy(0, reading.eraseFrom);
    if (reading.slash) *to++ = '/';
    from = reading.eraseTo;
  }
  if (reading.queryTo != 0) {
    copy(from, reading.queryFrom);
    from = reading.queryTo;
  }
  copy(from, lineEnd);
  // Then only the fields the library needs, and the empty line.
  for (size_t at = lineEnd; at < length;) {
    const size_t end = static_cast<size_t>(
        static_cast<const char*>(std::memchr(head + at, '\n', length - at)) - head) + 1;
    const std::string_view line(head + at, end - at);
    if (line.size() <= 2 || libraryNeeds(line.substr(0, line.find(':')))) {
      std::memmove(to, line.data(), line.size());
      to += line.size();
    }
    at = end;
  }
  return to;
}

bool StreamGuard::takeChunkLine(char* data, size_t size, size_t& at, size_t& out) {
  std::string_view line;
  size_t length = 0;
  if (!crlfLine(data, size, at, line, length)) {
    if (length == 0 && size - at <= kMaxChunkLine) return false;
    refuseBody();
    return true;
  }
  size_t digits = 0;
  uint64_t value = 0;
  size_t significant = 0;
  while (digits < line.size() && isHexDigit(line[digits])) {
    if (value != 0 || line[digits] != '0') ++significant;
    value = value * 16 + hexValue(line[digits]);
    ++digits;
  }
  // Chunk extensions (RFC 9112 7.1.1) are allowed and dropped: the host has
  // no use for them.
  std::string_view extensions = line.substr(digits);
  while (!extensions.empty() && (extensions.front() == ' ' || extensions.front() == '\t')) {
    extensions.remove_prefix(1);
  }
  if (digits == 0 || significant > 15 || length > kMaxChunkLine ||
      (!extensions.empty() && (extensions.front() != ';' || !isFieldText(extensions)))) {
    refuseBody();
    return true;
  }
  char normal[24];
  const int written =
      std::snprintf(normal, sizeof normal, "%llx\r\n", static_cast<unsigned long long>(value));
  std::memmove(data + out, normal, static_cast<size_t>(written));
  out += static_cast<size_t>(written);
  at += length;
  remaining_ = value;
  state_ = value == 0 ? State::kTrailer : State::kChunkData;
  return true;
}

bool StreamGuard::takeTrailerLine(char* data, size_t size, size_t& at, size_t& out) {
  std::string_view line;
  size_t length = 0;
  const bool whole = crlfLine(data, size, at, line, length);
  if (!whole && length == 0 && trailerBytes_ + (size - at) <= limits_.maxBytes) return false;
  trailerBytes_ += length;
  const size_t colon = line.find(':');
  if (!whole || trailerBytes_ > limits_.maxBytes ||
      (!line.empty() && (colon == std::string_view::npos || !isToken(line.substr(0, colon)) ||
                         !isFieldText(line.substr(colon + 1))))) {
    refuseBody();
    return true;
  }
  at += length;
  if (line.empty()) {
    // Trailer fields are dropped: the host has no use for them either.
    data[out++] = '\r';
    data[out++] = '\n';
    state_ = State::kHead;
  }
  return true;
}

void StreamGuard::refuseHead(Refusal refusal, std::string_view head) {
  // The log shows what the line most likely meant: the method up to the
  // first space, the target up to the version.
  std::string_view line = head.substr(0, std::min(head.find('\n'), kMaxLoggedLine));
  if (!line.empty() && line.back() == '\r') line.remove_suffix(1);
  const size_t space = std::min(line.find(' '), line.size());
  refusedMethod_.assign(line.substr(0, space));
  std::string_view target = line.substr(std::min(space + 1, line.size()));
  const size_t last = target.rfind(' ');
  if (last != std::string_view::npos && target.substr(last + 1, 5) == "HTTP/") {
    target = target.substr(0, last);
  }
  refusedTarget_.assign(target);
  ++heads_;
  refusedHead_ = heads_;
  refusal_ = refusal;
  inject_ = kStandIn;
  state_ = State::kRefused;
}

void StreamGuard::refuseBody() {
  // Whatever part of the body the library has seen, this ends it where it
  // stands, so that its parser never meets the malformed bytes.
  if (state_ == State::kChunkSize) {
    inject_ = "0\r\n\r\n";
  } else if (state_ == State::kChunkEnd) {
    inject_ = "\r\n0\r\n\r\n";
  } else {
    inject_ = "\r\n";
  }
  refusedHead_ = heads_;
  refusal_ = Refusal::kMalformedChunk;
  state_ = State::kRefused;
}

}  // namespace ws::host
