#include "kopdm_clientapi/api_wrapper.h"

#include "error_record/error.h"
#include "kopdm_clientapi.h"

namespace kopendulo {
namespace {

constexpr uint32_t kIdBufferSize = 256;
constexpr uint32_t kJsonBufferSize = 1024;

[[noreturn]] void raiseMissingParameter(const char* name, int32_t line) {
  koerr::Error(koerr::koapalerr_invalidParameter, "kopdm_clientapi/apiWrapper", line,
               "kopendulo_debug")
      .add("message", "Encountered missing parameter needed for task completion.")
      .add(name, "nullptr")
      .raise();
}

// Calls `call(status)` with a fresh record. The guard throws the library's
// failure when the scope ends (unless an exception is already in flight) and
// otherwise frees the record, which drops a warning.
template <typename Call>
auto callLibrary(Call&& call) {
  koerr::StatusGuard status;
  return call(&status);
}

}  // namespace

int32_t ApiWrapper::getApiVersion() { return kopdmclientapi_getApiVersion(); }

bool ApiWrapper::getSelectedTrId(std::string* selectedTrIdOut) {
  if (selectedTrIdOut == nullptr) raiseMissingParameter("selectedTrIdOut", 29);
  char buffer[kIdBufferSize] = {};
  const int32_t selected = callLibrary([&](koerr::Status* status) {
    return kopdmclientapi_getSelectedTrId(buffer, kIdBufferSize, status);
  });
  if (selected == 0) return false;
  selectedTrIdOut->assign(buffer);
  return true;
}

int32_t ApiWrapper::getSelectedTrOffsetNanos(int64_t* selectedTrOffsetNanosOut) {
  if (selectedTrOffsetNanosOut == nullptr) raiseMissingParameter("selectedTrOffsetNanosOut", 48);
  return callLibrary([&](koerr::Status* status) {
    return kopdmclientapi_getSelectedTrOffsetNanos(selectedTrOffsetNanosOut, status);
  });
}

void ApiWrapper::getPdmAttrJson(const std::string& attrKey, std::string* pdmAttrJsonOut) {
  if (pdmAttrJsonOut == nullptr) raiseMissingParameter("pdmAttrJsonOut", 58);
  char buffer[kJsonBufferSize] = {};
  callLibrary([&](koerr::Status* status) {
    return kopdmclientapi_getPdmAttrJson(attrKey.c_str(), buffer, kJsonBufferSize, status);
  });
  pdmAttrJsonOut->assign(buffer);
}

void ApiWrapper::getPdmMetadataJson(std::string* pdmMetadataJsonOut) {
  if (pdmMetadataJsonOut == nullptr) raiseMissingParameter("pdmMetadataJsonOut", 75);
  char buffer[kJsonBufferSize] = {};
  callLibrary([&](koerr::Status* status) {
    return kopdmclientapi_getPdmMetadataJson(buffer, kJsonBufferSize, status);
  });
  pdmMetadataJsonOut->assign(buffer);
}

void ApiWrapper::getTrAttrJson(const std::string& trId, const std::string& attrKey,
                               std::string* trAttrJsonOut) {
  if (trAttrJsonOut == nullptr) raiseMissingParameter("trAttrJsonOut", 97);
  char buffer[kJsonBufferSize] = {};
  callLibrary([&](koerr::Status* status) {
    return kopdmclientapi_getTrAttrJson(trId.c_str(), attrKey.c_str(), buffer, kJsonBufferSize,
                                        status);
  });
  trAttrJsonOut->assign(buffer);
}

void ApiWrapper::getTrMetadataJson(const std::string& trId, std::string* trMetadataJsonOut) {
  if (trMetadataJsonOut == nullptr) raiseMissingParameter("trMetadataJsonOut", 116);
  char buffer[kJsonBufferSize] = {};
  callLibrary([&](koerr::Status* status) {
    return kopdmclientapi_getTrMetadataJson(trId.c_str(), buffer, kJsonBufferSize, status);
  });
  trMetadataJsonOut->assign(buffer);
}

void ApiWrapper::setTrAttr(const std::string& trId, const std::string& attrKey,
                           const std::string& attrValue) {
  callLibrary([&](koerr::Status* status) {
    return kopdmclientapi_setTrAttr(trId.c_str(), attrKey.c_str(), attrValue.c_str(), status);
  });
}

void ApiWrapper::restartService() { callLibrary(kopdmclientapi_restartService); }

void ApiWrapper::bringDownService() { callLibrary(kopdmclientapi_bringDownService); }

void ApiWrapper::bringUpService() { callLibrary(kopdmclientapi_bringUpService); }

void ApiWrapper::persistConfig() { callLibrary(kopdmclientapi_persistConfig); }

void ApiWrapper::updateTrFromConfig(const std::string& trId) {
  callLibrary([&](koerr::Status* status) {
    return kopdmclientapi_updateTrFromConfig(trId.c_str(), status);
  });
}

int32_t ApiWrapper::adjustTime(int64_t first, int64_t second) {
  return callLibrary([&](koerr::Status* status) {
    return kopdmclientapi_adjustTime(first, second, status);
  });
}

}  // namespace kopendulo
