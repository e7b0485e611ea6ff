#include "quillon/service.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <map>
#include <stdexcept>

#include "answers_common/fixtures.h"
#include "error_record/constants.h"
#include "error_record/error.h"

namespace {

using answers_test::OwnedStatus;
using answers_test::ScopedEnv;
using answers_test::ScratchDir;
using ::testing::_;
using ::testing::NiceMock;
using ::testing::Return;
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
constexpr const char* kDevice = "/quillon/syncableDevices/pendulo/timekeeper/genericTk";
const std::string kSuccess = "{\"error\":{\"success\":true,\"errorCode\":0,\"errorText\":\"\"}}";

std::string successWith(const std::string& result) {
  return kSuccess.substr(0, kSuccess.size() - 1) + ",\"result\":" + result + "}";
}

// What the client would see.
struct Answer {
  std::vector<int> codes;
  std::string body;
  std::vector<std::string> mimeTypes;
};

struct Incoming {
  int method = 0;
  std::string command = "syncableDevices";
  std::string contentType;
  std::string accept = kMedia;
  std::string body;
  std::function<void(MockRequest&)> breakHost;  // makes a host call fail
};

Incoming in(int method, std::string command, std::string contentType = "",
            std::string accept = kMedia, std::string body = "") {
  Incoming incoming;
  incoming.method = method;
  incoming.command = std::move(command);
  incoming.contentType = std::move(contentType);
  incoming.accept = std::move(accept);
  incoming.body = std::move(body);
  return incoming;
}

koerr::Exception record(const koerr::ErrorConstant& constant, const char* file, int line) {
  return koerr::Error(constant, file, line).take();
}

class ServiceTest : public ::testing::Test {
 protected:
  Answer answer(const Incoming& in, koerr::Status& status) {
    auto request = std::make_unique<NiceMock<MockRequest>>();
    MockRequest& r = *request;
    ON_CALL(r, getRequestMethodType()).WillByDefault(Return(in.method));
    ON_CALL(r, getCommand()).WillByDefault(Return(in.command));
    ON_CALL(r, getContentType()).WillByDefault(Return(in.contentType));
    ON_CALL(r, getAccept()).WillByDefault(Return(in.accept));
    ON_CALL(r, readPostData()).WillByDefault(Return(in.body));
    ON_CALL(r, getUriVariable(_)).WillByDefault([](const std::string& key) {
      static const std::map<std::string, std::string> variables = {{"plugin", "pendulo"},
                                                                   {"type", "timekeeper"},
                                                                   {"name", "genericTk"},
                                                                   {"resourceType", "timescales"}};
      return variables.count(key) ? variables.at(key) : "";
    });
    Answer seen;
    ON_CALL(r, setHTTPResponseCode(_)).WillByDefault([&](int code) { seen.codes.push_back(code); });
    ON_CALL(r, writeOutput(_)).WillByDefault([&](const std::string& text) { seen.body += text; });
    ON_CALL(r, setHTTPResponseMimeType(_)).WillByDefault([&](const std::string& type) {
      seen.mimeTypes.push_back(type);
    });
    if (in.breakHost) {
      in.breakHost(r);
    }
    std::unique_ptr<quillon::RequestInterface> handed(std::move(request));
    EXPECT_EQ(service_.handleRequest(handed, status).get(), &r);
    return seen;
  }

  ScratchDir share_;  // no explanations: every "errorText" is ""
  ScopedEnv marker_{"KOSYSQ_SHARE_DIR_FILE", share_.write("share.dir", share_.str())};
  std::shared_ptr<StrictMock<MockResourceManager>> manager_ =
      std::make_shared<StrictMock<MockResourceManager>>();
  quillon::Service service_{manager_};
};

TEST_F(ServiceTest, MapsCommandsOntoResourceOperations) {
  const std::string notFoundInfo =
      "\"errorInfo\":\"{\\\"error_constant\\\":\\\"koapalerr_resourceNotFound\\\",\\\"file\\\":"
      "\\\"quillon/ResourceManager\\\",\\\"line\\\":75,\\\"component\\\":\\\"quillon\\\"}\"";
  struct Case {
    const char* name;
    Incoming in;
    std::function<void(MockResourceManager&)> expect;
    Answer answer;
  };
  const Case cases[] = {
      {"GET resources, no media types",
       in(0, "resources", "", ""),
       [](MockResourceManager& m) {
         EXPECT_CALL(m, getResources("timescales")).WillOnce(Return("{\"r\":1}"));
       },
       {{200}, successWith("{\"r\":1}"), {kMedia}}},
      {"GET device, Accept lists */*",
       in(0, "syncableDevices", kMedia, "text/html, */*;q=0.1"),
       [](MockResourceManager& m) {
         EXPECT_CALL(m, getSyncableDevice(kDevice)).WillOnce(Return("{}"));
       },
       {{200}, successWith("{}"), {kMedia}}},
      {"GET unknown timescale",
       in(0, "timescales"),
       [](MockResourceManager& m) {
         EXPECT_CALL(m, getTimescale("/quillon/timescales/pendulo/timekeeper/genericTk"))
             .WillOnce(
                 Throw(record(koerr::koapalerr_resourceNotFound, "quillon/ResourceManager", 75)));
       },
       {{200, -52006},
        "{\"error\":{\"success\":false,\"errorCode\":-52006,\"errorText\":\"\"," + notFoundInfo +
            "}}",
        {kMedia}}},
      {"PUT device",
       in(1, "syncableDevices", kMedia, "*/*", "{\"c\":1}"),
       [](MockResourceManager& m) { EXPECT_CALL(m, putSyncableDevice(kDevice, "{\"c\":1}")); },
       {{200}, successWith("{}"), {kMedia}}},
      {"accepted code",
       in(0, "syncableDevices"),
       [](MockResourceManager& m) {
         koerr::Status accepted;
         koerr::setCode(accepted, koerr::kAcceptedCode);
         EXPECT_CALL(m, getSyncableDevice(_))
             .WillOnce(Throw(koerr::Exception(std::move(accepted))));
       },
       {{200, 202}, kSuccess, {kMedia}}},
      {"Accept names only another type",
       in(0, "syncableDevices", "", "text/html"),
       nullptr,
       {{200, 415}, kSuccess, {kMedia}}},
      {"Content-Type names another type",
       in(0, "syncableDevices", "application/json", kMedia),
       nullptr,
       {{200, 415}, kSuccess, {kMedia}}},
      {"PUT resources",
       in(1, "resources", "", "", "{}"),
       nullptr,
       {{200, 404}, kSuccess, {kMedia}}},
      {"GET unknown word", in(0, "clocks"), nullptr, {{200, 404}, kSuccess, {kMedia}}},
      {"unknown method value", in(7, "resources"), nullptr, {{200, 404}, kSuccess, {kMedia}}},
      {"no command word",
       in(0, ""),
       nullptr,
       {{200, -411145},
        "{\"error\":{\"success\":false,\"errorCode\":-411145,\"errorText\":\"\",\"errorInfo\":"
        "\"{\\\"error_constant\\\":\\\"kCommandNotFound\\\",\\\"file\\\":\\\"quillon/Service\\\","
        "\\\"line\\\":260,\\\"component\\\":\\\"quillon\\\",\\\"kosyncdomain_debug\\\":{"
        "\\\"message\\\":"
        "\\\"Sync Domain Web Service Plugin failed to process "
        "command.\\\",\\\"command\\\":\\\"\\\","
        "\\\"requestMethodType\\\":0}}\"}}",
        {kMedia}}},
      {"PUT without body",
       in(1, "syncableDevices"),
       nullptr,
       {{200, -411200},
        "{\"error\":{\"success\":false,\"errorCode\":-411200,\"errorText\":\"\",\"errorInfo\":"
        "\"{\\\"error_constant\\\":\\\"kInternalSoftwareError\\\",\\\"file\\\":\\\"quillon/"
        "Service\\\","
        "\\\"line\\\":235,\\\"component\\\":\\\"quillon\\\",\\\"quillon_debug\\\":{\\\"check "
        "failed\\\":"
        "\\\"!data.empty()\\\"}}\"}}",
        {kMedia}}},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    if (c.expect) {
      c.expect(*manager_);
    }
    OwnedStatus status;
    const Answer seen = answer(c.in, status);
    EXPECT_EQ(seen.codes, c.answer.codes);
    EXPECT_EQ(seen.body, c.answer.body);
    EXPECT_EQ(seen.mimeTypes, c.answer.mimeTypes);
    EXPECT_EQ(status.code, 0);
    ::testing::Mock::VerifyAndClearExpectations(manager_.get());
  }
}

TEST_F(ServiceTest, HostAndForeignFailuresAnswer500WithTheRawRecord) {
  const std::string badMethod =
      "{\"error_constant\":\"kInvalidRequestMethodType\",\"file\":\"quillon/Request\",\"line\":90,"
      "\"component\":\"quillon\"}";
  Incoming post = in(0, "syncableDevices");
  post.breakHost = [](MockRequest& r) {
    EXPECT_CALL(r, getRequestMethodType())
        .WillOnce(Throw(record(koerr::kInvalidRequestMethodType, "quillon/Request", 90)));
  };
  OwnedStatus status;
  Answer seen = answer(post, status);
  EXPECT_EQ(seen.codes, (std::vector<int>{200, 500}));
  EXPECT_EQ(seen.body, badMethod);
  EXPECT_TRUE(seen.mimeTypes.empty());
  EXPECT_EQ(status.code, -411203);

  // A non-record exception from the resource: the envelope still goes out,
  // then the caller's record right behind it.
  EXPECT_CALL(*manager_, getSyncableDevice(_)).WillOnce(Throw(std::runtime_error("boom")));
  OwnedStatus foreign;
  seen = answer(in(0, "syncableDevices"), foreign);
  EXPECT_EQ(seen.codes, (std::vector<int>{200, 500}));
  EXPECT_EQ(seen.body, kSuccess +
                           "{\"error_constant\":\"quillon::kInternalSoftwareError\",\"file\":"
                           "\"quillon/errors\",\"line\":50,\"component\":\"quillon\","
                           "\"quillon_debug\":{\"std::exception\":\"boom\"}}");
  EXPECT_EQ(seen.mimeTypes, std::vector<std::string>{kMedia});
}

TEST_F(ServiceTest, RefusesWithoutTouchingAnythingWhenItCannotStart) {
  OwnedStatus earlier(-1);
  auto strict = std::make_unique<StrictMock<MockRequest>>();
  std::unique_ptr<quillon::RequestInterface> request(std::move(strict));
  EXPECT_EQ(service_.handleRequest(request, earlier), nullptr);
  EXPECT_NE(request, nullptr);
  EXPECT_EQ(earlier.code, -1);

  std::unique_ptr<quillon::RequestInterface> none;
  OwnedStatus status;
  EXPECT_EQ(service_.handleRequest(none, status), nullptr);
  EXPECT_EQ(
      status.text(),
      "{\"error_constant\":\"kInternalSoftwareError\",\"file\":\"quillon/Service\",\"line\":117,"
      "\"component\":\"quillon\",\"quillon_debug\":{\"check failed\":\"request != nullptr\"}}");
}

}  // namespace
