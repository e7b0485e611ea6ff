#include "default_scenario.h"

namespace kopdmsim {

const char* defaultScenarioText() {
  return R"({
  "apiVersion": 1,
  "selectedTrId": "tr1",
  "selectedTrOffsetNanos": -42,
  "pdmMetadata": {"serviceName": "pendulo", "hostName": "target", "configRevision": 7},
  "pdmAttrs": {"clockSource": "tr1", "utcOffsetSeconds": 37},
  "trs": {
    "tr0": {"attrs": {"type": "IEEE 1588-2008 BC",
                      "gmClockId": "00-80-2F-FF-FE-12-34-56",
                      "portState": "PTP_MASTER",
                      "domainNumber": 0,
                      "interface": "eth0"},
            "metadata": {"description": "boundary clock between the plant and cell networks"}},
    "tr1": {"attrs": {"type": "IEEE 802.1AS-2011",
                      "gmClockId": "00-1B-21-FF-FE-AB-CD-EF",
                      "portState": "PTP_SLAVE",
                      "domainNumber": 0,
                      "interface": "eth1"},
            "metadata": {"description": "time-sensitive network uplink"}},
    "tr2": {"attrs": {"type": "IEEE 1588-2008",
                      "gmClockId": "00-80-2F-FF-FE-65-43-21",
                      "portState": "PTP_MASTER",
                      "domainNumber": 24,
                      "interface": "eth2"},
            "metadata": {"description": "master for the instrument subnet"}}
  }
})";
}

}  // namespace kopdmsim
