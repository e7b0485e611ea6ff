// Answers one request of the plug-in: checks the method and media types, maps
// the command word and URL variables onto one resource operation, and writes
// the envelope with the plug-in's media type.
//
// Thread-safety: handleRequest may run on several request threads at once;
// the service only reads its resource manager.
#ifndef QUILLON_QUILLON_SERVICE_H_
#define QUILLON_QUILLON_SERVICE_H_

#include <memory>
#include <string>

#include "error_record/status.h"
#include "quillon/request_interface.h"
#include "quillon/resource_manager_interface.h"

namespace quillon {

// The media type checked on requests and set on every answer.
inline constexpr const char* kMediaType = "vnd.ko.syncDomain.v0/json; charset=utf-8";

// Request method values of RequestInterface::getRequestMethodType.
inline constexpr int kMethodGet = 0;
inline constexpr int kMethodPut = 1;

class Service {
 public:
  explicit Service(std::shared_ptr<ResourceManagerInterface> resourceManager);

  // Answers `request` and hands it back (the caller destroys it); does
  // nothing when `status` already holds an error. Status codes: 200 with the
  // envelope; 415 when Content-Type or Accept is unacceptable; 202 or 404
  // (success envelope) for the accepted code and an unknown command; the
  // error's own negative code with the error envelope for a failed resource
  // operation. A failed host call or a non-record exception lands in
  // `status` and is answered with its raw record text and 500. Exceptions
  // thrown by those last two host calls, and exceptions of no known type,
  // leave this function.
  std::unique_ptr<RequestInterface> handleRequest(std::unique_ptr<RequestInterface>& request,
                                                  koerr::Status& status);

 private:
  std::shared_ptr<ResourceManagerInterface> resourceManager_;
};

// The result text of one command: GET "resources", "syncableDevices",
// "timescales"; PUT "syncableDevices" (result "{}"). A PUT with an empty
// body throws -411200 "kInternalSoftwareError"; anything else throws -411145
// "kCommandNotFound". Errors of the resource manager pass through.
std::string processCommand(ResourceManagerInterface& resourceManager, int requestMethodType,
                           const std::string& command, RequestInterface& request);

// "/quillon/<command>/<plugin>/<type>/<name>" from the request's URL
// variables, each taken verbatim.
std::string buildResourceUri(const std::string& command, RequestInterface& request);

}  // namespace quillon

#endif  // QUILLON_QUILLON_SERVICE_H_
