// The live time service's configuration: which ptp4l daemons serve which
// time references, read from a JSON file such as
//
//   {"timeReferences": [
//      {"id": "tr0", "uds": "/var/run/ptp4l", "port": 1},
//      {"id": "tr1", "uds": "/var/run/ptp4l-gptp", "type": "IEEE 802.1AS-2011"}],
//    "selectedTr": "tr1",
//    "timeoutMillis": 200}
//
// Thread-safety: plain values.
#ifndef KOPDM_CLIENTAPI_LIVE_LIVE_CONFIG_H_
#define KOPDM_CLIENTAPI_LIVE_LIVE_CONFIG_H_

#include <cstdint>
#include <string>
#include <vector>

namespace kopdmlive {

struct TrConfig {
  std::string id;
  std::string uds;           // the daemon's management socket
  uint16_t port = 1;         // the network port whose state the TR reports
  uint8_t domainNumber = 0;  // must be the daemon's: it ignores other domains
  std::string type;          // empty: derived from what the daemon answers
};

struct LiveConfig {
  std::vector<TrConfig> trs;  // in file order
  bool automaticSelection = true;
  std::string selectedTr;           // without automatic selection
  uint32_t timeoutMillis = 200;     // bounds every exchange with one daemon
  uint32_t maxAgeMillis = 100;      // a daemon's state is asked again when older
};

// The value of the manager's "timeReferences": a JSON list of the ids, in
// file order.
std::string trIdList(const LiveConfig& config);

// Reads a configuration text. False, with a sentence saying what is wrong,
// when it is not a usable configuration.
[[nodiscard]] bool parseLiveConfig(const std::string& text, LiveConfig* out, std::string* problem);

}  // namespace kopdmlive

#endif  // KOPDM_CLIENTAPI_LIVE_LIVE_CONFIG_H_
