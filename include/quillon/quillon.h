// The plug-in's entry points, as the host runtime calls them: Init once after
// loading, Run once per request (several at once on the host's threads),
// Pause and Resume when the host pauses or resumes the service, Finalize
// before unloading. The host never overlaps Init or Finalize with a Run.
// None of them reports failure or lets an exception out: errors are answered
// to the client or, in Init, recorded and discarded.
#ifndef QUILLON_QUILLON_H_
#define QUILLON_QUILLON_H_

#include <stdint.h>

#include "ws_runtime/request_info.h"

#define QUILLON_EXPORT __attribute__((visibility("default")))

extern "C" {

// Builds the object graph and stores its service; a second Init replaces it.
QUILLON_EXPORT void quillonInit();
// Answers one request: `_info` is the host's per-request object, `_requestID`
// names the request in the host's C request interface.
QUILLON_EXPORT void quillonRun(ws::runtime::RequestInfo* _info, uint32_t _requestID);
// Do nothing: requests are answered the same way in every state.
QUILLON_EXPORT void quillonPause();
QUILLON_EXPORT void quillonResume();
// Deletes the service; a second Finalize does nothing.
QUILLON_EXPORT void quillonFinalize();

}  // extern "C"

#endif  // QUILLON_QUILLON_H_
