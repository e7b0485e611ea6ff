// Feeds the JSON helper layer arbitrary texts: parsed into an owned document
// (or refused with the layer's own error), then every member looked up by
// its key in other case, read as a string, and walked as an array.
#include <cjson/cJSON.h>

#include <cstdint>
#include <cstdlib>
#include <string>

#include "error_record/error.h"
#include "kojsonlh/array_iterator.h"
#include "kojsonlh/cjson_utils.h"
#include "kojsonlh/cpp_json.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

// The layer's errors are its own records; anything else escaping is a bug.
template <typename Call>
void tolerateLayerErrors(Call&& call) {
  try {
    call();
  } catch (const koerr::ExceptionBase& e) {
    check(e.code() < 0);
  }
}

std::string swapCase(const char* key) {
  std::string swapped(key);
  for (char& c : swapped) {
    if (c >= 'a' && c <= 'z') {
      c = static_cast<char>(c - 'a' + 'A');
    } else if (c >= 'A' && c <= 'Z') {
      c = static_cast<char>(c - 'A' + 'a');
    }
  }
  return swapped;
}

void walk(const cJSON* node, int depth) {
  if (node == nullptr || depth > 16) return;
  tolerateLayerErrors([&] { (void)cJSONUtils::getString(node); });
  if (cJSONUtils::isArray(node)) {
    tolerateLayerErrors([&] {
      ArrayIterator elements(node);
      size_t count = 0;
      while (elements.hasNext()) {
        walk(elements.next(), depth + 1);
        ++count;
      }
      check(count == static_cast<size_t>(cJSON_GetArraySize(node)));
      (void)elements.at(count);  // one past the end: the layer's error
    });
    return;
  }
  for (const cJSON* child = node->child; child != nullptr; child = child->next) {
    if (child->string != nullptr && cJSON_IsObject(node)) {
      const cJSON* found = cJSONUtils::getObjectItem(node, swapCase(child->string).c_str());
      check(found != nullptr);
    }
    walk(child, depth + 1);
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string text(reinterpret_cast<const char*>(data), size);
  tolerateLayerErrors([&] {
    CppJson document(text);
    walk(document.get(), 0);
  });
  return 0;
}
