#include "kojsonlh/cjson_utils.h"

#include <cjson/cJSON.h>

#include "error_record/error.h"
#include "ko/dsc/ascii.h"

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
  // cJSON's own case-insensitive match folds with the process locale, where
  // "I" need not fold to "i" (Turkish); keys are matched in ASCII instead,
  // the first match winning as with cJSON.
  if (object == nullptr || key == nullptr) return nullptr;
  for (cJSON* child = object->child; child != nullptr; child = child->next) {
    if (child->string != nullptr && ko::dsc::ascii::equalsIgnoringCase(child->string, key)) return child;
  }
  return nullptr;
}

}  // namespace cJSONUtils
