// The one JSON envelope every answer of the plug-in travels in, and the
// translation of any caught exception into an error record.
//
// Thread-safety: reentrant; each call reads the explanation files anew.
#ifndef QUILLON_QUILLON_ERRORS_H_
#define QUILLON_QUILLON_ERRORS_H_

#include <cstddef>
#include <string>

#include "error_record/status.h"

namespace quillon {

// {"error":{"success":..,"errorCode":..,"errorText":..[,"errorInfo":..]}[,"result":..]}
// "success" is true only for code 0; "errorText" is the installed English
// explanation of a non-zero code, "" when there is none; "errorInfo" is the
// record's text as a JSON string, present only when the record has text;
// "result" is `result` inserted as raw JSON, present only when not empty.
// Never throws for a failed explanation lookup; running out of memory only
// shortens the envelope.
std::string buildEnvelope(const koerr::Status& status, const std::string& result);
// The same text; a success without details is built in `result`'s own
// storage, which a document reserved with kEnvelopeRoom spare bytes lets it
// do without allocating.
std::string buildEnvelope(const koerr::Status& status, std::string&& result);
// What a success envelope adds around its result.
inline constexpr std::size_t kEnvelopeRoom = 65;

// To be called inside a catch block: rethrows the exception in flight and
// records it in `status` (first error wins): a koerr record is copied; a
// ko::dsc exception gives its code with its file and line; any other
// std::exception gives -411200 "quillon::kInternalSoftwareError" with its
// what(). Anything else propagates unchanged.
void translateCurrentException(koerr::Status& status);

}  // namespace quillon

#endif  // QUILLON_QUILLON_ERRORS_H_
