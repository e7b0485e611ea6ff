// The C request interface over the registry. No function throws: every
// failure becomes one of the documented codes.
#include <cstring>
#include <new>
#include <string_view>

#include "registry.h"
#include "ws_runtime/ws_runtime.h"

namespace codes = ws::runtime::errorCodes;
using ws::runtime::detail::Registry;
using ws::runtime::detail::Slot;

namespace {

// The value of a request variable, or null when it is not defined.
const std::string* findVariable(const Slot& slot, std::string_view name) {
  const auto& request = slot.request;
  if (name == "REQUEST_METHOD") return &request.method;
  if (name == "CONTENT_TYPE") return request.hasContentType ? &request.contentType : nullptr;
  if (name == "ACCEPT") return request.hasAccept ? &request.accept : nullptr;
  return nullptr;
}

}  // namespace

extern "C" {

int32_t ReadRequestVariable_C_REST_KO_GXWS_(uint32_t requestID, const char* name, char* buffer,
                                            uint32_t* length) {
  Slot* slot = Registry::instance().find(requestID);
  if (slot == nullptr) return codes::k_UNKNOWNREQUEST;
  if (name == nullptr || length == nullptr || (buffer == nullptr && *length != 0)) {
    return codes::k_INVALIDARGUMENT;
  }
  const std::string* value = findVariable(*slot, name);
  if (value == nullptr) {
    // Callers that ignore the code still find an empty string.
    if (buffer != nullptr && *length > 0) buffer[0] = '\0';
    return codes::k_VARNOTDEFINED;
  }
  const uint64_t needed = uint64_t{value->size()} + 1;
  if (needed > *length) {
    *length = needed > UINT32_MAX ? UINT32_MAX : static_cast<uint32_t>(needed);
    return codes::k_BUFFERTOOSMALL;
  }
  std::memcpy(buffer, value->c_str(), needed);
  *length = static_cast<uint32_t>(needed);
  return 0;
}

int32_t ReadPostData_C_REST_KO_GXWS_(uint32_t requestID, char* buffer, uint32_t* length) {
  Slot* slot = Registry::instance().find(requestID);
  if (slot == nullptr) return codes::k_UNKNOWNREQUEST;
  if (length == nullptr) return codes::k_INVALIDARGUMENT;
  const std::string& body = slot->request.body;
  if (body.size() > UINT32_MAX) return codes::k_BUFFERTOOSMALL;
  const auto size = static_cast<uint32_t>(body.size());
  if (buffer == nullptr) {
    *length = size;
    return size == 0 ? 0 : codes::k_POSTDATAAVAILABLE;
  }
  if (*length < size) {
    *length = size;
    return codes::k_BUFFERTOOSMALL;
  }
  if (size > 0) std::memcpy(buffer, body.data(), size);
  *length = size;
  return 0;
}

int32_t WriteOutput_C_REST_KO_GXWS_(uint32_t requestID, const char* data, uint32_t size) {
  Slot* slot = Registry::instance().find(requestID);
  if (slot == nullptr) return codes::k_UNKNOWNREQUEST;
  if (size == 0) return 0;
  if (data == nullptr) return codes::k_INVALIDARGUMENT;
  try {
    slot->response.body.append(data, size);
  } catch (const std::exception&) {
    return codes::k_OUTOFMEMORY;
  }
  return 0;
}

int32_t FlushOutput_KO_GXWS_(uint32_t requestID) {
  Slot* slot = Registry::instance().find(requestID);
  if (slot == nullptr) return codes::k_UNKNOWNREQUEST;
  ++slot->response.flushes;
  return 0;
}

int32_t SetHTTPResponseCode_KO_GXWS_(uint32_t requestID, int32_t code) {
  Slot* slot = Registry::instance().find(requestID);
  if (slot == nullptr) return codes::k_UNKNOWNREQUEST;
  slot->response.code = code;
  return 0;
}

int32_t SetHTTPResponseMimeType_C_REST_KO_GXWS_(uint32_t requestID, const char* mimeType) {
  Slot* slot = Registry::instance().find(requestID);
  if (slot == nullptr) return codes::k_UNKNOWNREQUEST;
  if (mimeType == nullptr) return codes::k_INVALIDARGUMENT;
  try {
    ws::runtime::detail::copyInto(slot->response.mimeType, mimeType);
  } catch (const std::exception&) {
    return codes::k_OUTOFMEMORY;
  }
  slot->response.hasMimeType = true;
  return 0;
}

}  // extern "C"
