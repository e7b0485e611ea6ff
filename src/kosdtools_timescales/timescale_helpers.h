// kosdtools::pendulo::TimescaleHelpers: reads TR lists and TR attributes from
// the time service through ApiWrapperInterface and composes timescale URIs.
// The operations call one another through the virtual table, so a substitute
// that overrides one of them changes the composed results too.
//
// Thread-safety: no state beyond the client reference; as thread-safe as the
// client. Every call asks the time service again.
//
// Errors are koerr::Exception records of kosdtools_timescales/timescaleHelpers
// on the channel "kosyncdomain_debug"; a time-service error that is replaced
// by one of them is nested under "nested_error". Other errors pass through.
#ifndef QUILLON_KOSDTOOLS_TIMESCALES_TIMESCALE_HELPERS_H_
#define QUILLON_KOSDTOOLS_TIMESCALES_TIMESCALE_HELPERS_H_

#include <memory>
#include <string>
#include <vector>

#include "kopdm_clientapi/api_wrapper_interface.h"
#include "kosdtools_timescales/timescale_helpers_interface.h"

struct cJSON;

namespace kosdtools {
namespace pendulo {

class TimescaleHelpers : public TimescaleHelpersInterface {
 public:
  explicit TimescaleHelpers(std::shared_ptr<kopendulo::ApiWrapperInterface> client);

  std::string& replaceSpacesWithDashes(std::string& text) override;
  std::string normalizeTimescaleUri(const std::string& uri) override;
  std::string getTrGmId(const std::string& trId) override;
  std::string getTimescaleUri(const std::string& trId) override;
  std::string getFirstTrId() override;
  std::string getFirstTrTimescaleUri() override;
  std::vector<std::string> getTimescaleUris() override;
  std::string getFirstTrGmId() override;

  // The manager's "timeReferences" list; a null list is an empty one.
  virtual std::vector<std::string> getTrIds();
  // The TR's "type"; raises when it is unset, null or empty.
  virtual std::string getTrType(const std::string& trId);
  // The TR's "portState"; raises when it is unset, null or empty.
  virtual std::string getTrPortState(const std::string& trId);
  virtual bool isTrMasterOrDisabled(const std::string& trId);
  // The TR is the service's selected one and its port is a slave.
  virtual bool isTrSelectedSlave(const std::string& trId);

 private:
  struct AttrRead;
  // The manager's answer for "timeReferences"; an attribute the service does
  // not know is raised as the older-service error at `olderServiceLine`.
  std::string readTrListJson(int32_t olderServiceLine);
  static std::vector<std::string> readStrings(const cJSON* list);
  std::string readTrAttr(const std::string& trId, const AttrRead& read);

  std::shared_ptr<kopendulo::ApiWrapperInterface> client_;
};

}  // namespace pendulo
}  // namespace kosdtools

#endif  // QUILLON_KOSDTOOLS_TIMESCALES_TIMESCALE_HELPERS_H_
