// Many clients at once against one host: every answer must be one that a
// single client could have received.
#include <gtest/gtest.h>

#include <algorithm>
#include <future>
#include <string>
#include <vector>

#include "e2e/service_host.h"

namespace e2e {
namespace {

namespace test = quillon::test_support;

constexpr int kThreads = 8;
constexpr int kRequestsPerThread = 2000;

struct Expected {
  std::string method;
  std::string target;
  std::string body;
  int status;
  std::vector<std::string> answers;  // any one of them
};

TEST(ServiceUnderLoad, EightClientsOfMixedRequestsGetExactAnswers) {
  const std::string ts = "/quillon/timescales/pendulo/";
  const std::string master = ts + "tr2/00-80-2F-FF-FE-65-43-21";
  const std::string boundary = ts + "tr0/00-80-2F-FF-FE-12-34-56";
  ServiceHost host(scenario({{"tr0", "IEEE 1588-2008 BC", "00-80-2F-FF-FE-12-34-56", "PTP_MASTER"},
                             {"tr2", "IEEE 1588-2008", "00-80-2F-FF-FE-65-43-21", "PTP_MASTER"}}));
  const std::string device = std::string("{\"uri\":\"") + kDeviceUri + "\"}";
  const std::string timescales = "{\"uri\":\"" + boundary + "\"},{\"uri\":\"" + master + "\"}";
  const std::string explanationText = shippedExplanation(-52006);
  const std::string wrongTs = ts + "tr2/00-80-2f-ff-fe-65-43-21";
  const std::string wrongDevice = std::string(kDeviceUri) + "X";
  const std::vector<Expected> mix = {
      {"GET", "/quillon/resources", "", 200,
       {successEnvelope("{\"version\":1,\"resources\":[" + device + "," + timescales + "]}")}},
      {"GET", "/quillon/resources?resourceType=timescales", "", 200,
       {successEnvelope("{\"version\":1,\"resources\":[" + timescales + "]}")}},
      {"GET", master, "", 200,
       {successEnvelope("{\"version\":1,\"uri\":\"" + master +
                        "\",\"data\":{\"grandmasterId\":\"00:80:2f:ff:fe:65:43:21\"}}")}},
      {"GET", wrongTs, "", 500,
       {errorEnvelope(-52006, explanationText,
                      notFoundRecord(98, "Requested timescaleUri does not match any timescaleUri on the system",
                                     "\"localTimescaleUri\":\"" + wrongTs + "\",\"currentTimescaleUris\":[\"" +
                                         boundary + "\",\"" + master + "\"]"))}},
      {"PUT", kDeviceUri, "{\"maxOffsetNanos\":1000}", 200, {successEnvelope("{}")}},
      {"GET", kDeviceUri, "", 200,
       {successEnvelope(deviceDocument("null", true)),
        successEnvelope(deviceDocument("{\"maxOffsetNanos\":1000}", true)),
        successEnvelope(deviceDocument("{\"maxOffsetNanos\":100}", false))}},
      {"PUT", wrongDevice, "{}", 500,
       {errorEnvelope(-52006, explanationText,
                      notFoundRecord(127, "Requested syncableDeviceUri does not exist on this host.",
                                     "\"localDeviceUri\":\"" + wrongDevice + "\",\"onlyDeviceUri\":\"" +
                                         kDeviceUri + "\""))}},
      {"PUT", kDeviceUri, "{\"maxOffsetNanos\":100}", 200, {successEnvelope("{}")}},
      {"GET", "/quillon/unknownCommand", "", 404, {successEnvelope("")}},
  };

  // Each client answers with its first wrong answer, or "" when all were right.
  std::vector<std::future<std::string>> clients;
  for (int t = 0; t < kThreads; ++t) {
    clients.push_back(std::async(std::launch::async, [&, t] {
      test::HttpClient client(host.port());
      for (int i = 0; i < kRequestsPerThread; ++i) {
        const Expected& e = mix[(i + t) % mix.size()];
        const test::HttpResponse r = client.send(test::HttpRequest{e.method, e.target, {}, e.body});
        if (r.status != e.status || std::find(e.answers.begin(), e.answers.end(), r.body) == e.answers.end()) {
          return e.method + " " + e.target + " -> " + std::to_string(r.status) + " " + r.body;
        }
      }
      return std::string();
    }));
  }
  for (auto& client : clients) EXPECT_EQ(client.get(), "");
  EXPECT_EQ(host.process().stop(), 0) << host.process().log();
  // A sanitizer build of the host reports races and leaks in its log.
  EXPECT_EQ(host.process().log().find("Sanitizer"), std::string::npos) << host.process().log();
}

}  // namespace
}  // namespace e2e
