#include "quillon/request.h"

#include <cstring>
#include <memory>
#include <stdexcept>
#include <string_view>
#include <utility>

#include "error_record/error.h"
#include "ws_runtime/ws_runtime.h"

namespace quillon {

namespace {

constexpr const char* kFile = "quillon/Request";
constexpr const char* kChannel = "quillon_debug";
constexpr int32_t kSuccess = 0;

// The "line" members are part of the published records, so they are fixed
// here rather than taken from this file's layout.
constexpr int32_t kLineNullInfo = 50;
constexpr int32_t kLineMethodRead = 62;
constexpr int32_t kLineMethodLength = 63;
constexpr int32_t kLineMethodUnknown = 72;
constexpr int32_t kLineBodyProbe = 82;
constexpr int32_t kLineBodyRead = 86;
constexpr int32_t kLineResponseCode = 93;
constexpr int32_t kLineWriteOutput = 98;
constexpr int32_t kLineContentType = 175;
constexpr int32_t kLineAccept = 187;
constexpr int32_t kLineMimeType = 192;

constexpr uint32_t kMethodBufferSize = 5;
constexpr uint32_t kMediaTypeBufferSize = 128;

[[noreturn]] void raiseHostFailure(int32_t code, int32_t line, const char* call) {
  koerr::Error(code, "returnValue", kFile, line, kChannel)
      .add("function", call)
      .addInt("returnValue", code)
      .raise();
}

[[noreturn]] void raiseCheck(const koerr::ErrorConstant& constant, int32_t line,
                             const char* condition) {
  koerr::Error(constant, kFile, line, kChannel).add("check failed", condition).raise();
}

// Keeps the low 8 bits of each character: the plug-in's texts are bytes.
std::string narrow(const std::u32string& text) {
  std::string out(text.size(), '\0');
  for (size_t i = 0; i < text.size(); ++i) out[i] = static_cast<char>(text[i] & 0xFF);
  return out;
}

std::u32string widen(const std::string& text) {
  std::u32string out(text.size(), U'\0');
  for (size_t i = 0; i < text.size(); ++i) out[i] = static_cast<unsigned char>(text[i]);
  return out;
}

// The names the service reads, widened once, so that looking one up costs
// no allocation for its name.
const std::u32string* knownWideName(const std::string& key) {
  static const std::pair<std::string_view, std::u32string> kNames[] = {
      {"resourceType", U"resourceType"}, {"plugin", U"plugin"}, {"type", U"type"},
      {"name", U"name"}};
  for (const auto& [name, wide] : kNames) {
    if (key == name) return &wide;
  }
  return nullptr;
}

}  // namespace

Request::Request(ws::runtime::RequestInfo* _info, uint32_t _requestID)
    : _requestID(_requestID), _info(_info) {
  if (_info == nullptr) raiseCheck(koerr::kInternalSoftwareError, kLineNullInfo, "_info != nullptr");
}

int Request::getRequestMethodType() {
  char method[kMethodBufferSize] = {};
  uint32_t length = kMethodBufferSize;
  const int32_t code =
      ReadRequestVariable_C_REST_KO_GXWS_(_requestID, "REQUEST_METHOD", method, &length);
  if (code != kSuccess) {
    raiseHostFailure(code, kLineMethodRead,
                     "ReadRequestVariable_C_REST_KO_GXWS_(_requestID, requestVariableName, "
                     "*inputptrHandle, length)");
  }
  if (length > kMethodBufferSize) {
    raiseCheck(koerr::kInvalidRequestMethodType, kLineMethodLength, "length <= 5");
  }
  // A host that fills the whole buffer without a NUL must not make us read on.
  const std::string text(method, strnlen(method, kMethodBufferSize));
  if (text == "GET") return 0;
  if (text == "PUT") return 1;
  raiseCheck(koerr::kInvalidRequestMethodType, kLineMethodUnknown, "false");
}

std::string Request::getCommand() { return narrow(_info->command()); }

std::string Request::readPostData() {
  uint32_t length = 0;
  const int32_t expectedWarning = ReadPostData_C_REST_KO_GXWS_(_requestID, nullptr, &length);
  if (expectedWarning < 0) {
    raiseCheck(koerr::kInternalSoftwareError, kLineBodyProbe, "expectedWarning >= 0");
  }
  if (length == 0) {
    // An empty body has no buffer to build the text from; this is the
    // platform's long-standing answer to it, kept so callers see the same.
    throw std::logic_error("basic_string::_S_construct null not valid");
  }
  const uint32_t size = length;
  std::unique_ptr<char[]> buffer(new char[size]);
  const int32_t code = ReadPostData_C_REST_KO_GXWS_(_requestID, buffer.get(), &length);
  if (code != kSuccess) {
    raiseHostFailure(code, kLineBodyRead,
                     "ReadPostData_C_REST_KO_GXWS_(_requestID, *inputptrHandle, length)");
  }
  // The host does not terminate the body: the text ends at the first NUL or
  // at the size it reported, whichever comes first.
  return std::string(buffer.get(), strnlen(buffer.get(), size));
}

std::string Request::getUriVariable(const std::string& key) {
  const std::u32string* known = knownWideName(key);
  // A variable the request lacks leaves the value alone: it reads as "".
  variableValue_.clear();
  _info->lookupVariable(known != nullptr ? *known : widen(key), variableValue_);
  return narrow(variableValue_);
}

void Request::setHTTPResponseCode(int code) {
  const int32_t result = SetHTTPResponseCode_KO_GXWS_(_requestID, code);
  if (result != kSuccess) {
    raiseHostFailure(result, kLineResponseCode, "SetHTTPResponseCode_KO_GXWS_(_requestID, code)");
  }
}

void Request::writeOutput(const std::string& output) {
  const int32_t result = WriteOutput_C_REST_KO_GXWS_(_requestID, output.c_str(),
                                                     static_cast<uint32_t>(output.size()));
  if (result != kSuccess) {
    raiseHostFailure(result, kLineWriteOutput,
                     "WriteOutput_C_REST_KO_GXWS_(_requestID, output.c_str(), "
                     "static_cast<uint32_t>(output.size()))");
  }
  // The output is complete either way; a failed flush loses nothing.
  FlushOutput_KO_GXWS_(_requestID);
}

std::string Request::getContentType() { return readMediaType("CONTENT_TYPE", kLineContentType); }

std::string Request::getAccept() { return readMediaType("ACCEPT", kLineAccept); }

std::string Request::readMediaType(const char* variable, int32_t line) {
  char buffer[kMediaTypeBufferSize] = {};
  uint32_t length = kMediaTypeBufferSize;
  const int32_t error = ReadRequestVariable_C_REST_KO_GXWS_(_requestID, variable, buffer, &length);
  if (error != kSuccess && error != ws::runtime::errorCodes::k_VARNOTDEFINED) {
    koerr::Error(error, "error", kFile, line, kChannel)
        .add("check failed",
             "error == kSuccess || error == ws::runtime::errorCodes::k_VARNOTDEFINED")
        .raise();
  }
  return std::string(buffer, strnlen(buffer, kMediaTypeBufferSize));
}

void Request::setHTTPResponseMimeType(const std::string& responseContentType) {
  const int32_t result =
      SetHTTPResponseMimeType_C_REST_KO_GXWS_(_requestID, responseContentType.c_str());
  if (result != kSuccess) {
    raiseHostFailure(result, kLineMimeType,
                     "SetHTTPResponseMimeType_C_REST_KO_GXWS_(_requestID, "
                     "responseContentType.c_str())");
  }
}

}  // namespace quillon
