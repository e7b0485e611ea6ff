// The in-place member writers. A member is inserted by counting its exact
// length first, checking the free room before the guard, moving the tail
// right and writing into the gap: nothing is written unless all of it fits,
// so the text is valid JSON after every call.
#include <charconv>
#include <cstring>

#include "error_record/json_text.h"
#include "error_record/status.h"

namespace koerr {
namespace {

// A value as it will appear in the text: either quoted and escaped, or raw.
struct Piece {
  const char* data;
  size_t size;
  bool quoted;
};

size_t escapedLength(unsigned char c) {
  switch (c) {
    case '\b': case '\t': case '\n': case '\f': case '\r': case '"': case '\\':
      return 2;
    default:
      return (c < 0x20 || c == 0x7f) ? 6 : 1;
  }
}

size_t pieceLength(const Piece& piece) {
  if (!piece.quoted) return piece.size;
  size_t length = 2;
  for (size_t i = 0; i < piece.size; ++i) {
    length += escapedLength(static_cast<unsigned char>(piece.data[i]));
  }
  return length;
}

// The escaped bytes of `piece`, without the surrounding quotes.
char* writeEscapedBody(char* out, const Piece& piece) {
  static const char kHex[] = "0123456789abcdef";
  for (size_t i = 0; i < piece.size; ++i) {
    const unsigned char c = static_cast<unsigned char>(piece.data[i]);
    char shortForm = 0;
    switch (c) {
      case '\b': shortForm = 'b'; break;
      case '\t': shortForm = 't'; break;
      case '\n': shortForm = 'n'; break;
      case '\f': shortForm = 'f'; break;
      case '\r': shortForm = 'r'; break;
      case '"': shortForm = '"'; break;
      case '\\': shortForm = '\\'; break;
      default: break;
    }
    if (shortForm != 0) {
      *out++ = '\\';
      *out++ = shortForm;
    } else if (c < 0x20 || c == 0x7f) {
      *out++ = '\\';
      *out++ = 'u';
      *out++ = '0';
      *out++ = '0';
      *out++ = kHex[c >> 4];
      *out++ = kHex[c & 0xf];
    } else {
      *out++ = static_cast<char>(c);
    }
  }
  return out;
}

char* writeEscaped(char* out, const Piece& piece) {
  *out++ = '"';
  out = writeEscapedBody(out, piece);
  *out++ = '"';
  return out;
}

char* writePiece(char* out, const Piece& piece) {
  if (piece.quoted) return writeEscaped(out, piece);
  std::memcpy(out, piece.data, piece.size);
  return out + piece.size;
}

bool isSpace(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }

// Whether the container whose closing bracket is at `cursor` already holds a
// member, so that the new one needs a separating comma.
bool containerHasMember(const char* json, const char* cursor) {
  const char* p = cursor;
  while (p > json && isSpace(p[-1])) --p;
  return p > json && p[-1] != '{' && p[-1] != '[';
}

// One attempt; null when the free room is too small.
char* tryInsert(char* cursor, const Piece* key, const Piece& value, Status& status) {
  char* const json = status.json;
  const size_t tailLength = std::strlen(cursor);
  const size_t textLength = static_cast<size_t>(cursor - json) + tailLength;
  const bool comma = containerHasMember(json, cursor);
  const size_t needed = (comma ? 1 : 0) + (key != nullptr ? pieceLength(*key) + 1 : 0) +
                        pieceLength(value);
  const size_t room = status.capacity - 2 - textLength;
  if (needed > room) return nullptr;

  std::memmove(cursor + needed, cursor, tailLength + 1);
  char* out = cursor;
  if (comma) *out++ = ',';
  if (key != nullptr) {
    out = writePiece(out, *key);
    *out++ = ':';
  }
  return writePiece(out, value);
}

// Roughly doubles the buffer and returns the same position in the new one.
char* growCursor(char* cursor, Status& status) {
  const size_t offset = static_cast<size_t>(cursor - status.json);
  const uint64_t wanted = 2 * static_cast<uint64_t>(status.capacity) - 4;
  if (wanted > kMaxExtra) return nullptr;
  if (beginJson(status, static_cast<uint32_t>(wanted)) == nullptr) return nullptr;
  return status.json + offset;
}

char* insert(char* cursor, const char* key, const Piece& value, Status& status) {
  if (cursor == nullptr || status.json == nullptr) return nullptr;
  const Piece keyPiece{key, key != nullptr ? std::strlen(key) : 0, true};
  const Piece* keyOrNull = key != nullptr ? &keyPiece : nullptr;
  for (;;) {
    char* end = tryInsert(cursor, keyOrNull, value, status);
    if (end != nullptr) return end;
    cursor = growCursor(cursor, status);
    if (cursor == nullptr) return nullptr;
  }
}

Piece quoted(const char* text) { return {text, std::strlen(text), true}; }
Piece raw(const char* text, size_t size) { return {text, size, false}; }

}  // namespace

char* addString(char* cursor, const char* key, const char* value, Status& status) {
  return insert(cursor, key, quoted(value != nullptr ? value : ""), status);
}

char* addStdString(char* cursor, const char* key, const std::string& value, Status& status) {
  return insert(cursor, key, Piece{value.data(), value.size(), true}, status);
}

char* addInt(char* cursor, const char* key, int32_t value, Status& status) {
  char digits[16];
  const auto result = std::to_chars(digits, digits + sizeof digits, value);
  return insert(cursor, key, raw(digits, static_cast<size_t>(result.ptr - digits)), status);
}

char* addUInt(char* cursor, const char* key, uint32_t value, Status& status) {
  char digits[16];
  const auto result = std::to_chars(digits, digits + sizeof digits, value);
  return insert(cursor, key, raw(digits, static_cast<size_t>(result.ptr - digits)), status);
}

char* addBool(char* cursor, const char* key, bool value, Status& status) {
  return value ? insert(cursor, key, raw("true", 4), status)
               : insert(cursor, key, raw("false", 5), status);
}

char* addRawValue(char* cursor, const char* key, const char* json, Status& status) {
  const char* text = json != nullptr ? json : "null";
  return insert(cursor, key, raw(text, std::strlen(text)), status);
}

char* addObject(char* cursor, const char* key, Status& status) {
  char* end = insert(cursor, key, raw("{}", 2), status);
  return end != nullptr ? end - 1 : nullptr;
}

char* addArray(char* cursor, const char* key, Status& status) {
  char* end = insert(cursor, key, raw("[]", 2), status);
  return end != nullptr ? end - 1 : nullptr;
}

char* addRawElement(char* cursor, const char* json, Status& status) {
  const char* text = json != nullptr ? json : "null";
  return insert(cursor, nullptr, raw(text, std::strlen(text)), status);
}

char* leaveContainer(char* cursor) { return cursor != nullptr ? cursor + 1 : nullptr; }

void appendJsonEscaped(std::string& out, std::string_view text) {
  const Piece piece{text.data(), text.size(), true};
  const size_t length = pieceLength(piece) - 2;  // the length counts the quotes
  // Most texts need no escape: then they are copied as they are.
  if (length == text.size()) {
    out.append(text);
    return;
  }
  const size_t start = out.size();
  out.resize(start + length);
  writeEscapedBody(&out[start], piece);
}

}  // namespace koerr
