// What a client gets for requests the service refuses or cannot answer.
#include <cJSON.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>

#include "e2e/service_host.h"

namespace {

namespace test = quillon::test_support;
using e2e::kDeviceUri;
using e2e::kMediaType;

using JsonPtr = std::unique_ptr<cJSON, decltype(&cJSON_Delete)>;

JsonPtr parse(const std::string& text) { return JsonPtr(cJSON_Parse(text.c_str()), &cJSON_Delete); }

std::string member(const cJSON* object, const char* key) {
  const cJSON* item = cJSON_GetObjectItemCaseSensitive(object, key);
  return cJSON_IsString(item) ? item->valuestring : "<missing>";
}

TEST(AnswersOverHttp, RefusalsCarryTheSuccessEnvelopeAndTheirStatus) {
  e2e::ServiceHost host(e2e::scenario({}));
  const std::string device = kDeviceUri;
  struct Case {
    const char* name;
    std::string target;
    test::HeaderList headers;
    int status;
  };
  const Case cases[] = {
      {"unknown command", "/quillon/clocks", {}, 404},
      {"Accept of another type only", device, {{"Accept", "text/html"}}, 415},
      {"Content-Type of another type", device, {{"Content-Type", "application/json"}}, 415},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    const test::HttpResponse r = host.get(c.target, c.headers);
    EXPECT_EQ(r.status, c.status);
    EXPECT_EQ(r.body, e2e::successEnvelope(""));
    EXPECT_EQ(r.header("Content-Type").value_or("<none>"), kMediaType);
  }
  EXPECT_EQ(host.process().stop(), 0);
}

TEST(AnswersOverHttp, FailuresCarryTheirRecordAndExplanation) {
  e2e::ServiceHost host(e2e::scenario({}));

  // An unsupported method is a failed host read: the raw record, nothing else.
  const test::HttpResponse post =
      test::httpRequest(host.port(), "POST", "/quillon/resources", {}, "{}");
  EXPECT_EQ(post.status, 500);
  JsonPtr record = parse(post.body);
  ASSERT_NE(record, nullptr) << post.body;
  EXPECT_EQ(member(record.get(), "error_constant"), "kInvalidRequestMethodType");
  EXPECT_EQ(member(record.get(), "file"), "quillon/Request");

  // A resource error: its code as the status, the shipped explanation as text.
  const std::string other = "/quillon/syncableDevices/pendulo/timekeeper/otherTk";
  const test::HttpResponse missing = host.get(other, {{"Accept", "text/html, */*"}});
  EXPECT_EQ(missing.status, 500);
  EXPECT_EQ(missing.header("X-Status-Code").value_or("<none>"), "-52006");
  EXPECT_EQ(missing.header("Content-Type").value_or("<none>"), kMediaType);
  JsonPtr envelope = parse(missing.body);
  ASSERT_NE(envelope, nullptr) << missing.body;
  const cJSON* error = cJSON_GetObjectItemCaseSensitive(envelope.get(), "error");
  const std::string explanation = e2e::shippedExplanation(-52006);
  EXPECT_FALSE(explanation.empty());
  EXPECT_EQ(member(error, "errorText"), explanation);
  JsonPtr info = parse(member(error, "errorInfo"));
  ASSERT_NE(info, nullptr) << missing.body;
  EXPECT_EQ(member(info.get(), "error_constant"), "koapalerr_resourceNotFound");
  EXPECT_EQ(cJSON_GetObjectItemCaseSensitive(envelope.get(), "result"), nullptr);
  EXPECT_EQ(host.process().stop(), 0);
}

}  // namespace
