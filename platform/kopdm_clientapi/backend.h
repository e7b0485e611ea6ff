// What serves the client library's calls: the simulated time-sync manager
// or the live one over ptp4l daemons. The exported C functions forward to
// the one backend of the process.
//
// Each operation has the contract of the C function of the same name in
// include/kopdm_clientapi.h.
//
// Thread-safety: every operation may run on several threads at once.
#ifndef KOPDM_CLIENTAPI_BACKEND_H_
#define KOPDM_CLIENTAPI_BACKEND_H_

#include <cstdint>

#include "error_record/status.h"

namespace kopdmsim {

class Backend {
 public:
  virtual ~Backend() = default;

  virtual int32_t getApiVersion() = 0;
  virtual int32_t getSelectedTrId(char* buffer, uint32_t capacity, koerr::Status* status) = 0;
  virtual int32_t getSelectedTrOffsetNanos(int64_t* offsetOut, koerr::Status* status) = 0;
  virtual int32_t getPdmAttrJson(const char* key, char* buffer, uint32_t capacity,
                                 koerr::Status* status) = 0;
  virtual int32_t getPdmMetadataJson(char* buffer, uint32_t capacity, koerr::Status* status) = 0;
  virtual int32_t getTrAttrJson(const char* trId, const char* key, char* buffer,
                                uint32_t capacity, koerr::Status* status) = 0;
  virtual int32_t getTrMetadataJson(const char* trId, char* buffer, uint32_t capacity,
                                    koerr::Status* status) = 0;
  virtual int32_t setTrAttr(const char* trId, const char* key, const char* value,
                            koerr::Status* status) = 0;
  virtual int32_t restartService(koerr::Status* status) = 0;
  virtual int32_t bringDownService(koerr::Status* status) = 0;
  virtual int32_t bringUpService(koerr::Status* status) = 0;
  virtual int32_t persistConfig(koerr::Status* status) = 0;
  virtual int32_t updateTrFromConfig(const char* trId, koerr::Status* status) = 0;
  virtual int32_t adjustTime(int64_t seconds, int64_t nanoseconds, koerr::Status* status) = 0;
};

}  // namespace kopdmsim

#endif  // KOPDM_CLIENTAPI_BACKEND_H_
