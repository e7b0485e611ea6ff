#include "kojsonz/status_reader.h"

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace kojsonz {
namespace {

// Deeper texts than this are refused rather than risk the stack.
constexpr int kMaxDepth = 256;

const char* skipSpace(const char* p) {
  while (*p == ' ' || *p == '\t' || *p == '\r' || *p == '\n') ++p;
  return p;
}

const char* fail(ReadError* error, ReadError kind) {
  if (error != nullptr) *error = kind;
  return nullptr;
}

int hexDigit(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

// Exactly four hexadecimal digits; -1 otherwise.
long fourHex(const char* p) {
  long value = 0;
  for (int i = 0; i < 4; ++i) {
    const int digit = hexDigit(p[i]);
    if (digit < 0) return -1;
    value = value * 16 + digit;
  }
  return value;
}

template <typename Sink>
void putUtf8(unsigned long cp, Sink& sink) {
  if (cp < 0x80) {
    sink(static_cast<char>(cp));
  } else if (cp < 0x800) {
    sink(static_cast<char>(0xc0 | (cp >> 6)));
    sink(static_cast<char>(0x80 | (cp & 0x3f)));
  } else if (cp < 0x10000) {
    sink(static_cast<char>(0xe0 | (cp >> 12)));
    sink(static_cast<char>(0x80 | ((cp >> 6) & 0x3f)));
    sink(static_cast<char>(0x80 | (cp & 0x3f)));
  } else {
    sink(static_cast<char>(0xf0 | (cp >> 18)));
    sink(static_cast<char>(0x80 | ((cp >> 12) & 0x3f)));
    sink(static_cast<char>(0x80 | ((cp >> 6) & 0x3f)));
    sink(static_cast<char>(0x80 | (cp & 0x3f)));
  }
}

// Decodes the string starting at its opening quote into `sink`, byte by byte;
// returns the position after the closing quote.
template <typename Sink>
const char* scanString(const char* p, Sink& sink, ReadError* error) {
  if (*p != '"') return fail(error, ReadError::kDoubleQuoteExpected);
  ++p;
  for (;;) {
    const unsigned char c = static_cast<unsigned char>(*p);
    if (c == '"') return p + 1;
    if (c < 0x20) return fail(error, ReadError::kInvalidStringSequence);
    if (c != '\\') {
      sink(static_cast<char>(c));
      ++p;
      continue;
    }
    const char escape = p[1];
    p += 2;
    switch (escape) {
      case '"': sink('"'); break;
      case '\\': sink('\\'); break;
      case '/': sink('/'); break;
      case 'b': sink('\b'); break;
      case 'f': sink('\f'); break;
      case 'n': sink('\n'); break;
      case 'r': sink('\r'); break;
      case 't': sink('\t'); break;
      case 'u': {
        long unit = fourHex(p);
        if (unit < 0) return fail(error, ReadError::kInvalidStringSequence);
        p += 4;
        unsigned long cp = static_cast<unsigned long>(unit);
        if (cp >= 0xd800 && cp < 0xdc00 && p[0] == '\\' && p[1] == 'u') {
          const long low = fourHex(p + 2);
          if (low >= 0xdc00 && low < 0xe000) {
            cp = 0x10000 + ((cp - 0xd800) << 10) + (static_cast<unsigned long>(low) - 0xdc00);
            p += 6;
          }
        }
        putUtf8(cp, sink);
        break;
      }
      default:
        return fail(error, ReadError::kInvalidStringSequence);
    }
  }
}

struct Discard {
  void operator()(char) {}
};

// The number token at `p`: its end, and whether it is an integer.
const char* scanNumber(const char* p, bool* integer) {
  const char* q = p;
  if (*q == '-') ++q;
  if (*q < '0' || *q > '9') return nullptr;
  while (*q >= '0' && *q <= '9') ++q;
  *integer = true;
  if (*q == '.') {
    ++q;
    if (*q < '0' || *q > '9') return nullptr;
    while (*q >= '0' && *q <= '9') ++q;
    *integer = false;
  }
  if (*q == 'e' || *q == 'E') {
    ++q;
    if (*q == '+' || *q == '-') ++q;
    if (*q < '0' || *q > '9') return nullptr;
    while (*q >= '0' && *q <= '9') ++q;
    *integer = false;
  }
  return q;
}

const char* skipAny(const char* p, int depth, ReadError* error);

const char* skipContainer(const char* p, int depth, ReadError* error) {
  const bool object = *p == '{';
  const char close = object ? '}' : ']';
  p = skipSpace(p + 1);
  if (*p == close) return p + 1;
  for (;;) {
    if (object) {
      Discard discard;
      p = scanString(p, discard, error);
      if (p == nullptr) return nullptr;
      p = skipSpace(p);
      if (*p != ':') return fail(error, ReadError::kColonExpected);
      p = skipSpace(p + 1);
    }
    p = skipAny(p, depth + 1, error);
    if (p == nullptr) return nullptr;
    p = skipSpace(p);
    if (*p == close) return p + 1;
    if (*p != ',') {
      return fail(error, object ? ReadError::kCurlyBracketExpected
                                : ReadError::kSquareBracketExpected);
    }
    p = skipSpace(p + 1);
    if (*p == close) return fail(error, ReadError::kTrailingComma);
  }
}

const char* skipLiteral(const char* p, const char* literal, ReadError* error) {
  const size_t length = std::strlen(literal);
  if (std::strncmp(p, literal, length) != 0) return fail(error, ReadError::kValueExpected);
  return p + length;
}

const char* skipAny(const char* p, int depth, ReadError* error) {
  if (depth > kMaxDepth) return fail(error, ReadError::kValueExpected);
  p = skipSpace(p);
  switch (*p) {
    case '"': {
      Discard discard;
      return scanString(p, discard, error);
    }
    case '{':
    case '[':
      return skipContainer(p, depth, error);
    case 't': return skipLiteral(p, "true", error);
    case 'f': return skipLiteral(p, "false", error);
    case 'n': return skipLiteral(p, "null", error);
    default: {
      bool integer = false;
      const char* end = scanNumber(p, &integer);
      return end != nullptr ? end : fail(error, ReadError::kValueExpected);
    }
  }
}

// Compares a decoded key with the wanted one without building a string.
struct KeyMatcher {
  const char* wanted;
  size_t position = 0;
  bool equal = true;
  void operator()(char c) {
    if (equal && wanted[position] == c && c != '\0') {
      ++position;
    } else {
      equal = false;
    }
  }
  bool matched() const { return equal && wanted[position] == '\0'; }
};

char localeDecimalSeparator() {
  char probe[16];
  std::snprintf(probe, sizeof probe, "%.1f", 1.5);
  return probe[1];
}

}  // namespace

const char* readErrorName(ReadError error) {
  switch (error) {
    case ReadError::kNone: return "";
    case ReadError::kValueExpected: return "jsonz_errorValueExpected";
    case ReadError::kDoubleQuoteExpected: return "jsonz_errorDoubleQuoteExpected";
    case ReadError::kCurlyBracketExpected: return "jsonz_errorCurlyBracketExpected";
    case ReadError::kSquareBracketExpected: return "jsonz_errorSquareBracketExpected";
    case ReadError::kColonExpected: return "jsonz_errorColonExpected";
    case ReadError::kCommaExpected: return "jsonz_errorCommaExpected";
    case ReadError::kInvalidStringSequence: return "jsonz_errorInvalidStringSequence";
    case ReadError::kTrailingComma: return "jsonz_errorTrailingComma";
    case ReadError::kTrailingChar: return "jsonz_errorTrailingChar";
  }
  return "";
}

const char* findMember(const char* objectText, const char* key, ReadError* error) {
  if (error != nullptr) *error = ReadError::kNone;
  if (objectText == nullptr || key == nullptr) return fail(error, ReadError::kValueExpected);
  const char* p = skipSpace(objectText);
  if (*p != '{') return fail(error, ReadError::kCurlyBracketExpected);
  p = skipSpace(p + 1);
  if (*p == '}') return nullptr;
  for (;;) {
    KeyMatcher matcher{key};
    p = scanString(p, matcher, error);
    if (p == nullptr) return nullptr;
    p = skipSpace(p);
    if (*p != ':') return fail(error, ReadError::kColonExpected);
    const char* value = skipSpace(p + 1);
    if (matcher.matched()) {
      // A value that is not there is no value, even when the key matched.
      return *value != '\0' && *value != '}' && *value != ',' ? value
                                                               : fail(error, ReadError::kValueExpected);
    }
    p = skipAny(value, 1, error);
    if (p == nullptr) return nullptr;
    p = skipSpace(p);
    if (*p == '}') return nullptr;
    if (*p != ',') return fail(error, ReadError::kCommaExpected);
    p = skipSpace(p + 1);
    if (*p == '}') return fail(error, ReadError::kTrailingComma);
  }
}

const char* skipValue(const char* value, ReadError* error) {
  if (error != nullptr) *error = ReadError::kNone;
  if (value == nullptr) return fail(error, ReadError::kValueExpected);
  return skipAny(value, 0, error);
}

int readInteger(const char* value, int32_t* out) {
  if (value == nullptr || out == nullptr) return 0;
  bool integer = false;
  const char* end = scanNumber(value, &integer);
  if (end == nullptr || !integer) return 0;
  // A copy of just the token, so nothing past it is read. Base 0 is what
  // "%i" converts with; strtol reports overflow where the scanf family would
  // not.
  const std::string token(value, end);
  errno = 0;
  char* stop = nullptr;
  const long converted = std::strtol(token.c_str(), &stop, 0);
  if (errno != 0 || stop == token.c_str() || converted < INT32_MIN || converted > INT32_MAX) {
    return 0;
  }
  *out = static_cast<int32_t>(converted);
  return 1;
}

int readNumber(const char* value, double* out) {
  if (value == nullptr || out == nullptr) return 0;
  bool integer = false;
  const char* end = scanNumber(value, &integer);
  if (end == nullptr) return 0;
  std::string token(value, end);
  const char separator = localeDecimalSeparator();
  if (!integer && separator != '.') {
    // The conversion follows the locale, so the number is rewritten in its
    // notation: at most 63 characters of it, with the locale's separator.
    if (token.size() > 63) token.resize(63);
    const std::string::size_type dot = token.find('.');
    if (dot != std::string::npos) token[dot] = separator;
  }
  double converted = 0;
  if (std::sscanf(token.c_str(), "%lg", &converted) != 1) return 0;
  *out = converted;
  return 1;
}

int readString(const char* value, std::string* out) {
  if (value == nullptr || out == nullptr || *value != '"') return 0;
  std::string decoded;
  auto append = [&decoded](char c) { decoded.push_back(c); };
  if (scanString(value, append, nullptr) == nullptr) return 0;
  out->swap(decoded);
  return 1;
}

}  // namespace kojsonz
