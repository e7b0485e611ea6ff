// kopendulo::ApiWrapper: the time-sync manager's client library, linked
// normally, behind ApiWrapperInterface. Stateless; construction loads or
// checks nothing.
//
// Thread-safety: no state of its own; as thread-safe as the client library.
#ifndef QUILLON_KOPDM_CLIENTAPI_API_WRAPPER_H_
#define QUILLON_KOPDM_CLIENTAPI_API_WRAPPER_H_

#include "kopdm_clientapi/api_wrapper_interface.h"

namespace kopendulo {

// Every operation raises koapalerr_invalidParameter (-52005) for a null
// out-parameter before calling the library, and re-raises a library failure
// as koerr::Exception carrying the library's record unchanged (the out-value
// is then left alone). Library warnings are dropped.
class ApiWrapper : public ApiWrapperInterface {
 public:
  ApiWrapper() = default;

  int32_t getApiVersion() override;
  bool getSelectedTrId(std::string* selectedTrIdOut) override;
  int32_t getSelectedTrOffsetNanos(int64_t* selectedTrOffsetNanosOut) override;
  void getPdmAttrJson(const std::string& attrKey, std::string* pdmAttrJsonOut) override;
  void getPdmMetadataJson(std::string* pdmMetadataJsonOut) override;
  void getTrAttrJson(const std::string& trId, const std::string& attrKey,
                     std::string* trAttrJsonOut) override;
  void getTrMetadataJson(const std::string& trId, std::string* trMetadataJsonOut) override;
  void setTrAttr(const std::string& trId, const std::string& attrKey,
                 const std::string& attrValue) override;
  void restartService() override;
  void bringDownService() override;
  void bringUpService() override;
  void persistConfig() override;
  void updateTrFromConfig(const std::string& trId) override;
  int32_t adjustTime(int64_t first, int64_t second) override;
};

}  // namespace kopendulo

#endif  // QUILLON_KOPDM_CLIENTAPI_API_WRAPPER_H_
