// The one reading of a request head that the host accepts: RFC 9112's
// grammar, applied strictly to the bytes as received, before the HTTP
// library parses them its own, more forgiving, way. A head that a proxy in
// front could read as something else (whitespace before a colon, a second
// Host, an odd Content-Length or transfer coding, control bytes, folded
// lines) is refused, never guessed at, so that the host and any proxy always
// agree on where each request starts and ends.
//
// Thread-safety: pure functions of their arguments.
#ifndef WS_RUNTIME_HOST_HEAD_RULES_H_
#define WS_RUNTIME_HOST_HEAD_RULES_H_

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace ws::host {

enum class Refusal : uint8_t {
  kNone,
  kMalformedRequestLine,
  kMalformedField,
  kMissingHost,
  kRepeatedHost,
  kInvalidLength,
  kConflictingLength,
  kLengthWithChunked,
  kChunkedNotFinal,
  kUnknownCoding,
  kVersion,
  kHeadTooLarge,
  kMalformedChunk,
};

// The status line's code and the text body of a refusal.
unsigned refusalStatus(Refusal refusal);
std::string_view refusalText(Refusal refusal);

struct HeadLimits {
  size_t maxBytes;   // the whole head, request line to the empty line
  size_t maxMemory;  // what the library keeps of it (the request line
                     // without its query, and the fields it needs, plus a
                     // record per field) in a connection's memory
  size_t fieldRecordBytes;
};

// RFC 9110 5.6.2: a non-empty run of token characters (field names,
// methods, codings).
bool isToken(std::string_view text);
// Field values, chunk extensions and trailer values: visible characters,
// spaces, tabs and obs-text; a NUL, a bare CR or any other control byte
// could end the value early for one reader and not for another.
bool isFieldText(std::string_view text);

// Whether the HTTP library, or the host through it, needs the field: the
// ones that frame the message or the connection, and the two the plug-in
// reads. The others are checked and then left out of what the library
// sees, so that its small per-connection memory holds any head within the
// limit.
bool libraryNeeds(std::string_view name);

// What a valid head says about what follows it.
struct HeadReading {
  Refusal refusal = Refusal::kNone;
  bool chunked = false;
  uint64_t length = 0;  // of the body, when not chunked
  // An absolute-form target ("http://host/path?q") is routed by its path:
  // the bytes [eraseFrom, eraseTo) of the request line (its scheme and
  // authority) go, and when the target has no path a "/" takes their place.
  // eraseTo is 0 for any other target.
  size_t eraseFrom = 0;
  size_t eraseTo = 0;
  bool slash = false;
  // The target's query, from its '?' to the end of the target: [queryFrom,
  // queryTo) of the request line, kept apart from what the library sees, so
  // that a long query never counts against its memory. queryTo is 0 when the
  // target has no '?'.
  size_t queryFrom = 0;
  size_t queryTo = 0;
  // Whether every field is one the library needs (libraryNeeds), so that
  // the head can pass as it is.
  bool allNeeded = true;
  // Whether the head has a field the host reads itself (Accept,
  // Content-Type, Content-Length or Expect): a head without one needs no
  // walk over its fields once the library has parsed it.
  bool hostReads = false;
};

// Reads `head`: the request line and the field lines, each with its line
// end (CRLF, or a bare LF), without the empty line that ends the head.
[[nodiscard]] HeadReading readHead(std::string_view head, const HeadLimits& limits);

// The length of the head at the start of `bytes`, its empty line included,
// or 0 when `bytes` holds no complete head yet. `from` is where the search
// may resume (bytes before it held no end).
size_t findHeadEnd(std::string_view bytes, size_t from = 0);

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_HEAD_RULES_H_
