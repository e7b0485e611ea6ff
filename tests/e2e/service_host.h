// The whole service as a client sees it: ws-runtime with the plug-in, serving
// a scenario file of the stand-in time service that the test writes, and the
// shipped explanation files.
//
// Thread-safety: one ServiceHost per test; requests may come from any thread
// through their own HttpClient.
#ifndef QUILLON_TESTS_E2E_SERVICE_HOST_H_
#define QUILLON_TESTS_E2E_SERVICE_HOST_H_

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "support/envelopes.h"
#include "support/host_process.h"
#include "support/http_client.h"
#include "support/scratch.h"

namespace e2e {

using answers_test::errorEnvelope;
using answers_test::successEnvelope;

inline constexpr const char* kMediaType = "vnd.ko.syncDomain.v0/json; charset=utf-8";
inline constexpr const char* kDeviceUri = "/quillon/syncableDevices/pendulo/timekeeper/genericTk";

// One TR of a scenario: its id and attributes.
struct Tr {
  std::string id;
  std::string type;
  std::string gmClockId;
  std::string portState;
};

// A scenario text with these TRs in order, `selected` as the selected TR ("" for
// none) and `extra` members (such as "faults") appended verbatim.
std::string scenario(const std::vector<Tr>& trs, const std::string& selected = "",
                     const std::string& extra = "");

class ServiceHost {
 public:
  explicit ServiceHost(const std::string& scenarioText);
  ServiceHost(const ServiceHost&) = delete;
  ServiceHost& operator=(const ServiceHost&) = delete;

  uint16_t port() const { return host_->port(); }
  quillon::test_support::HostProcess& process() { return *host_; }
  // Replaces the scenario file the way editors do: a new file renamed over it.
  void writeScenario(const std::string& text);

  quillon::test_support::HttpResponse get(const std::string& target,
                                          const quillon::test_support::HeaderList& headers = {});
  quillon::test_support::HttpResponse put(const std::string& target, const std::string& body,
                                          const quillon::test_support::HeaderList& headers = {});

 private:
  answers_test::ScratchDir directory_;  // outlives the host
  std::string scenarioPath_;
  std::unique_ptr<quillon::test_support::HostProcess> host_;
};

// The explanation of `code` in the shipped English explanations file: the
// lines between the entry's tags, line ends included.
std::string shippedExplanation(int32_t code);

}  // namespace e2e

#endif  // QUILLON_TESTS_E2E_SERVICE_HOST_H_
