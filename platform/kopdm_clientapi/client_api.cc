// The exported C functions: each forwards to the one service of the process,
// created on first use: the live service over ptp4l daemons when
// KOPDM_PTP4L_CONFIG names its configuration, else the simulated one serving
// KOPDM_SIM_SCENARIO (or the built-in scenario).
#include <cstdlib>
#include <memory>
#include <string>

#include "backend.h"
#include "kopdm_clientapi.h"
#include "live/live_time_service.h"
#include "ptp_management/uds_client.h"
#include "time_service.h"

namespace {

std::string environment(const char* name) {
  const char* value = std::getenv(name);
  return value != nullptr ? value : "";
}

std::unique_ptr<kopdmsim::Backend> makeService() {
  const std::string live = environment("KOPDM_PTP4L_CONFIG");
  if (!live.empty()) {
    return std::make_unique<kopdmlive::LiveTimeService>(live,
                                                        ptpmgmt::UdsClient::defaultDirectory());
  }
  return std::make_unique<kopdmsim::TimeService>(environment("KOPDM_SIM_SCENARIO"));
}

kopdmsim::Backend& service() {
  static const std::unique_ptr<kopdmsim::Backend> instance = makeService();
  return *instance;
}

}  // namespace

extern "C" {

int32_t kopdmclientapi_getApiVersion(void) { return service().getApiVersion(); }

int32_t kopdmclientapi_getSelectedTrId(char* buffer, uint32_t capacity, koerr::Status* status) {
  return service().getSelectedTrId(buffer, capacity, status);
}

int32_t kopdmclientapi_getSelectedTrOffsetNanos(int64_t* offsetOut, koerr::Status* status) {
  return service().getSelectedTrOffsetNanos(offsetOut, status);
}

int32_t kopdmclientapi_getPdmAttrJson(const char* attrKey, char* buffer, uint32_t capacity,
                                      koerr::Status* status) {
  return service().getPdmAttrJson(attrKey, buffer, capacity, status);
}

int32_t kopdmclientapi_getPdmMetadataJson(char* buffer, uint32_t capacity,
                                          koerr::Status* status) {
  return service().getPdmMetadataJson(buffer, capacity, status);
}

int32_t kopdmclientapi_getTrAttrJson(const char* trId, const char* attrKey, char* buffer,
                                     uint32_t capacity, koerr::Status* status) {
  return service().getTrAttrJson(trId, attrKey, buffer, capacity, status);
}

int32_t kopdmclientapi_getTrMetadataJson(const char* trId, char* buffer, uint32_t capacity,
                                         koerr::Status* status) {
  return service().getTrMetadataJson(trId, buffer, capacity, status);
}

int32_t kopdmclientapi_setTrAttr(const char* trId, const char* attrKey, const char* attrValue,
                                 koerr::Status* status) {
  return service().setTrAttr(trId, attrKey, attrValue, status);
}

int32_t kopdmclientapi_restartService(koerr::Status* status) {
  return service().restartService(status);
}

int32_t kopdmclientapi_bringDownService(koerr::Status* status) {
  return service().bringDownService(status);
}

int32_t kopdmclientapi_bringUpService(koerr::Status* status) {
  return service().bringUpService(status);
}

int32_t kopdmclientapi_persistConfig(koerr::Status* status) {
  return service().persistConfig(status);
}

int32_t kopdmclientapi_updateTrFromConfig(const char* trId, koerr::Status* status) {
  return service().updateTrFromConfig(trId, status);
}

int32_t kopdmclientapi_adjustTime(int64_t seconds, int64_t nanoseconds, koerr::Status* status) {
  return service().adjustTime(seconds, nanoseconds, status);
}

}  // extern "C"
