#include "kojsonlh/cjson_utils.h"

#include <cjson/cJSON.h>

#include "error_record/error.h"

namespace cJSONUtils {
namespace {
constexpr const char* kFile = "kojsonlh/cJSONUtils";

bool hasExactType(const cJSON* node, int type) noexcept {
  return node != nullptr && node->type == type;
}
}  // namespace

bool isNull(const cJSON* node) noexcept { return hasExactType(node, cJSON_NULL); }
bool isString(const cJSON* node) noexcept { return hasExactType(node, cJSON_String); }
bool isArray(const cJSON* node) noexcept { return hasExactType(node, cJSON_Array); }

void requireArray(const cJSON* node) {
  if (!isArray(node)) koerr::Error(koerr::jsonErrorsNotAnArray, kFile, 83).raise();
}

void requireString(const cJSON* node) {
  if (!isString(node)) koerr::Error(koerr::jsonErrorsTypeMismatch, kFile, 305).raise();
}

std::string getString(const cJSON* node) {
  requireString(node);
  // A string node built by hand may lack its text; read it as empty.
  return node->valuestring != nullptr ? std::string(node->valuestring) : std::string();
}

cJSON* getObjectItem(const cJSON* object, const char* key) noexcept {
  return cJSON_GetObjectItem(object, key);
}

}  // namespace cJSONUtils
