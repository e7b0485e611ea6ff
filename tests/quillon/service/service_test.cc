#include "quillon/service.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>

#include "support/answer_fixtures.h"
#include "error_record/constants.h"
#include "error_record/error.h"

namespace {

using answers_test::errorEnvelope;
using answers_test::OwnedStatus;
using answers_test::successEnvelope;
using ::testing::_;
using ::testing::StrictMock;
using ::testing::Throw;

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
  std::string body;
  std::vector<std::string> mimeTypes;
  std::vector<std::string> calls;
};

class FakeRequest : public quillon::RequestInterface {
 public:
  FakeRequest(Incoming in, Answer& seen) : in_(std::move(in)), seen_(seen) {}
  int getRequestMethodType() override { return read("method", in_.method); }
  std::string getCommand() override { return read("command", in_.command); }
  std::string getContentType() override { return read("contentType", in_.contentType); }
  std::string getAccept() override { return read("accept", in_.accept); }
  std::string readPostData() override { return read("body", in_.body); }
  std::string getUriVariable(const std::string&) override { return ""; }
  void setHTTPResponseCode(int code) override {
    seen_.calls.push_back("code " + std::to_string(code));
  }
  void writeOutput(const std::string& text) override {
    seen_.body += text;
    seen_.calls.push_back("output");
  }
  void setHTTPResponseMimeType(const std::string& type) override {
    seen_.mimeTypes.push_back(type);
    seen_.calls.push_back("mime");
  }

 private:
  template <typename T>
  T read(const char* call, T value) {
    seen_.calls.push_back(call);
    return value;
  }
  Incoming in_;
  Answer& seen_;
};

class ServiceTest : public ::testing::Test {
 protected:
  Answer answer(const Incoming& in, koerr::Status& status) {
    Answer seen;
    std::unique_ptr<quillon::RequestInterface> request = std::make_unique<FakeRequest>(in, seen);
    const quillon::RequestInterface* handed = request.get();
    EXPECT_EQ(service_.handleRequest(request, status).get(), handed);
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
  struct Case {
    const char* name;
    Incoming in;
    std::function<void(MockResourceManager&)> expect;
    std::vector<std::string> calls;  // after the media types are read, before the answer goes out
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
       {"command", "code 202"}, successEnvelope()},
      // A refusal never reads the command.
      {"Accept names only another type", {0, "resources", "", "text/html", ""}, nullptr, {"code 415"},
       successEnvelope()},
      {"PUT resources", {1, "resources", "", "", "{}"}, nullptr, {"command", "body", "code 404"},
       successEnvelope()},
      {"unknown method value", {7, "resources", "", "", ""}, nullptr, {"command", "code 404"},
       successEnvelope()},
      {"no command word", {0, "", "", "", ""}, nullptr, {"command", "code -411145"},
       errorEnvelope(-411145, "",
                     "{\"error_constant\":\"kCommandNotFound\",\"file\":\"quillon/Service\","
                     "\"line\":260,\"component\":\"quillon\",\"kosyncdomain_debug\":{\"message\":"
                     "\"Sync Domain Web Service Plugin failed to process command.\",\"command\":"
                     "\"\",\"requestMethodType\":0}}")},
      // The body is checked before the command word is looked at.
      {"PUT unknown word without body", {1, "clocks", "", "", ""}, nullptr,
       {"command", "body", "code -411200"}, noBody},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    if (c.expect) c.expect(*manager_);
    OwnedStatus status;
    const Answer seen = answer(c.in, status);
    std::vector<std::string> calls{"code 200", "method", "contentType", "accept"};
    calls.insert(calls.end(), c.calls.begin(), c.calls.end());
    calls.insert(calls.end(), {"output", "mime"});
    EXPECT_EQ(seen.calls, calls);
    EXPECT_EQ(seen.body, c.body);
    EXPECT_EQ(seen.mimeTypes, std::vector<std::string>{kMedia});
    EXPECT_EQ(status.code, 0);
    ::testing::Mock::VerifyAndClearExpectations(manager_.get());
  }
}

TEST_F(ServiceTest, RefusesWithoutTouchingAnythingWhenItCannotStart) {
  OwnedStatus earlier(-1);
  Answer seen;
  std::unique_ptr<quillon::RequestInterface> request = std::make_unique<FakeRequest>(Incoming{}, seen);
  EXPECT_EQ(service_.handleRequest(request, earlier), nullptr);
  EXPECT_NE(request, nullptr);
  EXPECT_TRUE(seen.calls.empty());
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
