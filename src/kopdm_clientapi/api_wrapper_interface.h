// The time-sync manager's client library as virtual operations: library
// buffers are copied into strings, a failed call (negative status code) is
// thrown as koerr::Exception carrying the library's own record, and warnings
// are dropped.
//
// Thread-safety: no state of its own; as thread-safe as the client library.
#ifndef QUILLON_KOPDM_CLIENTAPI_API_WRAPPER_INTERFACE_H_
#define QUILLON_KOPDM_CLIENTAPI_API_WRAPPER_INTERFACE_H_

#include <cstdint>
#include <string>

namespace kopendulo {

class ApiWrapperInterface {
 public:
  virtual ~ApiWrapperInterface() = default;

  virtual int32_t getApiVersion() = 0;
  // False (and `selectedTrIdOut` untouched) when no TR is selected.
  virtual bool getSelectedTrId(std::string* selectedTrIdOut) = 0;
  virtual int32_t getSelectedTrOffsetNanos(int64_t* selectedTrOffsetNanosOut) = 0;
  virtual void getPdmAttrJson(const std::string& attrKey, std::string* pdmAttrJsonOut) = 0;
  virtual void getPdmMetadataJson(std::string* pdmMetadataJsonOut) = 0;
  virtual void getTrAttrJson(const std::string& trId, const std::string& attrKey,
                             std::string* trAttrJsonOut) = 0;
  virtual void getTrMetadataJson(const std::string& trId, std::string* trMetadataJsonOut) = 0;
  virtual void setTrAttr(const std::string& trId, const std::string& attrKey,
                         const std::string& attrValue) = 0;
  virtual void restartService() = 0;
  virtual void bringDownService() = 0;
  virtual void bringUpService() = 0;
  virtual void persistConfig() = 0;
  virtual void updateTrFromConfig(const std::string& trId) = 0;
  virtual int32_t adjustTime(int64_t first, int64_t second) = 0;
};

}  // namespace kopendulo

#endif  // QUILLON_KOPDM_CLIENTAPI_API_WRAPPER_INTERFACE_H_
