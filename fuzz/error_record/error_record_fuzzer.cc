// Drives the in-place writers with arbitrary keys, values and nesting, with
// allocation failures mixed in, and checks after every step that the text
// parses and holds what it was given.
#include <cjson/cJSON.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "error_record/status.h"

namespace {

int gFailAt = 0;
int gCalls = 0;

int flakyReallocate(koerr::Status* status, uint32_t capacity) {
  if (capacity != 0 && ++gCalls == gFailAt) return 0;
  return koerr::defaultReallocate(status, capacity);
}

struct Input {
  const uint8_t* data;
  size_t size;
  uint8_t byte() { return size > 0 ? (--size, *data++) : 0; }
  std::string text() {
    const size_t length = std::min<size_t>(byte() % 64, size);
    std::string out(reinterpret_cast<const char*>(data), length);
    data += length;
    size -= length;
    return out;
  }
};

void check(bool condition) {
  if (!condition) std::abort();
}

// The key just written, holding `expected`, must be the last member of the
// container that `container` (the parsed node) stands for.
void checkLastString(const cJSON* container, const std::string& key, const std::string& value) {
  const cJSON* last = container->child;
  while (last != nullptr && last->next != nullptr) last = last->next;
  check(last != nullptr && last->string != nullptr && key == last->string);
  check(cJSON_IsString(last) && value == last->valuestring);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  Input in{data, size};
  gCalls = 0;
  gFailAt = in.byte() % 16;  // 0: never fail
  koerr::Status status;
  status.reallocate = &flakyReallocate;
  char* cursor = koerr::beginJson(status, 2);
  std::vector<int> depth;  // the path of nested objects, as child counts
  while (in.size > 0 && cursor != nullptr) {
    const uint8_t op = in.byte() % 5;
    // Keys must stay printable and NUL-free to compare after parsing.
    std::string key = in.text();
    key.erase(std::remove(key.begin(), key.end(), '\0'), key.end());
    std::string value = in.text();
    value.erase(std::remove(value.begin(), value.end(), '\0'), value.end());
    char* next = nullptr;
    switch (op) {
      case 0: next = koerr::addStdString(cursor, key.c_str(), value, status); break;
      case 1: next = koerr::addInt(cursor, key.c_str(), static_cast<int32_t>(value.size()) - 30, status); break;
      case 2: next = koerr::addObject(cursor, key.c_str(), status); if (next) depth.push_back(0); break;
      case 3: if (!depth.empty()) { next = koerr::leaveContainer(cursor); depth.pop_back(); } else { next = cursor; } break;
      case 4: next = koerr::addBool(cursor, key.c_str(), value.size() % 2 == 0, status); break;
    }
    if (status.json != nullptr) {
      cJSON* root = cJSON_Parse(status.json);
      check(root != nullptr);
      if (op == 0 && next != nullptr && depth.empty()) {
        // cJSON stops at an embedded escaped NUL, which we removed above.
        checkLastString(root, key, value);
      }
      cJSON_Delete(root);
      check(status.json[status.capacity - 1] == koerr::kGuard);
    }
    cursor = next;
  }
  koerr::releaseText(status);
  return 0;
}
