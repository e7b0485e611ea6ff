// The plug-in's only view of one HTTP request: read the method, media types,
// command word, URL variables and body; write the status code, MIME type and
// body. Every host failure is thrown as koerr::Exception.
//
// Thread-safety: one request object is used by the one thread that answers it.
#ifndef QUILLON_QUILLON_REQUEST_INTERFACE_H_
#define QUILLON_QUILLON_REQUEST_INTERFACE_H_

#include <string>

namespace quillon {

class RequestInterface {
 public:
  virtual ~RequestInterface() = default;

  // 0 for GET, 1 for PUT; any other method throws "kInvalidRequestMethodType".
  virtual int getRequestMethodType() = 0;
  // The command word the host routed, e.g. "resources".
  virtual std::string getCommand() = 0;
  // The posted body up to its first NUL byte.
  virtual std::string readPostData() = 0;
  // A URL variable; "" when the host does not define it.
  virtual std::string getUriVariable(const std::string& key) = 0;
  virtual void setHTTPResponseCode(int code) = 0;
  // Appends to the response body and flushes.
  virtual void writeOutput(const std::string& output) = 0;
  // The request's Content-Type and Accept; "" when absent.
  virtual std::string getContentType() = 0;
  virtual std::string getAccept() = 0;
  virtual void setHTTPResponseMimeType(const std::string& responseContentType) = 0;
};

}  // namespace quillon

#endif  // QUILLON_QUILLON_REQUEST_INTERFACE_H_
