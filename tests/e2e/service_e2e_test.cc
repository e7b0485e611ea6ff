// The service over HTTP, as a client sees it: every answer byte for byte.
// The host serves the plug-in over the platform stand-ins, the time service's
// scenario file that the test writes, and the shipped explanation files.
#include <cJSON.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <future>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

#include "support/envelopes.h"
#include "support/host_process.h"
#include "support/http_client.h"
#include "support/scratch.h"

namespace e2e {
namespace {

namespace test = quillon::test_support;
using answers_test::errorEnvelope;
using answers_test::quoted;
using answers_test::successEnvelope;

constexpr const char* kMediaType = "vnd.ko.syncDomain.v0/json; charset=utf-8";
constexpr const char* kDeviceUri = "/quillon/syncableDevices/pendulo/timekeeper/genericTk";

struct Tr {
  std::string id, type, gmClockId, portState;
};

// `selected` "" for none; `extra` members (such as "faults") go in verbatim.
std::string scenario(const std::vector<Tr>& trs, const std::string& selected = "",
                     const std::string& extra = "") {
  std::string out = "{\"apiVersion\":1,\"selectedTrId\":" + (selected.empty() ? "null" : quoted(selected)) +
                    ",\"trs\":{";
  for (const Tr& tr : trs) {
    out += (&tr == &trs.front() ? "" : ",") + quoted(tr.id) + ":{\"attrs\":{\"type\":" + quoted(tr.type) +
           ",\"gmClockId\":" + quoted(tr.gmClockId) + ",\"portState\":" + quoted(tr.portState) + "}}";
  }
  return out + "}" + (extra.empty() ? "" : "," + extra) + "}";
}

class ServiceHost {
 public:
  // No --plugin: the host's default plug-in is this project's.
  explicit ServiceHost(const std::string& scenarioText)
      : scenarioPath_(directory_.write("scenario.json", scenarioText)),
        process_({"--quiet"}, {{"KOPDM_SIM_SCENARIO", scenarioPath_},
                               {"KOSYSQ_SHARE_DIR_FILE", directory_.write("share.dir", QUILLON_SHARE_DIR)}}) {}

  uint16_t port() const { return process_.port(); }
  test::HostProcess& process() { return process_; }
  // Replaces the scenario file the way editors do: a new file renamed over it.
  void writeScenario(const std::string& text) {
    ASSERT_EQ(std::rename(directory_.write("next.json", text).c_str(), scenarioPath_.c_str()), 0);
  }
  test::HttpResponse get(const std::string& target, const test::HeaderList& headers = {}) {
    return test::httpRequest(port(), "GET", target, headers);
  }
  test::HttpResponse put(const std::string& target, const std::string& body,
                         const test::HeaderList& headers = {}) {
    return test::httpRequest(port(), "PUT", target, headers, body);
  }

 private:
  answers_test::ScratchDir directory_;  // outlives the host
  std::string scenarioPath_;
  test::HostProcess process_;
};

// The entry of `code` in the shipped English explanations, without the
// trailing line ends, which the service drops.
std::string shippedExplanation(int32_t code) {
  std::ifstream file(std::string(QUILLON_SHARE_DIR) + "/errors/English/quillon.txt", std::ios::binary);
  const std::string text((std::istreambuf_iterator<char>(file)), std::istreambuf_iterator<char>());
  const std::string start = "\n<koerror code=\"" + std::to_string(code) + "\">\n";
  const std::size_t begin = text.find(start);
  if (begin == std::string::npos) throw std::runtime_error("no shipped explanation of " + std::to_string(code));
  const std::size_t from = begin + start.size();
  const std::size_t end = text.find_last_not_of("\r\n", text.find("\n</koerror>", from - 1));
  return text.substr(from, end + 1 - from);
}

const std::string kTs = "/quillon/timescales/pendulo/";

const std::vector<Tr> kMixed = {
    {"tr0", "IEEE 1588-2008 BC", "00-80-2F-FF-FE-12-34-56", "PTP_MASTER"},
    {"tr 1", "IEEE 802.1AS-2011", "00-1B-21-FF-FE-AB-CD-EF", "PTP_SLAVE"},
    {"tr2", "IEEE 1588-2008", "00-80-2F-FF-FE-65-43-21", "PTP_MASTER"},
    {"tr3", "IEEE 1588-2008", "00-80-2F-FF-FE-00-00-03", "PTP_SLAVE"},
    {"tr4", "IEEE 802.1AS-2011", "00-80-2F-FF-FE-00-00-04", "PTP_DISABLED"},
};
// Boundary clocks and the selected slave first (the later one first), then
// masters and disabled ports in order; the unselected slave is not published.
const std::vector<std::string> kMixedUris = {
    kTs + "tr-1/00-1B-21-FF-FE-AB-CD-EF", kTs + "tr0/00-80-2F-FF-FE-12-34-56",
    kTs + "tr2/00-80-2F-FF-FE-65-43-21", kTs + "tr4/00-80-2F-FF-FE-00-00-04"};

const std::string kDeviceEntry = std::string("{\"uri\":\"") + kDeviceUri + "\"}";

std::string entries(const std::vector<std::string>& uris) {
  std::string out;
  for (const std::string& uri : uris) out += (out.empty() ? "" : ",") + ("{\"uri\":\"" + uri + "\"}");
  return out;
}

std::string listing(const std::string& entries) {
  return "{\"version\":1,\"resources\":[" + entries + "]}";
}

std::string timescaleDocument(const std::string& uri, const std::string& grandmaster) {
  return "{\"version\":1,\"uri\":\"" + uri + "\",\"data\":{\"grandmasterId\":\"" + grandmaster + "\"}}";
}

// The local time keeper's document as the device library writes it.
std::string deviceDocument(const std::string& requirements, bool coherent) {
  return "{\"uri\":\"" + std::string(kDeviceUri) + "\",\"coherencyRequirements\":" + requirements +
         ",\"plugin\":\"pendulo\",\"coherent\":" + (coherent ? "true" : "false") + ",\"offsetNanos\":250}";
}

// The not-found answers, whole: the resource manager's record raised at
// `line` inside the envelope with the shipped explanation.
std::string notFound(int line, const std::string& members) {
  return errorEnvelope(-52006, shippedExplanation(-52006),
                       "{\"error_constant\":\"koapalerr_resourceNotFound\",\"file\":"
                       "\"quillon/ResourceManager\",\"line\":" + std::to_string(line) +
                           ",\"component\":\"quillon\",\"kosyncdomain_debug\":{" + members + "}}");
}
std::string noTimescale(const std::string& wrong, const std::string& list) {
  return notFound(98, "\"message\":\"Requested timescaleUri does not match any timescaleUri on "
                      "the system\","
                      "\"localTimescaleUri\":\"" + wrong + "\",\"currentTimescaleUris\":" + list);
}
std::string noDevice(int line, const std::string& wrong) {
  return notFound(line, "\"message\":\"Requested syncableDeviceUri does not exist on this host.\","
                        "\"localDeviceUri\":" + quoted(wrong) + ",\"onlyDeviceUri\":\"" + kDeviceUri + "\"");
}

// The record inside an error answer's "errorInfo", "" without one.
std::string recordIn(const std::string& body) {
  cJSON* root = cJSON_Parse(body.c_str());
  const cJSON* error = cJSON_GetObjectItemCaseSensitive(root, "error");
  const cJSON* info = cJSON_GetObjectItemCaseSensitive(error, "errorInfo");
  const std::string record = cJSON_IsString(info) ? info->valuestring : "";
  cJSON_Delete(root);
  return record;
}

void expectAnswer(const test::HttpResponse& r, int status, const std::string& body,
                  const char* statusCodeHeader = nullptr) {
  EXPECT_EQ(r.status, status);
  EXPECT_EQ(r.body, body);
  EXPECT_EQ(r.header("Content-Type").value_or("<none>"), kMediaType);
  EXPECT_EQ(r.header("X-Status-Code").value_or("<none>"),
            statusCodeHeader ? statusCodeHeader : "<none>");
}

TEST(ServiceOverHttp, ListingTimescalesAndDeviceByteForByte) {
  ServiceHost host(scenario(kMixed, "tr 1"));
  struct Case {
    std::string target;
    std::string result;
  } cases[] = {
      {"/quillon/resources", listing(kDeviceEntry + "," + entries(kMixedUris))},
      {"/quillon/resources?resourceType=timescales", listing(entries(kMixedUris))},
      {"/quillon/resources?resourceType=syncableDevices", listing(kDeviceEntry)},
      {kDeviceUri, deviceDocument("null", true)},
      {kMixedUris[0], timescaleDocument(kMixedUris[0], "00:1b:21:ff:fe:ab:cd:ef")},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.target);
    expectAnswer(host.get(c.target, {{"Accept", "text/html, */*"}}), 200, successEnvelope(c.result));
  }

  // The unselected slave is not published, so not found either.
  const std::string slave = kTs + "tr3/00-80-2F-FF-FE-00-00-03";
  expectAnswer(host.get(slave), 500,
               noTimescale(slave, "[\"" + kMixedUris[0] + "\",\"" + kMixedUris[1] + "\",\"" +
                                      kMixedUris[2] + "\",\"" + kMixedUris[3] + "\"]"),
               "-52006");
  // Only the exact URI is the device: not a prefix of it (GET), nor one that
  // differs in case (PUT) or extends it (the load test, with a quote that the
  // envelope escapes once more).
  const std::string prefix = "/quillon/syncableDevices/pendulo/timekeeper/genericT";
  expectAnswer(host.get(prefix), 500, noDevice(75, prefix), "-52006");
  EXPECT_EQ(host.process().stop(), 0);
}

TEST(ServiceOverHttp, RefusalsNoTimescalesAndEditsWhileRunning) {
  ServiceHost host(scenario({}));
  // Refusals carry the success envelope (an unknown command's is under load).
  expectAnswer(host.get(kDeviceUri, {{"Accept", "text/html"}}), 415, successEnvelope());
  expectAnswer(host.get(kDeviceUri, {{"Content-Type", "application/json"}}), 415, successEnvelope());
  // An unsupported method fails the host read: the raw record, no envelope.
  const test::HttpResponse post = test::httpRequest(host.port(), "POST", "/quillon/resources", {}, "{}");
  EXPECT_EQ(post.status, 500);
  EXPECT_EQ(post.body,
            "{\"error_constant\":\"kInvalidRequestMethodType\",\"file\":\"quillon/Request\","
            "\"line\":72,\"component\":\"quillon\",\"quillon_debug\":{\"check failed\":\"false\"}}");

  // Both steps back of the listing: the device's comma, and the opening bracket.
  expectAnswer(host.get("/quillon/resources"), 200, successEnvelope(listing(kDeviceEntry)));
  expectAnswer(host.get("/quillon/resources?resourceType=timescales"), 200,
               successEnvelope("{\"version\":1,\"resources\":]}"));
  expectAnswer(host.get(kMixedUris[1]), 500, noTimescale(kMixedUris[1], "[]"), "-52006");

  host.writeScenario(scenario({kMixed[2]}));
  const std::string expected = successEnvelope(listing(kDeviceEntry + "," + entries({kMixedUris[2]})));
  // The edit must show without restarting the host; the stand-in notices it on
  // its own, so allow it a bounded number of requests.
  std::string last;
  for (int attempt = 0; attempt < 20000 && last != expected; ++attempt) {
    last = host.get("/quillon/resources").body;
  }
  EXPECT_EQ(last, expected);
  EXPECT_EQ(host.process().stop(), 0);
}

TEST(ServiceOverHttp, PutThenGetAndBadBodies) {
  ServiceHost host(scenario({kMixed[0]}));
  const test::HeaderList vendor = {{"Content-Type", kMediaType}};
  expectAnswer(host.put(kDeviceUri, "{\"maxOffsetNanos\":1000}", vendor), 200, successEnvelope("{}"));
  expectAnswer(host.get(kDeviceUri), 200,
               successEnvelope(deviceDocument("{\"maxOffsetNanos\":1000}", true)));
  expectAnswer(host.put(kDeviceUri, "{ \"maxOffsetNanos\" : 100 }"), 200, successEnvelope("{}"));
  expectAnswer(host.get(kDeviceUri), 200,
               successEnvelope(deviceDocument("{\"maxOffsetNanos\":100}", false)));

  // The device library's own record reaches the client; nothing is stored.
  const test::HttpResponse bad = host.put(kDeviceUri, "maxOffsetNanos=1", vendor);
  const std::string record = recordIn(bad.body);
  expectAnswer(bad, 500, errorEnvelope(-52005, shippedExplanation(-52005), record), "-52005");
  EXPECT_EQ(record.rfind("{\"error_constant\":\"koapalerr_invalidParameter\",", 0), 0u) << record;
  EXPECT_NE(record.find(",\"kosdlib_debug\":{"), std::string::npos) << record;
  // An empty body fails outside the resource's own errors: the envelope still
  // goes out, and the raw record follows it.
  expectAnswer(host.put(kDeviceUri, "", vendor), 500,
               successEnvelope() + "{\"error_constant\":\"quillon::kInternalSoftwareError\",\"file\":"
                                   "\"quillon/errors\",\"line\":50,\"component\":\"quillon\",\"quillon_debug\":"
                                   "{\"std::exception\":\"basic_string::_S_construct null not valid\"}}");
  const std::string wrong = "/quillon/syncableDevices/pendulo/timekeeper/generictk";
  expectAnswer(host.put(wrong, "{}"), 500, noDevice(127, wrong), "-52006");
  expectAnswer(host.get(kDeviceUri), 200,
               successEnvelope(deviceDocument("{\"maxOffsetNanos\":100}", false)));
  EXPECT_EQ(host.process().stop(), 0);
}

// What a failing time service makes of a listing: the helpers' record, with
// the service's own nested inside where it was replaced.
TEST(ServiceOverHttp, TimeServiceErrorsReachTheClientAsTheirEnvelope) {
  const auto helpers = [](const char* constant, int line, const std::string& debug) {
    return std::string("{\"error_constant\":\"") + constant +
           "\",\"file\":\"kosdtools_timescales/timescaleHelpers\",\"line\":" + std::to_string(line) +
           ",\"component\":\"quillon\",\"kosyncdomain_debug\":{\"message\":\"" + debug + "}";
  };
  struct Case {
    std::string fault;
    int32_t code;
    std::string head;  // the record up to the time service's own
    std::string tail;
  } cases[] = {
      {"{\"call\":\"getPdmAttrJson\",\"key\":\"timeReferences\",\"code\":-1074100990}", -52006,
       helpers("koapalerr_resourceNotFound", 182,
               "Pendulo does not have the specified attr; maybe the target is running an older version of "
               "Pendulo.\",\"attrKey\":\"timeReferences\"") + ",\"nested_error\":[{",
       ",\"code\":-1074100990}]}"},
      {"{\"call\":\"getPdmAttrJson\",\"key\":\"timeReferences\",\"answer\":\"not json\"}", -52005,
       helpers("koapalerr_invalidParameter", 193,
               "Failed to parse TR IDs from TR list JSON.\",\"trListJson\":\"not json\","
               "\"trIds\":\"timeReferences\"") + "}",
       ""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.fault);
    ServiceHost host(scenario({kMixed[0], kMixed[2]}, "", "\"faults\":[" + c.fault + "]"));
    for (const std::string& target : {std::string("/quillon/resources"), kMixedUris[1]}) {
      SCOPED_TRACE(target);
      const test::HttpResponse r = host.get(target);
      const std::string record = recordIn(r.body);
      expectAnswer(r, 500, errorEnvelope(c.code, shippedExplanation(c.code), record),
                   std::to_string(c.code).c_str());
      ASSERT_GE(record.size(), c.head.size() + c.tail.size()) << record;
      EXPECT_EQ(record.substr(0, c.head.size()), c.head);
      EXPECT_EQ(record.substr(record.size() - c.tail.size()), c.tail);
    }
    EXPECT_EQ(host.process().stop(), 0);
  }
}

// Many clients at once against one host: every answer must be one that a
// single client could have received.
TEST(ServiceUnderLoad, EightClientsOfMixedRequestsGetExactAnswers) {
  constexpr int kThreads = 8;
  constexpr int kRequestsPerThread = 2000;
  ServiceHost host(scenario({kMixed[0], kMixed[2]}));
  const std::string& boundary = kMixedUris[1];
  const std::string& master = kMixedUris[2];
  const std::string timescales = entries({boundary, master});
  const std::string wrongTs = kTs + "tr2/00-80-2f-ff-fe-65-43-21";
  const std::string wrongDevice = std::string(kDeviceUri) + "\"";
  struct Expected {
    std::string method;
    std::string target;
    std::string body;
    int status;
    std::vector<std::string> answers;  // any one of them
  };
  const std::vector<Expected> mix = {
      {"GET", "/quillon/resources", "", 200, {successEnvelope(listing(kDeviceEntry + "," + timescales))}},
      {"GET", "/quillon/resources?resourceType=timescales", "", 200, {successEnvelope(listing(timescales))}},
      {"GET", master, "", 200, {successEnvelope(timescaleDocument(master, "00:80:2f:ff:fe:65:43:21"))}},
      {"GET", wrongTs, "", 500, {noTimescale(wrongTs, "[\"" + boundary + "\",\"" + master + "\"]")}},
      {"PUT", kDeviceUri, "{\"maxOffsetNanos\":1000}", 200, {successEnvelope("{}")}},
      {"GET", kDeviceUri, "", 200,
       {successEnvelope(deviceDocument("null", true)),
        successEnvelope(deviceDocument("{\"maxOffsetNanos\":1000}", true)),
        successEnvelope(deviceDocument("{\"maxOffsetNanos\":100}", false))}},
      {"PUT", std::string(kDeviceUri) + "%22", "{}", 500, {noDevice(127, wrongDevice)}},
      {"PUT", kDeviceUri, "{\"maxOffsetNanos\":100}", 200, {successEnvelope("{}")}},
      {"GET", "/quillon/unknownCommand", "", 404, {successEnvelope()}},
  };

  // Each client answers with its first wrong answer, or "" when all were right.
  std::vector<std::future<std::string>> clients;
  for (int t = 0; t < kThreads; ++t) {
    clients.push_back(std::async(std::launch::async, [&, t] {
      test::HttpClient client(host.port());
      for (int i = 0; i < kRequestsPerThread; ++i) {
        const Expected& e = mix[(i + t) % mix.size()];
        const test::HttpResponse r = client.send(test::HttpRequest{e.method, e.target, {}, e.body});
        if (r.status != e.status ||
            std::find(e.answers.begin(), e.answers.end(), r.body) == e.answers.end()) {
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
