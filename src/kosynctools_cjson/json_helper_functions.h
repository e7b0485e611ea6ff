// Reads of values taken from another component's JSON answer. A wrong value
// type is re-reported with the whole answer text and the key asked for, so
// the record tells which answer was at fault, not only that a type differed.
//
// Thread-safety: pure functions over caller-owned trees.
#ifndef QUILLON_KOSYNCTOOLS_CJSON_JSON_HELPER_FUNCTIONS_H_
#define QUILLON_KOSYNCTOOLS_CJSON_JSON_HELPER_FUNCTIONS_H_

#include <string>

struct cJSON;

namespace kosynctools {
namespace cjson {

// The string value of `value`, the member `key` of the answer `json`.
// A value that is not a string raises -52004 with "error_constant" "errCode",
// file kosynctools_cjson/jsonHelperFunctions, line 50, channel "kosync_debug"
// {"message", "JSON" = json, "key" = key}. Other errors pass through.
[[nodiscard]] std::string getStringValue(const cJSON* value, const std::string& json,
                                         const std::string& key);

}  // namespace cjson
}  // namespace kosynctools

#endif  // QUILLON_KOSYNCTOOLS_CJSON_JSON_HELPER_FUNCTIONS_H_
