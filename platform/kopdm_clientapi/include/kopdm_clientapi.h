// Client library of the time-sync manager service (libkopdm_clientapi.so.1).
//
// Every call that can fail takes a status record as its last argument; the
// record must start empty (code 0). On failure the library writes a negative
// code and a JSON object of details into it, on a warning a positive code.
// Text answers are written NUL-terminated into the caller's buffer, truncated
// to `capacity` - 1 bytes; the buffer is left alone when the call fails.
// Integer results: 0 (or, for getSelectedTrId, 1) on success, otherwise the
// status code that was reported.
//
// Thread-safety: every function may be called from several threads at once.
#ifndef KOPDM_CLIENTAPI_H_
#define KOPDM_CLIENTAPI_H_

#include <cstdint>

#include "error_record/status.h"

#define KOPDM_CLIENTAPI_EXPORT __attribute__((visibility("default")))

extern "C" {

// The interface version the service speaks, or a negative code when the
// service is down or unusable.
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_getApiVersion(void);

// 1 and the selected time reference's identifier in `buffer`, or 0 when none
// is selected (buffer untouched), also when the call warns; negative on
// failure.
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_getSelectedTrId(char* buffer, uint32_t capacity,
                                                              koerr::Status* status);
// The selected time reference's offset in nanoseconds, written to `offsetOut`.
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_getSelectedTrOffsetNanos(int64_t* offsetOut,
                                                                       koerr::Status* status);

// {"<attrKey>":<value>} for one attribute of the manager.
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_getPdmAttrJson(const char* attrKey, char* buffer,
                                                             uint32_t capacity,
                                                             koerr::Status* status);
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_getPdmMetadataJson(char* buffer, uint32_t capacity,
                                                                 koerr::Status* status);
// {"<attrKey>":<value>} for one attribute of a time reference.
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_getTrAttrJson(const char* trId, const char* attrKey,
                                                            char* buffer, uint32_t capacity,
                                                            koerr::Status* status);
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_getTrMetadataJson(const char* trId, char* buffer,
                                                                uint32_t capacity,
                                                                koerr::Status* status);

// Sets an attribute of a time reference in the running configuration.
// `attrValue` is stored as JSON when it parses as JSON, as a string otherwise.
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_setTrAttr(const char* trId, const char* attrKey,
                                                        const char* attrValue,
                                                        koerr::Status* status);
// Drops unsaved changes and brings the service up.
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_restartService(koerr::Status* status);
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_bringDownService(koerr::Status* status);
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_bringUpService(koerr::Status* status);
// Saves the running configuration.
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_persistConfig(koerr::Status* status);
// Reverts one time reference to its saved configuration.
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_updateTrFromConfig(const char* trId,
                                                                 koerr::Status* status);
// Steps the local clock by seconds * 10^9 + nanoseconds.
KOPDM_CLIENTAPI_EXPORT int32_t kopdmclientapi_adjustTime(int64_t seconds, int64_t nanoseconds,
                                                         koerr::Status* status);

}  // extern "C"

#endif  // KOPDM_CLIENTAPI_H_
