// The service over HTTP, as a client sees it: every answer byte for byte.
#include <cJSON.h>
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "e2e/service_host.h"

namespace e2e {
namespace {

namespace test = quillon::test_support;

const std::string kTs = "/quillon/timescales/pendulo/";
const char* const kNoDevice = "Requested syncableDeviceUri does not exist on this host.";

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

std::string entries(const std::vector<std::string>& uris) {
  std::string out;
  for (const std::string& uri : uris) out += (out.empty() ? "" : ",") + ("{\"uri\":\"" + uri + "\"}");
  return out;
}

const cJSON* member(const cJSON* object, const char* key) {
  return cJSON_GetObjectItemCaseSensitive(object, key);
}

// An error answer parsed: the envelope, and the record inside its "errorInfo".
struct ErrorAnswer {
  explicit ErrorAnswer(const std::string& body) : envelope(cJSON_Parse(body.c_str())) {
    const cJSON* info = member(member(envelope, "error"), "errorInfo");
    record = cJSON_IsString(info) ? cJSON_Parse(info->valuestring) : nullptr;
  }
  ~ErrorAnswer() { cJSON_Delete(record); cJSON_Delete(envelope); }
  cJSON* envelope;
  cJSON* record;
};

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
  const std::string device = std::string("{\"uri\":\"") + kDeviceUri + "\"}";
  struct Case {
    std::string target;
    std::string result;
  } cases[] = {
      {"/quillon/resources",
       "{\"version\":1,\"resources\":[" + device + "," + entries(kMixedUris) + "]}"},
      {"/quillon/resources?resourceType=timescales",
       "{\"version\":1,\"resources\":[" + entries(kMixedUris) + "]}"},
      {"/quillon/resources?resourceType=syncableDevices",
       "{\"version\":1,\"resources\":[" + device + "]}"},
      {"/quillon/resources?resourceType=Timescales", "{\"version\":1,\"resources\":[]}"},
      {kDeviceUri, deviceDocument("null", true)},
      {kMixedUris[0],
       "{\"version\":1,\"uri\":\"" + kMixedUris[0] + "\",\"data\":{\"grandmasterId\":\"00:1b:21:ff:fe:ab:cd:ef\"}}"},
      {kMixedUris[3],
       "{\"version\":1,\"uri\":\"" + kMixedUris[3] + "\",\"data\":{\"grandmasterId\":\"00:80:2f:ff:fe:00:00:04\"}}"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.target);
    expectAnswer(host.get(c.target, {{"Accept", "text/html, */*"}}), 200, successEnvelope(c.result));
  }

  const std::string list = "[\"" + kMixedUris[0] + "\",\"" + kMixedUris[1] + "\",\"" + kMixedUris[2] +
                           "\",\"" + kMixedUris[3] + "\"]";
  for (const std::string& wrong : {kTs + "tr-1/00-1b-21-ff-fe-ab-cd-ef", kMixedUris[1].substr(0, kMixedUris[1].size() - 1),
                                   kTs + "tr3/00-80-2F-FF-FE-00-00-03"}) {
    SCOPED_TRACE(wrong);
    const std::string record = notFoundRecord(
        98, "Requested timescaleUri does not match any timescaleUri on the system",
        "\"localTimescaleUri\":\"" + wrong + "\",\"currentTimescaleUris\":" + list);
    expectAnswer(host.get(wrong), 500, errorEnvelope(-52006, shippedExplanation(-52006), record), "-52006");
  }
  const std::string wrongDevice = std::string(kDeviceUri) + "X";
  expectAnswer(host.get(wrongDevice), 500,
               errorEnvelope(-52006, shippedExplanation(-52006),
                             notFoundRecord(75, kNoDevice, "\"localDeviceUri\":\"" + wrongDevice +
                                                               "\",\"onlyDeviceUri\":\"" + kDeviceUri + "\"")),
               "-52006");
  EXPECT_EQ(host.process().stop(), 0);
}

TEST(ServiceOverHttp, RefusalsCarryTheSuccessEnvelopeAndHostReadFailuresTheRawRecord) {
  ServiceHost host(scenario({}));
  struct Case {
    const char* name;
    std::string target;
    test::HeaderList headers;
    int status;
  } cases[] = {
      {"unknown command", "/quillon/clocks", {}, 404},
      {"Accept of another type only", kDeviceUri, {{"Accept", "text/html"}}, 415},
      {"Content-Type of another type", kDeviceUri, {{"Content-Type", "application/json"}}, 415},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    expectAnswer(host.get(c.target, c.headers), c.status, successEnvelope());
  }
  // An unsupported method fails the host read: the raw record, no envelope.
  const test::HttpResponse post = test::httpRequest(host.port(), "POST", "/quillon/resources", {}, "{}");
  EXPECT_EQ(post.status, 500);
  EXPECT_EQ(post.body,
            "{\"error_constant\":\"kInvalidRequestMethodType\",\"file\":\"quillon/Request\","
            "\"line\":72,\"component\":\"quillon\",\"quillon_debug\":{\"check failed\":\"false\"}}");
  EXPECT_EQ(host.process().stop(), 0);
}

TEST(ServiceOverHttp, NoTimescalesAndEditsWhileRunning) {
  ServiceHost host(scenario({}));
  const std::string device = std::string("{\"uri\":\"") + kDeviceUri + "\"}";
  // Both steps back of the listing: the device's comma, and the opening bracket.
  expectAnswer(host.get("/quillon/resources"), 200,
               successEnvelope("{\"version\":1,\"resources\":[" + device + "]}"));
  expectAnswer(host.get("/quillon/resources?resourceType=timescales"), 200,
               successEnvelope("{\"version\":1,\"resources\":]}"));

  host.writeScenario(scenario({kMixed[2]}));
  const std::string expected =
      successEnvelope("{\"version\":1,\"resources\":[" + device + "," + entries({kMixedUris[2]}) + "]}");
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
  for (const char* bad : {"[1]", "maxOffsetNanos=1"}) {
    SCOPED_TRACE(bad);
    const test::HttpResponse r = host.put(kDeviceUri, bad, vendor);
    EXPECT_EQ(r.status, 500);
    EXPECT_EQ(r.header("X-Status-Code").value_or(""), "-52005");
    const ErrorAnswer answer(r.body);
    ASSERT_NE(answer.record, nullptr) << r.body;
    EXPECT_STREQ(member(answer.record, "error_constant")->valuestring, "koapalerr_invalidParameter");
    EXPECT_NE(member(answer.record, "kosdlib_debug"), nullptr) << r.body;
    EXPECT_EQ(member(answer.envelope, "result"), nullptr);
  }
  const std::string wrong = "/quillon/syncableDevices/pendulo/timekeeper/generictk";
  expectAnswer(host.put(wrong, "{}"), 500,
               errorEnvelope(-52006, shippedExplanation(-52006),
                             notFoundRecord(127, kNoDevice, "\"localDeviceUri\":\"" + wrong +
                                                               "\",\"onlyDeviceUri\":\"" + kDeviceUri + "\"")),
               "-52006");
  expectAnswer(host.get(kDeviceUri), 200,
               successEnvelope(deviceDocument("{\"maxOffsetNanos\":100}", false)));
  EXPECT_EQ(host.process().stop(), 0);
}

// What a failing time service makes of a listing: the helpers' record, with
// the service's own nested inside where it was replaced.
TEST(ServiceOverHttp, TimeServiceErrorsReachTheClientAsTheirEnvelope) {
  struct Case {
    std::string fault;
    int32_t code;
    std::string constant;
    int line;
    std::string message;
    int32_t nestedCode;  // 0: none
  } cases[] = {
      {"{\"call\":\"getPdmAttrJson\",\"key\":\"timeReferences\",\"code\":-1074100990}",
       -52006, "koapalerr_resourceNotFound", 182,
       "Pendulo does not have the specified attr; maybe the target is running an older version of Pendulo.",
       -1074100990},
      {"{\"call\":\"getTrAttrJson\",\"trId\":\"tr2\",\"key\":\"type\",\"code\":-1074100991}",
       -52006, "koapalerr_resourceNotFound", 221, "The specified Pendulo Time Reference does not exist.",
       -1074100991},
      {"{\"call\":\"getPdmAttrJson\",\"key\":\"timeReferences\",\"answer\":\"not json\"}",
       -52005, "koapalerr_invalidParameter", 193, "Failed to parse TR IDs from TR list JSON.", 0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.message);
    ServiceHost host(scenario({kMixed[0], kMixed[2]}, "", "\"faults\":[" + c.fault + "]"));
    for (const std::string& target : {std::string("/quillon/resources"), kMixedUris[1]}) {
      SCOPED_TRACE(target);
      const test::HttpResponse r = host.get(target);
      EXPECT_EQ(r.status, 500);
      EXPECT_EQ(r.header("X-Status-Code").value_or(""), std::to_string(c.code));
      const ErrorAnswer answer(r.body);
      const cJSON* error = member(answer.envelope, "error");
      ASSERT_NE(answer.record, nullptr) << r.body;
      EXPECT_TRUE(cJSON_IsFalse(member(error, "success")));
      EXPECT_EQ(member(error, "errorCode")->valueint, c.code);
      const cJSON* record = answer.record;
      EXPECT_STREQ(member(record, "error_constant")->valuestring, c.constant.c_str());
      EXPECT_STREQ(member(record, "file")->valuestring, "kosdtools_timescales/timescaleHelpers");
      EXPECT_EQ(member(record, "line")->valueint, c.line);
      EXPECT_STREQ(member(member(record, "kosyncdomain_debug"), "message")->valuestring, c.message.c_str());
      const cJSON* nested = member(record, "nested_error");
      EXPECT_EQ(nested == nullptr, c.nestedCode == 0);
      ASSERT_EQ(cJSON_GetArraySize(nested), c.nestedCode == 0 ? 0 : 1);
      if (c.nestedCode != 0) {
        EXPECT_EQ(member(cJSON_GetArrayItem(nested, 0), "code")->valueint, c.nestedCode);
      }
    }
    EXPECT_EQ(host.process().stop(), 0);
  }
}

}  // namespace
}  // namespace e2e
