// Typed access to cJSON nodes. The type tests compare the node's whole type
// word with one flag, so a node carrying any extra flag (cJSON's reference or
// constant-key bits) is deliberately not of that type. The checks raise
// koerr::Exception records with the JSON access constants.
//
// Thread-safety: pure functions over caller-owned trees.
#ifndef QUILLON_KOJSONLH_CJSON_UTILS_H_
#define QUILLON_KOJSONLH_CJSON_UTILS_H_

#include <string>

struct cJSON;

namespace cJSONUtils {

// False for a null pointer.
bool isNull(const cJSON* node) noexcept;
bool isString(const cJSON* node) noexcept;
bool isArray(const cJSON* node) noexcept;

// Returns when `node` is an array; raises "jsonErrorsNotAnArray" (-52004).
void requireArray(const cJSON* node);
// Returns when `node` is a string; raises "jsonErrorsTypeMismatch" (-52004).
void requireString(const cJSON* node);
// A copy of the string value; raises as requireString.
[[nodiscard]] std::string getString(const cJSON* node);
// The member named `key` (case-insensitive, as cJSON compares), or null.
cJSON* getObjectItem(const cJSON* object, const char* key) noexcept;

}  // namespace cJSONUtils

#endif  // QUILLON_KOJSONLH_CJSON_UTILS_H_
