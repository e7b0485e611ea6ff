#include "quillon/service.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <map>
#include <stdexcept>

#include "support/answer_fixtures.h"
#include "error_record/constants.h"
#include "error_record/error.h"

namespace {

using answers_test::errorEnvelope;
using answers_test::OwnedStatus;
using answers_test::successEnvelope;
using ::testing::_;
using ::testing::NiceMock;
using ::testing::StrictMock;
using ::testing::Throw;

class MockRequest : public quillon::RequestInterface {
 public:
  MOCK_METHOD(int, getRequestMethodType, (), (override));
  MOCK_METHOD(std::string, getCommand, (), (override));
  MOCK_METHOD(std::string, readPostData, (), (override));
  MOCK_METHOD(std::string, getUriVariable, (const std::string&), (override));
  MOCK_METHOD(void, setHTTPResponseCode, (int), (override));
  MOCK_METHOD(void, writeOutput, (const std::string&), (override));
  MOCK_METHOD(std::string, getContentType, (), (override));
  MOCK_METHOD(std::string, getAccept, (), (override));
  MOCK_METHOD(void, setHTTPResponseMimeType, (const std::string&), (override));
};

class MockResourceManager : public quillon::ResourceManagerInterface {
 public:
  MOCK_METHOD(std::string, getResources, (const std::string&), (override));
  MOCK_METHOD(std::string, getSyncableDevice, (const std::string&), (override));
  MOCK_METHOD(std::string, getTimescale, (const std::string&), (override));
  MOCK_METHOD(void, putSyncableDevice, (const std::string&, const std::string&), (override));
};

constexpr const char* kMedia = "vnd.ko.syncDomain.v0/json; charset=utf-8";

struct Incoming {
  int method;
  std::string command, contentType, accept, body;
};

// What the client would see, and every host call in the order made.
struct Answer {
  std::vector<int> codes;
  std::string body;
  std::vector<std::string> mimeTypes;
  std::vector<std::string> calls;
};

class ServiceTest : public ::testing::Test {
 protected:
  Answer answer(const Incoming& in, koerr::Status& status) {
    auto request = std::make_unique<NiceMock<MockRequest>>();
    MockRequest& r = *request;
    Answer seen;
    const auto read = [&seen](const char* call, auto value) {
      return [&seen, call, value] {
        seen.calls.push_back(call);
        return value;
      };
    };
    ON_CALL(r, getRequestMethodType()).WillByDefault(read("method", in.method));
    ON_CALL(r, getCommand()).WillByDefault(read("command", in.command));
    ON_CALL(r, getContentType()).WillByDefault(read("contentType", in.contentType));
    ON_CALL(r, getAccept()).WillByDefault(read("accept", in.accept));
    ON_CALL(r, readPostData()).WillByDefault(read("body", in.body));
    ON_CALL(r, getUriVariable(_)).WillByDefault([](const std::string& key) {
      static const std::map<std::string, std::string> variables = {
          {"plugin", "pendulo"}, {"type", "timekeeper"}, {"name", "genericTk"},
          {"resourceType", "timescales"}};
      return variables.count(key) ? variables.at(key) : "";
    });
    ON_CALL(r, setHTTPResponseCode(_)).WillByDefault([&](int code) {
      seen.codes.push_back(code);
      seen.calls.push_back("code " + std::to_string(code));
    });
    ON_CALL(r, writeOutput(_)).WillByDefault([&](const std::string& text) {
      seen.body += text;
      seen.calls.push_back("output");
    });
    ON_CALL(r, setHTTPResponseMimeType(_)).WillByDefault([&](const std::string& type) {
      seen.mimeTypes.push_back(type);
      seen.calls.push_back("mime");
    });
    std::unique_ptr<quillon::RequestInterface> handed(std::move(request));
    EXPECT_EQ(service_.handleRequest(handed, status).get(), &r);
    return seen;
  }

  answers_test::ScratchDir share_;  // no explanations: every "errorText" is ""
  answers_test::ScopedEnv marker_{"KOSYSQ_SHARE_DIR_FILE",
                                  share_.write("share.dir", share_.str())};
  std::shared_ptr<StrictMock<MockResourceManager>> manager_ =
      std::make_shared<StrictMock<MockResourceManager>>();
  quillon::Service service_{manager_};
};

// The answers a client cannot provoke over HTTP, and the exact order of host
// calls. Device and timescale reads, the device write, the listing and an
// unknown word are checked byte for byte over HTTP by the end-to-end suite.
TEST_F(ServiceTest, MapsCommandsOntoResourceOperations) {
  using Expect = std::function<void(MockResourceManager&)>;
  struct Case {
    const char* name;
    Incoming in;
    Expect expect;
    std::vector<int> codes;
    std::string body;
  };
  const std::string noBody =
      errorEnvelope(-411200, "",
                    "{\"error_constant\":\"kInternalSoftwareError\",\"file\":\"quillon/Service\","
                    "\"line\":235,\"component\":\"quillon\",\"quillon_debug\":{\"check failed\":"
                    "\"!data.empty()\"}}");
  const Case cases[] = {
      {"accepted code", {0, "syncableDevices", "", "", ""},
       [](MockResourceManager& m) {
         koerr::Status accepted;
         koerr::setCode(accepted, koerr::kAcceptedCode);
         EXPECT_CALL(m, getSyncableDevice(_)).WillOnce(Throw(koerr::Exception(std::move(accepted))));
       },
       {200, 202}, successEnvelope()},
      {"Accept names only another type", {0, "resources", "", "text/html", ""}, nullptr,
       {200, 415}, successEnvelope()},
      {"PUT resources", {1, "resources", "", "", "{}"}, nullptr, {200, 404}, successEnvelope()},
      {"unknown method value", {7, "resources", "", "", ""}, nullptr, {200, 404}, successEnvelope()},
      {"no command word", {0, "", "", "", ""}, nullptr, {200, -411145},
       errorEnvelope(-411145, "",
                     "{\"error_constant\":\"kCommandNotFound\",\"file\":\"quillon/Service\","
                     "\"line\":260,\"component\":\"quillon\",\"kosyncdomain_debug\":{\"message\":"
                     "\"Sync Domain Web Service Plugin failed to process command.\",\"command\":"
                     "\"\",\"requestMethodType\":0}}")},
      // The body is checked before the command word is looked at.
      {"PUT without body", {1, "syncableDevices", "", "", ""}, nullptr, {200, -411200}, noBody},
      {"PUT unknown word without body", {1, "clocks", "", "", ""}, nullptr, {200, -411200},
       noBody},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    if (c.expect) {
      c.expect(*manager_);
    }
    OwnedStatus status;
    const Answer seen = answer(c.in, status);
    EXPECT_EQ(seen.codes, c.codes);
    EXPECT_EQ(seen.body, c.body);
    EXPECT_EQ(seen.mimeTypes, std::vector<std::string>{kMedia});
    const std::vector<std::string> head{"code 200", "method", "contentType", "accept"};
    ASSERT_GE(seen.calls.size(), head.size() + 3);
    EXPECT_TRUE(std::equal(head.begin(), head.end(), seen.calls.begin()));
    // A refusal never reads the command; any later status precedes the body.
    const bool refused = c.codes.back() == 415;
    EXPECT_EQ(seen.calls[head.size()], refused ? "code 415" : "command");
    if (c.codes.size() > 1) {
      EXPECT_EQ(seen.calls[seen.calls.size() - 3], "code " + std::to_string(c.codes.back()));
    }
    EXPECT_EQ(std::vector<std::string>(seen.calls.end() - 2, seen.calls.end()),
              (std::vector<std::string>{"output", "mime"}));
    EXPECT_EQ(status.code, 0);
    ::testing::Mock::VerifyAndClearExpectations(manager_.get());
  }
}

// A host read that fails answers 500 with the raw record; that is checked over
// HTTP. A non-record exception from the resource is not an error of the
// resource: the envelope still goes out, then the caller's record behind it.
TEST_F(ServiceTest, ForeignFailuresAnswer500WithTheRawRecordAfterTheEnvelope) {
  EXPECT_CALL(*manager_, getResources(_)).WillOnce(Throw(std::runtime_error("boom")));
  OwnedStatus foreign;
  const Answer seen = answer({0, "resources", "", "", ""}, foreign);
  EXPECT_EQ(seen.calls,
            (std::vector<std::string>{"code 200", "method", "contentType", "accept", "command",
                                      "output", "mime", "output", "code 500"}));
  EXPECT_EQ(seen.body, successEnvelope() +
                           "{\"error_constant\":\"quillon::kInternalSoftwareError\",\"file\":"
                           "\"quillon/errors\",\"line\":50,\"component\":\"quillon\","
                           "\"quillon_debug\":{\"std::exception\":\"boom\"}}");
  EXPECT_EQ(seen.mimeTypes, std::vector<std::string>{kMedia});
}

TEST_F(ServiceTest, RefusesWithoutTouchingAnythingWhenItCannotStart) {
  OwnedStatus earlier(-1);
  std::unique_ptr<quillon::RequestInterface> request = std::make_unique<StrictMock<MockRequest>>();
  EXPECT_EQ(service_.handleRequest(request, earlier), nullptr);
  EXPECT_NE(request, nullptr);
  EXPECT_EQ(earlier.code, -1);

  std::unique_ptr<quillon::RequestInterface> none;
  OwnedStatus status;
  EXPECT_EQ(service_.handleRequest(none, status), nullptr);
  EXPECT_EQ(status.text(),
            "{\"error_constant\":\"kInternalSoftwareError\",\"file\":\"quillon/Service\","
            "\"line\":117,\"component\":\"quillon\",\"quillon_debug\":{\"check failed\":"
            "\"request != nullptr\"}}");
}

}  // namespace
