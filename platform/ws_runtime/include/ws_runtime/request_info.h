// The host's per-request object that a plug-in's Run entry point receives:
// the parts of the request URL that the host's routing produced, as 32-bit
// character strings (decoded from UTF-8).
//
// Thread-safety: read-only for the duration of Run; used by the one thread
// that runs the request.
#ifndef WS_RUNTIME_REQUEST_INFO_H_
#define WS_RUNTIME_REQUEST_INFO_H_

#include <string>

#include "ws_runtime/ws_runtime.h"

namespace ws::runtime {

// The order of the virtual operations is part of the plug-in contract: a
// plug-in built against this header calls them by their place.
class WS_RUNTIME_API RequestInfo {
 public:
  RequestInfo() = default;
  RequestInfo(const RequestInfo&) = delete;
  RequestInfo& operator=(const RequestInfo&) = delete;

  // Copies the URL variable `key` (a route segment such as "plugin", or a
  // query parameter) into `value` and returns true; returns false and leaves
  // `value` untouched when the request has no such variable.
  virtual bool lookupVariable(const std::u32string& key, std::u32string& value) const = 0;
  // The request path, percent-decoded, without the query.
  virtual const std::u32string& path() const = 0;
  // The client's numeric address ("127.0.0.1", "::1"); "" in-process.
  virtual const std::u32string& clientAddress() const = 0;
  // The command word: the path segment after the service's mount point.
  virtual const std::u32string& command() const = 0;

  virtual ~RequestInfo();
};

}  // namespace ws::runtime

#endif  // WS_RUNTIME_REQUEST_INFO_H_
