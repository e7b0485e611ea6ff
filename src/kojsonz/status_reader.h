// Reads members of a JSON object text in place, without building a tree: used
// on the data texts of error records (nesting, tests, tools).
//
// Thread-safety: pure functions over caller-owned text.
#ifndef QUILLON_KOJSONZ_STATUS_READER_H_
#define QUILLON_KOJSONZ_STATUS_READER_H_

#include <cstdint>
#include <string>

namespace kojsonz {

// The failure kinds of the reader's grammar, by name.
enum class ReadError {
  kNone,
  kValueExpected,
  kDoubleQuoteExpected,
  kCurlyBracketExpected,
  kSquareBracketExpected,
  kColonExpected,
  kCommaExpected,
  kInvalidStringSequence,
  kTrailingComma,
  kTrailingChar,
};
// "jsonz_errorValueExpected" and so on.
const char* readErrorName(ReadError error);

// The value of the first member named `key` (compared byte for byte after
// unescaping) in the object `objectText`; null when absent or malformed.
// `error`, when given, tells why a malformed text was given up on.
const char* findMember(const char* objectText, const char* key, ReadError* error = nullptr);
// Just past the JSON value starting at `value` (white space skipped first);
// null when it is malformed.
const char* skipValue(const char* value, ReadError* error = nullptr);

// 1 on success, 0 when the value has another type or does not convert.
int readInteger(const char* value, int32_t* out);   // integers only, "%i"
int readNumber(const char* value, double* out);     // any number, locale-proof
int readString(const char* value, std::string* out);  // escapes decoded

}  // namespace kojsonz

#endif  // QUILLON_KOJSONZ_STATUS_READER_H_
