// The plain error record that every layer, and every closed platform library,
// fills in: a signed code and a JSON object text of details that is edited in
// place in one heap buffer.
//
// Thread-safety: a record is a plain value owned by one thread at a time.
//
// Buffer invariant: when `json` is not null, the text is followed by zero bytes
// up to the last byte of the buffer, which holds the guard character 'J'. The
// free room for insertions is the run of zeros between the text's terminator
// and the guard.
#ifndef QUILLON_ERROR_RECORD_STATUS_H_
#define QUILLON_ERROR_RECORD_STATUS_H_

#include <cstdint>
#include <string>

namespace koerr {

struct Status;

// Grows, shrinks or frees a record's buffer. Returns non-zero on success.
// A capacity of 0 frees the buffer.
using ReallocateFn = int (*)(Status* status, uint32_t newCapacity);

// Frees on 0; otherwise allocates 512 bytes, or the smallest power of two that
// holds `newCapacity`, with malloc, keeps the old text (or "{}") and places the
// guard. Never shrinks. Fails above 2147483647 or when malloc fails.
int defaultReallocate(Status* status, uint32_t newCapacity);

struct Status {
  int32_t code = 0;         // 0 success, negative error, positive warning
  uint32_t capacity = 0;    // bytes allocated for json, 0 when none
  ReallocateFn reallocate = &defaultReallocate;
  char* json = nullptr;     // NUL-terminated JSON object text, or null
};

inline constexpr char kGuard = 'J';
inline constexpr uint32_t kMaxExtra = 2147483645u;

// Applies the precedence rule: a code of 0 takes any non-zero code, a warning
// takes only an error, an error takes nothing. On success sets the code and,
// when a buffer exists, resets the text to "{}". Returns whether it took it.
bool setCode(Status& status, int32_t code);

// Ensures room for `extra` more bytes (capacity >= extra + 2) and returns the
// position of the root object's closing brace. Null when `extra` exceeds
// kMaxExtra or the buffer cannot grow.
[[nodiscard]] char* beginJson(Status& status, uint32_t extra);

// Member writers. Each inserts "key":value before the container's closing
// bracket at `cursor` and returns the position just after the written value,
// growing the buffer through the record's reallocate function as needed.
// They return null when the record cannot grow; a null cursor makes every
// writer a no-op, so a record is only ever shorter, never malformed.
char* addString(char* cursor, const char* key, const char* value, Status& status);
char* addStdString(char* cursor, const char* key, const std::string& value, Status& status);
char* addInt(char* cursor, const char* key, int32_t value, Status& status);
char* addUInt(char* cursor, const char* key, uint32_t value, Status& status);
char* addBool(char* cursor, const char* key, bool value, Status& status);
// `json` is inserted unquoted and unescaped; the caller vouches for it.
char* addRawValue(char* cursor, const char* key, const char* json, Status& status);
// Write "key":{} (or []) and return the position of the inner closing bracket,
// so the following writers fill the new container.
char* addObject(char* cursor, const char* key, Status& status);
char* addArray(char* cursor, const char* key, Status& status);
// Appends a raw JSON value as an element of the array whose closing bracket is
// at `cursor`.
char* addRawElement(char* cursor, const char* json, Status& status);
// Steps past a nested container's closing bracket; null stays null.
char* leaveContainer(char* cursor);

// Keeps a caught lower-level error inside `status`: adds "code" to the caught
// record's data unless it has one, then appends that data to the array
// "nested_error" of `status`, creating the array when absent.
void nestError(Status& status, Status& caught);

// setCode(dest, src.code); when taken, the text follows: moved (src is left
// without a buffer) when both records use the same reallocate function,
// copied otherwise. `ok`, when given, says whether code and text arrived.
void copyStatus(Status& dest, Status& src, bool* ok = nullptr);
// As copyStatus, but always copies the text and leaves `src` untouched.
void copyStatusKeepSource(Status& dest, const Status& src, bool* ok = nullptr);

// Frees the record's text through its reallocate function.
void releaseText(Status& status);

}  // namespace koerr

#endif  // QUILLON_ERROR_RECORD_STATUS_H_
