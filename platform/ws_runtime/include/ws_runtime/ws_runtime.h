// The host runtime's C request interface: what a plug-in calls, from inside
// its Run entry point, to read the request it was given and to build the
// answer. Every function names the request by the identifier the host passed
// to Run; that identifier is valid only until Run returns.
//
// Thread-safety: calls for different requests may run at once on different
// threads; the calls for one request come from the thread that runs it.
//
// Every function returns 0 on success, a negative code from
// ws::runtime::errorCodes on failure and, for the body-size probe only, a
// positive warning.
#ifndef WS_RUNTIME_WS_RUNTIME_H_
#define WS_RUNTIME_WS_RUNTIME_H_

#include <stdint.h>

#if defined(__GNUC__)
#define WS_RUNTIME_API __attribute__((visibility("default")))
#else
#define WS_RUNTIME_API
#endif

#ifdef __cplusplus
extern "C" {
#endif

// Reads "REQUEST_METHOD", "CONTENT_TYPE" or "ACCEPT" into `buffer`, which
// holds `*length` bytes. On success the value and its NUL are copied and
// `*length` is set to the bytes written (NUL included). A variable that is not
// defined (a header the client did not send, any other name) writes "" when
// the buffer has room and returns k_VARNOTDEFINED. A value that does not fit
// with its NUL leaves the buffer untouched, sets `*length` to the size needed
// and returns k_BUFFERTOOSMALL.
WS_RUNTIME_API int32_t ReadRequestVariable_C_REST_KO_GXWS_(uint32_t requestID, const char* name,
                                                           char* buffer, uint32_t* length);

// With a null `buffer`: sets `*length` to the body's byte count and returns
// k_POSTDATAAVAILABLE when there is a body, 0 when it is empty. With a buffer
// of at least that many bytes: copies the body (no NUL is appended), sets
// `*length` to its byte count and returns 0; a smaller buffer is left
// untouched, `*length` is set to the size needed and k_BUFFERTOOSMALL returned.
WS_RUNTIME_API int32_t ReadPostData_C_REST_KO_GXWS_(uint32_t requestID, char* buffer,
                                                    uint32_t* length);

// Appends `size` bytes to the response body; successive writes concatenate.
WS_RUNTIME_API int32_t WriteOutput_C_REST_KO_GXWS_(uint32_t requestID, const char* data,
                                                   uint32_t size);

// The response leaves once Run returns, so a flush only checks the request.
WS_RUNTIME_API int32_t FlushOutput_KO_GXWS_(uint32_t requestID);

// Sets the response's status code; the last call wins. Any value is kept:
// the HTTP host sends codes outside 100..599 as 500 with the code in the
// header "X-Status-Code".
WS_RUNTIME_API int32_t SetHTTPResponseCode_KO_GXWS_(uint32_t requestID, int32_t code);

// Sets the response's Content-Type; the last call wins.
WS_RUNTIME_API int32_t SetHTTPResponseMimeType_C_REST_KO_GXWS_(uint32_t requestID,
                                                               const char* mimeType);

#ifdef __cplusplus
}  // extern "C"

namespace ws::runtime::errorCodes {

// The variable is not defined for this request (e.g. a header not sent).
inline constexpr int32_t k_VARNOTDEFINED = -67303;
// No request with this identifier is being run (never issued, or its Run has
// returned).
inline constexpr int32_t k_UNKNOWNREQUEST = -67310;
// The value does not fit the caller's buffer; `*length` holds the size needed.
inline constexpr int32_t k_BUFFERTOOSMALL = -67311;
// A required pointer argument is null.
inline constexpr int32_t k_INVALIDARGUMENT = -67312;
// The host could not allocate memory for the response.
inline constexpr int32_t k_OUTOFMEMORY = -67313;
// Warning from the body-size probe: the request has a body of `*length` bytes.
inline constexpr int32_t k_POSTDATAAVAILABLE = 67320;

}  // namespace ws::runtime::errorCodes
#endif  // __cplusplus

#endif  // WS_RUNTIME_WS_RUNTIME_H_
