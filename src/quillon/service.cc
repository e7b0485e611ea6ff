#include "quillon/service.h"

#include <string_view>
#include <utility>

#include "error_record/constants.h"
#include "error_record/error.h"
#include "error_record/exception.h"
#include "quillon/errors.h"

namespace quillon {
namespace {

constexpr const char* kFile = "quillon/Service";

// Frees its text however the scope is left.
struct LocalStatus : koerr::Status {
  LocalStatus() = default;
  LocalStatus(const LocalStatus&) = delete;
  LocalStatus& operator=(const LocalStatus&) = delete;
  ~LocalStatus() { koerr::releaseText(*this); }
};

// The MIME type of every answer, as the text the request takes, built once
// instead of once per answer.
const std::string& mediaTypeText() {
  static const std::string text(kMediaType);
  return text;
}

bool contentTypeAcceptable(const std::string& contentType) {
  return contentType.empty() || contentType == kMediaType;
}

bool acceptAcceptable(const std::string& accept) {
  return accept.empty() || accept == kMediaType || accept.find("*/*") != std::string::npos;
}

[[noreturn]] void raiseCommandNotFound(const std::string& command, int requestMethodType) {
  koerr::Error(koerr::kCommandNotFound, kFile, 260, "kosyncdomain_debug")
      .add("message", "Sync Domain Web Service Plugin failed to process command.")
      .add("command", command)
      .addUInt("requestMethodType", static_cast<uint32_t>(requestMethodType))
      .raise();
}

std::string processGet(ResourceManagerInterface& resourceManager, const std::string& command,
                       RequestInterface& request) {
  if (command == "resources") {
    return resourceManager.getResources(request.getUriVariable("resourceType"));
  }
  if (command == "syncableDevices") {
    return resourceManager.getSyncableDevice(buildResourceUri(command, request));
  }
  if (command == "timescales") {
    return resourceManager.getTimescale(buildResourceUri(command, request));
  }
  raiseCommandNotFound(command, kMethodGet);
}

std::string processPut(ResourceManagerInterface& resourceManager, const std::string& command,
                       RequestInterface& request) {
  // The body is checked before the command so that an empty PUT is refused
  // the same way whatever it was aimed at.
  const std::string data = request.readPostData();
  if (data.empty()) {
    koerr::Error(koerr::kInternalSoftwareError, kFile, 235, "quillon_debug")
        .add("check failed", "!data.empty()")
        .raise();
  }
  if (command == "syncableDevices") {
    resourceManager.putSyncableDevice(buildResourceUri(command, request), data);
    return "{}";
  }
  raiseCommandNotFound(command, kMethodPut);
}

}  // namespace

std::string buildResourceUri(const std::string& command, RequestInterface& request) {
  constexpr std::string_view kRoot = "/quillon/";
  const std::string plugin = request.getUriVariable("plugin");
  const std::string type = request.getUriVariable("type");
  const std::string name = request.getUriVariable("name");
  std::string uri;
  uri.reserve(kRoot.size() + command.size() + plugin.size() + type.size() + name.size() + 3);
  uri.append(kRoot).append(command).append(1, '/').append(plugin).append(1, '/').append(type)
      .append(1, '/').append(name);
  return uri;
}

std::string processCommand(ResourceManagerInterface& resourceManager, int requestMethodType,
                           const std::string& command, RequestInterface& request) {
  switch (requestMethodType) {
    case kMethodGet:
      return processGet(resourceManager, command, request);
    case kMethodPut:
      return processPut(resourceManager, command, request);
    default:
      raiseCommandNotFound(command, requestMethodType);
  }
}

Service::Service(std::shared_ptr<ResourceManagerInterface> resourceManager)
    : resourceManager_(std::move(resourceManager)) {}

std::unique_ptr<RequestInterface> Service::handleRequest(std::unique_ptr<RequestInterface>& request,
                                                         koerr::Status& status) {
  if (status.code < 0) {
    return nullptr;
  }
  if (!request) {
    koerr::Report(status, koerr::kInternalSoftwareError, kFile, 117)
        .open("quillon_debug")
        .add("check failed", "request != nullptr")
        .close();
    return nullptr;
  }
  LocalStatus local;
  try {
    request->setHTTPResponseCode(200);
    const int method = request->getRequestMethodType();
    const std::string contentType = request->getContentType();
    const std::string accept = request->getAccept();
    std::string result;
    if (!contentTypeAcceptable(contentType) || !acceptAcceptable(accept)) {
      request->setHTTPResponseCode(415);
    } else {
      const std::string command = request->getCommand();
      try {
        result = processCommand(*resourceManager_, method, command, *request);
      } catch (const koerr::ExceptionBase& caught) {
        if (caught.code() == koerr::kAcceptedCode) {
          request->setHTTPResponseCode(202);
        } else if (caught.code() == koerr::kCommandNotFound.code && !command.empty()) {
          request->setHTTPResponseCode(404);
        } else {
          translateCurrentException(local);
        }
      } catch (...) {
        // Not an error of the resource: the caller's record takes it, and
        // the answer still goes out before the record is appended.
        translateCurrentException(status);
      }
    }
    const std::string envelope = buildEnvelope(local, std::move(result));
    if (local.code != 0) {
      // The negative code goes to the host as the HTTP status, unmapped.
      request->setHTTPResponseCode(local.code);
    }
    request->writeOutput(envelope);
    request->setHTTPResponseMimeType(mediaTypeText());
  } catch (...) {
    translateCurrentException(status);
  }
  if (status.code < 0) {
    request->writeOutput(status.json != nullptr ? status.json : "");
    request->setHTTPResponseCode(500);
  }
  return std::move(request);
}

}  // namespace quillon
