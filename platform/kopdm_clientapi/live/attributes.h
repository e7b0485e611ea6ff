// The attributes of a live time reference: each is read from the
// configuration or from one data set of the reference's daemon, and
// rendered as the JSON value the attribute calls answer.
//
// Thread-safety: pure functions over caller-owned values.
#ifndef KOPDM_CLIENTAPI_LIVE_ATTRIBUTES_H_
#define KOPDM_CLIENTAPI_LIVE_ATTRIBUTES_H_

#include <string>
#include <string_view>
#include <vector>

#include "live/daemon_link.h"
#include "live/live_config.h"

namespace kopdmlive {

class TrAttribute {
 public:
  virtual ~TrAttribute() = default;
  // False when the value for `tr` comes from the configuration alone.
  virtual bool needsDaemon(const TrConfig& tr) const = 0;
  // The value as JSON; or false and `*failure` pointing into `state` when
  // the data set it comes from could not be had. `state` may be null when
  // needsDaemon(tr) is false.
  virtual bool render(const TrConfig& tr, const DaemonState* state, std::string* json,
                      const Failure** failure) const = 0;
};

// The attribute named `key` (exact, case-sensitive), or null.
const TrAttribute* findTrAttribute(std::string_view key);
// Every attribute's name, in a fixed order.
const std::vector<std::string>& trAttributeNames();

// "IEEE 802.1AS-2011" for a daemon that speaks gPTP, else "IEEE 1588-2008";
// the boundary-clock forms for more than one port.
std::string derivedType(uint8_t transportSpecific, uint16_t numberPorts);

// `text` as a JSON string.
std::string jsonString(std::string_view text);

}  // namespace kopdmlive

#endif  // KOPDM_CLIENTAPI_LIVE_ATTRIBUTES_H_
