#include "head_rules.h"

#include <cstring>

#include "request_head.h"

namespace ws::host {

namespace {

bool isDigit(unsigned char c) { return c >= '0' && c <= '9'; }
bool isAlpha(unsigned char c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z'); }

// What each byte may be, as one table, because every byte of every head
// is looked up in it: a token character (RFC 9110 5.6.2: field names,
// methods, codings), field text (visible characters, SP, HTAB, obs-text),
// or a byte that may stand in a request target.
enum CharClass : uint8_t { kToken = 1, kFieldText = 2, kTargetChar = 4 };
struct CharTable {
  uint8_t bits[256] = {};
  constexpr CharTable() {
    for (int c = 0; c < 256; ++c) {
      if (c == '\t' || (c >= 0x20 && c != 0x7F)) bits[c] |= kFieldText;
      if (c > 0x20 && c != 0x7F) bits[c] |= kTargetChar;
    }
    for (int c = '0'; c <= '9'; ++c) bits[c] |= kToken;
    for (int c = 'a'; c <= 'z'; ++c) bits[c] |= kToken, bits[c - 'a' + 'A'] |= kToken;
    for (const char c : std::string_view("!#$%&'*+-.^_`|~")) bits[static_cast<unsigned char>(c)] |= kToken;
  }
};
constexpr CharTable kChars;

bool is(char c, CharClass cls) { return (kChars.bits[static_cast<unsigned char>(c)] & cls) != 0; }

// Skips whole 8-byte words of `text` from `at` that hold no byte below
// `limit` (at most 0x80) and no DEL: where most of a target or a field value
// passes at a few instructions a word, before the byte-wise scan finds
// where it ends. A byte above 0x7F never stops it.
size_t skipPlainWords(std::string_view text, size_t at, uint8_t limit) {
  constexpr uint64_t kOnes = 0x0101010101010101ULL;
  constexpr uint64_t kHighs = 0x8080808080808080ULL;
  while (at + 8 <= text.size()) {
    uint64_t word;
    std::memcpy(&word, text.data() + at, 8);
    const uint64_t del = word ^ (kOnes * 0x7F);
    if ((((word - kOnes * limit) & ~word) | ((del - kOnes) & ~del)) & kHighs) break;
    at += 8;
  }
  return at;
}

// The end of a line at `at`, just past its LF: CRLF, or a bare LF; 0 when
// anything else follows, or nothing.
size_t lineEndAt(std::string_view head, size_t at) {
  if (at < head.size() && head[at] == '\n') return at + 1;
  if (at + 1 < head.size() && head[at] == '\r' && head[at + 1] == '\n') return at + 2;
  return 0;
}

struct RequestLine {
  Refusal refusal = Refusal::kNone;
  size_t methodEnd = 0;
  size_t targetStart = 0;
  size_t targetEnd = 0;
  bool http11 = false;
};

// method SP request-target SP HTTP-version, one space each (RFC 9112 3);
// returns where the line ends, past its LF.
size_t readRequestLine(std::string_view head, RequestLine& parsed) {
  parsed.refusal = Refusal::kMalformedRequestLine;
  size_t at = 0;
  while (at < head.size() && is(head[at], kToken)) ++at;
  if (at == 0 || at == head.size() || head[at] != ' ') return 0;
  parsed.methodEnd = at;
  parsed.targetStart = ++at;
  at = skipPlainWords(head, at, 0x21);
  while (at < head.size() && is(head[at], kTargetChar)) ++at;
  if (at == parsed.targetStart || at == head.size() || head[at] != ' ') return 0;
  parsed.targetEnd = at++;
  const std::string_view version = head.substr(at, 8);
  if (version.size() != 8 || version.substr(0, 5) != "HTTP/" || !isDigit(version[5]) ||
      version[6] != '.' || !isDigit(version[7])) {
    return 0;
  }
  const size_t end = lineEndAt(head, at + 8);
  if (end == 0) return 0;
  parsed.refusal = version[5] != '1' ? Refusal::kVersion : Refusal::kNone;
  parsed.http11 = version[7] != '0';
  return end;
}

// A field line, name and value, the value trimmed of spaces and tabs.
struct FieldLine {
  std::string_view name;
  std::string_view value;
  size_t length = 0;  // of the line without its line end
};

// Reads the field line at `at` and returns where the next one starts; 0 when
// the line is malformed: a name that is not a token or does not end at the
// colon (a line starting with a space or tab is an obs-fold, RFC 9112 5.2,
// refused rather than unfolded), a byte in the value that is not field
// text, or a CR anywhere but just before the LF.
size_t readFieldLine(std::string_view head, size_t at, FieldLine& field) {
  const size_t start = at;
  while (at < head.size() && is(head[at], kToken)) ++at;
  if (at == start || at == head.size() || head[at] != ':') return 0;
  field.name = head.substr(start, at - start);
  const size_t valueStart = ++at;
  at = skipPlainWords(head, at, 0x20);
  while (at < head.size() && is(head[at], kFieldText)) ++at;
  const size_t next = lineEndAt(head, at);
  if (next == 0) return 0;
  field.value = trimSpaces(head.substr(valueStart, at - valueStart));
  field.length = at - start;
  return next;
}

// Origin form as it is; absolute form ("scheme://authority/path?query",
// RFC 9112 3.2.2) by its path; "*" for OPTIONS only.
Refusal readTarget(std::string_view line, const RequestLine& parsed, HeadReading& reading) {
  const std::string_view target =
      line.substr(parsed.targetStart, parsed.targetEnd - parsed.targetStart);
  if (target.front() == '/') return Refusal::kNone;
  if (target == "*") {
    return line.substr(0, parsed.methodEnd) == "OPTIONS" ? Refusal::kNone
                                                         : Refusal::kMalformedRequestLine;
  }
  size_t i = 0;
  while (i < target.size() && (isAlpha(static_cast<unsigned char>(target[i])) ||
                               (i > 0 && (isDigit(static_cast<unsigned char>(target[i])) ||
                                          target[i] == '+' || target[i] == '-' ||
                                          target[i] == '.')))) {
    ++i;
  }
  if (i == 0 || target.substr(i, 3) != "://") return Refusal::kMalformedRequestLine;
  const size_t authority = i + 3;
  const size_t path = target.find_first_of("/?", authority);
  if (path == authority) return Refusal::kMalformedRequestLine;  // no host
  reading.eraseFrom = parsed.targetStart;
  if (path == std::string_view::npos || target[path] == '?') {
    reading.eraseTo = parsed.targetStart + (path == std::string_view::npos ? target.size() : path);
    reading.slash = true;
  } else {
    reading.eraseTo = parsed.targetStart + path;
  }
  return Refusal::kNone;
}

// kRead: needed by the library, and read by the host as well.
enum class Field : uint8_t { kOther, kNeeded, kRead, kHost, kContentLength, kTransferEncoding };

// One look at the first letter settles most names without a comparison.
Field classify(std::string_view name) {
  if (name.empty()) return Field::kOther;
  switch (name[0] | 0x20) {
    case 'a':
      return equalsIgnoringCase(name, "Accept") ? Field::kRead : Field::kOther;
    case 'c':
      if (name.size() == 14 && equalsIgnoringCase(name, "Content-Length")) return Field::kContentLength;
      if (equalsIgnoringCase(name, "Content-Type")) return Field::kRead;
      return equalsIgnoringCase(name, "Connection") ? Field::kNeeded : Field::kOther;
    case 'e':
      return equalsIgnoringCase(name, "Expect") ? Field::kRead : Field::kOther;
    case 'h':
      return equalsIgnoringCase(name, "Host") ? Field::kHost : Field::kOther;
    case 't':
      return equalsIgnoringCase(name, "Transfer-Encoding") ? Field::kTransferEncoding : Field::kOther;
    default:
      return Field::kOther;
  }
}

bool parseLength(std::string_view text, uint64_t& value) {
  if (text.empty() || text.size() > 18) return false;  // no overflow below 10^18
  value = 0;
  for (const char c : text) {
    if (!isDigit(static_cast<unsigned char>(c))) return false;
    value = value * 10 + static_cast<uint64_t>(c - '0');
  }
  return true;
}

// What the Transfer-Encoding fields say, all of them read as one list.
struct Codings {
  bool present = false;
  size_t count = 0;
  bool lastChunked = false;
  bool chunkedBeforeLast = false;
  bool other = false;
};

void addCodings(std::string_view value, Codings& codings) {
  codings.present = true;
  while (!value.empty()) {
    const size_t comma = value.find(',');
    std::string_view element = trimSpaces(value.substr(0, comma));
    value = comma == std::string_view::npos ? std::string_view() : value.substr(comma + 1);
    if (element.empty()) continue;  // empty list elements do not count (RFC 9110 5.6.1)
    const std::string_view name = trimSpaces(element.substr(0, element.find(';')));
    const bool chunked = equalsIgnoringCase(name, "chunked");
    if (codings.lastChunked) codings.chunkedBeforeLast = true;
    codings.lastChunked = chunked;
    if (!chunked) codings.other = true;
    ++codings.count;
  }
}

// RFC 9112 6.1 and 6.3: chunked must be the final coding, and once; a coding
// the host cannot undo is 501. An HTTP/1.0 message cannot carry one at all.
Refusal readFraming(const Codings& codings, bool hasLength, bool http11, HeadReading& reading) {
  if (!codings.present) return Refusal::kNone;
  if (hasLength) return Refusal::kLengthWithChunked;
  if (!http11 || !codings.lastChunked || codings.chunkedBeforeLast) {
    return Refusal::kChunkedNotFinal;
  }
  if (codings.other) return Refusal::kUnknownCoding;
  reading.chunked = true;
  return Refusal::kNone;
}

}  // namespace

unsigned refusalStatus(Refusal refusal) {
  switch (refusal) {
    case Refusal::kNone:
      return 200;
    case Refusal::kUnknownCoding:
      return 501;
    case Refusal::kVersion:
      return 505;
    case Refusal::kHeadTooLarge:
      return 431;
    default:
      return 400;
  }
}

std::string_view refusalText(Refusal refusal) {
  switch (refusal) {
    case Refusal::kNone:
      return "";
    case Refusal::kMalformedRequestLine:
      return "Bad Request: malformed request line\n";
    case Refusal::kMalformedField:
      return "Bad Request: malformed header field\n";
    case Refusal::kMissingHost:
      return "Bad Request: missing Host header\n";
    case Refusal::kRepeatedHost:
      return "Bad Request: repeated Host header\n";
    case Refusal::kInvalidLength:
      return "Bad Request: invalid Content-Length\n";
    case Refusal::kConflictingLength:
      return "Bad Request: conflicting Content-Length headers\n";
    case Refusal::kLengthWithChunked:
      return "Bad Request: Content-Length together with Transfer-Encoding\n";
    case Refusal::kChunkedNotFinal:
      return "Bad Request: chunked must be the final transfer coding, once\n";
    case Refusal::kUnknownCoding:
      return "Not Implemented: transfer coding other than chunked\n";
    case Refusal::kVersion:
      return "HTTP Version Not Supported\n";
    case Refusal::kHeadTooLarge:
      return "Request Header Fields Too Large\n";
    case Refusal::kMalformedChunk:
      return "Bad Request: malformed chunked body\n";
  }
  return "";
}

bool libraryNeeds(std::string_view name) { return classify(name) != Field::kOther; }

HeadReading readHead(std::string_view head, const HeadLimits& limits) {
  HeadReading reading;
  const auto refuse = [&reading](Refusal refusal) {
    reading.refusal = refusal;
    return reading;
  };
  if (head.size() > limits.maxBytes) return refuse(Refusal::kHeadTooLarge);
  RequestLine parsed;
  const size_t lineEnd = readRequestLine(head, parsed);
  if (parsed.refusal != Refusal::kNone) return refuse(parsed.refusal);
  if (head[parsed.targetStart] != '/') {
    if (const Refusal r = readTarget(head, parsed, reading); r != Refusal::kNone) return refuse(r);
  }
  const size_t mark = head.substr(0, parsed.targetEnd).find('?', parsed.targetStart);
  if (mark != std::string_view::npos) {
    reading.queryFrom = mark;
    reading.queryTo = parsed.targetEnd;
  }

  size_t kept = 0;  // bytes and records the library will hold
  size_t hosts = 0;
  bool hasLength = false;
  Codings codings;
  FieldLine field;
  for (size_t at = lineEnd; at < head.size();) {
    at = readFieldLine(head, at, field);
    if (at == 0) return refuse(Refusal::kMalformedField);
    const Field kind = classify(field.name);
    if (kind == Field::kOther) {
      reading.allNeeded = false;
      continue;
    }
    kept += field.length + 2 + limits.fieldRecordBytes;
    reading.hostReads |= kind == Field::kRead || kind == Field::kContentLength;
    if (kind == Field::kHost) {
      ++hosts;
    } else if (kind == Field::kContentLength) {
      uint64_t length = 0;
      if (!parseLength(field.value, length)) return refuse(Refusal::kInvalidLength);
      if (hasLength && length != reading.length) return refuse(Refusal::kConflictingLength);
      hasLength = true;
      reading.length = length;
    } else if (kind == Field::kTransferEncoding) {
      addCodings(field.value, codings);
    }
  }
  if (parsed.targetEnd - (reading.queryTo - reading.queryFrom) + 11 + kept > limits.maxMemory) {
    return refuse(Refusal::kHeadTooLarge);
  }
  if (hosts > 1) return refuse(Refusal::kRepeatedHost);
  if (hosts == 0 && parsed.http11) return refuse(Refusal::kMissingHost);
  if (const Refusal r = readFraming(codings, hasLength, parsed.http11, reading);
      r != Refusal::kNone) {
    return refuse(r);
  }
  return reading;
}

size_t findHeadEnd(std::string_view bytes, size_t from) {
  size_t at = from >= 2 ? from - 2 : 0;
  for (;;) {
    const size_t lf = bytes.find('\n', at);
    if (lf == std::string_view::npos) return 0;
    if (lf + 1 < bytes.size() && bytes[lf + 1] == '\n') return lf + 2;
    if (lf + 2 < bytes.size() && bytes[lf + 1] == '\r' && bytes[lf + 2] == '\n') return lf + 3;
    at = lf + 1;
  }
}

bool isToken(std::string_view text) {
  if (text.empty()) return false;
  for (const char c : text) {
    if (!is(c, kToken)) return false;
  }
  return true;
}

bool isFieldText(std::string_view text) {
  for (const char c : text) {
    if (!is(c, kFieldText)) return false;
  }
  return true;
}

}  // namespace ws::host
