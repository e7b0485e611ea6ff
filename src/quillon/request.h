// quillon::Request: the plug-in's view of one request over the host
// runtime's C request interface and its per-request RequestInfo object. Every
// failed host call is thrown as koerr::Exception with the call's text and the
// host's code in the record.
//
// Thread-safety: used by the one thread that runs the request.
#ifndef QUILLON_QUILLON_REQUEST_H_
#define QUILLON_QUILLON_REQUEST_H_

#include <cstdint>
#include <string>

#include "quillon/request_interface.h"
#include "ws_runtime/request_info.h"

namespace quillon {

class Request : public RequestInterface {
 public:
  // Throws "kInternalSoftwareError" when `_info` is null. `_info` is not owned.
  Request(ws::runtime::RequestInfo* _info, uint32_t _requestID);

  // Reads "REQUEST_METHOD" into a 5-byte buffer, so that methods of more than
  // four letters fail with the host's code.
  int getRequestMethodType() override;
  std::string getCommand() override;
  // Throws std::logic_error for an empty body (never returns "").
  std::string readPostData() override;
  std::string getUriVariable(const std::string& key) override;
  void setHTTPResponseCode(int code) override;
  void writeOutput(const std::string& output) override;
  std::string getContentType() override;
  std::string getAccept() override;
  void setHTTPResponseMimeType(const std::string& responseContentType) override;

 private:
  // Content-Type and Accept: one 128-byte read, "" when the header is absent.
  std::string readMediaType(const char* variable, int32_t line);

  uint32_t _requestID;
  ws::runtime::RequestInfo* _info;
  // Reused by every URL variable read, so that a request's reads share one
  // buffer.
  std::u32string variableValue_;
};

}  // namespace quillon

#endif  // QUILLON_QUILLON_REQUEST_H_
