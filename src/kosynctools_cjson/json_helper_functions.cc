#include "kosynctools_cjson/json_helper_functions.h"

#include "error_record/error.h"
#include "kojsonlh/cjson_utils.h"

namespace kosynctools {
namespace cjson {
namespace {
constexpr int32_t kTypeErrorCode = -52004;
}

std::string getStringValue(const cJSON* value, const std::string& json, const std::string& key) {
  try {
    return cJSONUtils::getString(value);
  } catch (const koerr::ExceptionBase& caught) {
    if (caught.code() != kTypeErrorCode) throw;
  }
  // Raised outside the handler so the caught record is already released.
  koerr::Error(kTypeErrorCode, "errCode", "kosynctools_cjson/jsonHelperFunctions", 50,
               "kosync_debug")
      .add("message", "Error parsing: expected data type does not match the parsed value.")
      .add("JSON", json)
      .add("key", key)
      .raise();
}

}  // namespace cjson
}  // namespace kosynctools
