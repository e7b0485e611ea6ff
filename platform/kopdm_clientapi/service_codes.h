// The status codes the time-sync manager's client library reports.
#ifndef KOPDM_CLIENTAPI_SERVICE_CODES_H_
#define KOPDM_CLIENTAPI_SERVICE_CODES_H_

#include <cstdint>

namespace kopdmsim {

inline constexpr int32_t kAttrNotSet = -1074100990;        // attribute unknown or not set
inline constexpr int32_t kTrDoesNotExist = -1074100991;    // no such time reference
inline constexpr int32_t kServiceDown = -1074100992;       // brought down by bringDownService
inline constexpr int32_t kScenarioUnusable = -1074100993;  // scenario file missing or invalid
inline constexpr int32_t kInvalidArgument = -1074100994;   // null pointer, zero capacity, overflow

}  // namespace kopdmsim

#endif  // KOPDM_CLIENTAPI_SERVICE_CODES_H_
