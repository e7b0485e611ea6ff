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
// The live service's own, over ptp4l daemons.
inline constexpr int32_t kDaemonUnreachable = -1074100995;  // no socket, refused, no permission
inline constexpr int32_t kDaemonTimedOut = -1074100996;     // no answer within the time-out
inline constexpr int32_t kManagementError = -1074100997;    // MANAGEMENT_ERROR_STATUS answer
inline constexpr int32_t kMalformedAnswer = -1074100998;    // an answer that does not decode
inline constexpr int32_t kReadOnly = -1074100999;           // a call that would change a daemon
inline constexpr int32_t kNoSelectedTr = -1074101000;       // no time reference is selected

}  // namespace kopdmsim

#endif  // KOPDM_CLIENTAPI_SERVICE_CODES_H_
