#include "error_record/status.h"

#include <cstdlib>
#include <cstring>

#include "kojsonz/status_reader.h"

namespace koerr {
namespace {

constexpr uint32_t kMinimumCapacity = 512;
constexpr uint32_t kLargestRequest = 2147483647u;

uint32_t roundedCapacity(uint32_t request) {
  if (request <= kMinimumCapacity) return kMinimumCapacity;
  uint32_t size = kMinimumCapacity;
  while (size < request) size <<= 1;
  return size;
}

// Writes `text` at the start of the buffer and restores the invariant behind
// it. The caller guarantees room for the text, its terminator and the guard.
void resetText(Status& status, const char* text, size_t length) {
  std::memmove(status.json, text, length);
  std::memset(status.json + length, 0, status.capacity - length - 1);
  status.json[status.capacity - 1] = kGuard;
}

[[nodiscard]] bool reserve(Status& status, uint32_t capacity) {
  if (status.capacity >= capacity && status.json != nullptr) return true;
  if (status.reallocate == nullptr || status.reallocate(&status, capacity) == 0) return false;
  // A hook that claims success without delivering is treated as a failure,
  // so the writers' grow-and-retry loop always ends.
  return status.json != nullptr && status.capacity >= capacity;
}

bool copyText(Status& dest, const Status& src) {
  if (src.json == nullptr) return true;
  const size_t length = std::strlen(src.json);
  if (length > kMaxExtra) return false;
  if (!reserve(dest, static_cast<uint32_t>(length) + 2)) return false;
  resetText(dest, src.json, length);
  return true;
}

}  // namespace

int defaultReallocate(Status* status, uint32_t newCapacity) {
  if (newCapacity == 0) {
    std::free(status->json);
    status->json = nullptr;
    status->capacity = 0;
    return 1;
  }
  if (newCapacity <= status->capacity) return 1;
  if (newCapacity > kLargestRequest) return 0;
  const uint32_t size = roundedCapacity(newCapacity);
  char* buffer = static_cast<char*>(std::malloc(size));
  if (buffer == nullptr) return 0;
  const char* old = status->json != nullptr ? status->json : "{}";
  const size_t length = std::strlen(old);
  std::memcpy(buffer, old, length);
  std::memset(buffer + length, 0, size - length - 1);
  buffer[size - 1] = kGuard;
  std::free(status->json);
  status->json = buffer;
  status->capacity = size;
  return 1;
}

bool setCode(Status& status, int32_t code) {
  if (code == 0 || status.code < 0) return false;
  if (status.code > 0 && code > 0) return false;
  status.code = code;
  if (status.json != nullptr) resetText(status, "{}", 2);
  return true;
}

char* beginJson(Status& status, uint32_t extra) {
  if (extra > kMaxExtra) return nullptr;
  if (!reserve(status, extra + 2)) return nullptr;
  char* brace = std::strrchr(status.json, '}');
  return brace;
}

void nestError(Status& status, Status& caught) {
  if (caught.json == nullptr || kojsonz::findMember(caught.json, "code") == nullptr) {
    addInt(beginJson(caught, 2), "code", caught.code, caught);
  }
  if (caught.json == nullptr) return;

  char* root = beginJson(status, 2);
  if (root == nullptr) return;
  char* list = nullptr;
  const char* existing = kojsonz::findMember(status.json, "nested_error");
  if (existing != nullptr && *existing == '[') {
    const char* end = kojsonz::skipValue(existing);
    if (end != nullptr) list = status.json + (end - 1 - status.json);
  }
  if (list == nullptr) list = addArray(root, "nested_error", status);
  addRawElement(list, caught.json, status);
}

void copyStatus(Status& dest, Status& src, bool* ok) {
  bool arrived = setCode(dest, src.code);
  if (arrived && dest.reallocate == src.reallocate) {
    if (dest.json != src.json) {
      if (dest.reallocate != nullptr) dest.reallocate(&dest, 0);
      dest.json = src.json;
      dest.capacity = src.capacity;
      src.json = nullptr;
      src.capacity = 0;
    }
  } else if (arrived) {
    arrived = copyText(dest, src);
  }
  if (ok != nullptr) *ok = arrived;
}

void copyStatusKeepSource(Status& dest, const Status& src, bool* ok) {
  bool arrived = setCode(dest, src.code) && copyText(dest, src);
  if (ok != nullptr) *ok = arrived;
}

void releaseText(Status& status) {
  // Without a reallocate function nobody knows how the text was allocated,
  // so it is left to its owner.
  if (status.reallocate != nullptr) status.reallocate(&status, 0);
}

}  // namespace koerr
