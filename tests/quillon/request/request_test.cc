// quillon::Request against a scripted host: this executable defines the host's
// C functions itself, so they take precedence over the runtime library's.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <string>

#include "error_record/exception.h"
#include "quillon/request.h"
#include "support/raised.h"
#include "ws_runtime/ws_runtime.h"

namespace {

using ::testing::_;
using ::testing::Invoke;
using ::testing::Return;
using ::testing::StrictMock;
namespace codes = ws::runtime::errorCodes;

class MockHost {
 public:
  MOCK_METHOD(int32_t, readVariable, (const std::string& name, char* buffer, uint32_t* length));
  MOCK_METHOD(int32_t, readPostData, (char* buffer, uint32_t* length));
  MOCK_METHOD(int32_t, writeOutput, (const std::string& data));
  MOCK_METHOD(int32_t, flush, ());
  MOCK_METHOD(int32_t, setCode, (int32_t code));
  MOCK_METHOD(int32_t, setMimeType, (const std::string& mimeType));
};

class MockInfo : public ws::runtime::RequestInfo {
 public:
  MOCK_METHOD(bool, lookupVariable, (const std::u32string&, std::u32string&), (const, override));
  MOCK_METHOD(const std::u32string&, path, (), (const, override));
  MOCK_METHOD(const std::u32string&, clientAddress, (), (const, override));
  MOCK_METHOD(const std::u32string&, command, (), (const, override));
};

MockHost* host = nullptr;
constexpr uint32_t kId = 4711;

// "code|record" of what `call` raises ("0|<nothing thrown>" when nothing).
std::string recordOf(const std::function<void()>& call) {
  const auto raised = quillon::test_support::raisedBy(call);
  return std::to_string(raised.code) + "|" + raised.record;
}

std::string record(int32_t code, const char* constant, int line, const std::string& debug) {
  return std::to_string(code) + "|{\"error_constant\":\"" + constant +
         "\",\"file\":\"quillon/Request\",\"line\":" + std::to_string(line) +
         ",\"component\":\"quillon\",\"quillon_debug\":{" + debug + "}}";
}

std::string hostFailure(int32_t code, int line, const std::string& function) {
  return record(code, "returnValue", line,
                "\"function\":\"" + function + "\",\"returnValue\":" + std::to_string(code));
}

std::string checkFailure(int32_t code, const char* constant, int line, const char* condition) {
  return record(code, constant, line, std::string("\"check failed\":\"") + condition + "\"");
}

class RequestTest : public ::testing::Test {
 protected:
  RequestTest() { host = &mock; }
  ~RequestTest() override { host = nullptr; }

  // The host writes `text` (with its NUL, when `terminate`) and sets
  // `*length` to `length`.
  void answerVariable(const char* name, uint32_t expectedSize, int32_t code, const char* text,
                      uint32_t length, bool terminate = true) {
    EXPECT_CALL(mock, readVariable(std::string(name), _, _))
        .WillOnce(Invoke([=](const std::string&, char* buffer, uint32_t* size) {
          EXPECT_EQ(*size, expectedSize);
          if (text != nullptr) std::memcpy(buffer, text, std::strlen(text) + (terminate ? 1 : 0));
          *size = length;
          return code;
        }));
  }

  StrictMock<MockHost> mock;
  StrictMock<MockInfo> info;
  quillon::Request request{&info, kId};
};

// A POST (line 72) is refused byte for byte over HTTP, where GET and PUT work,
// and a null request object answers nothing (the lifecycle test).
TEST_F(RequestTest, MethodOnlyGetOrPutWithinFiveBytes) {
  const std::string readCall =
      "ReadRequestVariable_C_REST_KO_GXWS_(_requestID, requestVariableName, *inputptrHandle, "
      "length)";
  struct Case {
    int32_t code;
    const char* text;  // written by the host
    uint32_t length;   // reported by the host
    bool terminate;
    std::string expected;
  } cases[] = {
      {0, "PUTXY", 5, false, checkFailure(-411203, "kInvalidRequestMethodType", 72, "false")},
      {0, "GET", 6, true, checkFailure(-411203, "kInvalidRequestMethodType", 63, "length <= 5")},
      {codes::k_BUFFERTOOSMALL, nullptr, 7, true, hostFailure(codes::k_BUFFERTOOSMALL, 62, readCall)},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.expected);
    answerVariable("REQUEST_METHOD", 5, c.code, c.text, c.length, c.terminate);
    EXPECT_EQ(recordOf([&] { (void)request.getRequestMethodType(); }), c.expected);
  }
}

// Present and missing headers are read over HTTP.
TEST_F(RequestTest, MediaTypesReportHostFailures) {
  const char* condition = "error == kSuccess || error == ws::runtime::errorCodes::k_VARNOTDEFINED";
  struct Read {
    const char* variable;
    int line;
    std::string (quillon::Request::*read)();
  } reads[] = {{"CONTENT_TYPE", 175, &quillon::Request::getContentType},
               {"ACCEPT", 187, &quillon::Request::getAccept}};
  for (const Read& r : reads) {
    SCOPED_TRACE(r.variable);
    answerVariable(r.variable, 128, codes::k_BUFFERTOOSMALL, nullptr, 300);
    EXPECT_EQ(recordOf([&] { (request.*r.read)(); }),
              checkFailure(codes::k_BUFFERTOOSMALL, "error", r.line, condition));
  }
}

// Bodies without a NUL, as the host passes them, and the empty body are read
// over HTTP by a sanitized host.
TEST_F(RequestTest, BodyIsReadWithinTheReportedSizeUpToItsFirstNul) {
  auto probe = [&](int32_t code, uint32_t size) {
    EXPECT_CALL(mock, readPostData(nullptr, _))
        .WillOnce(Invoke([=](char*, uint32_t* length) {
          EXPECT_EQ(*length, 0u);
          *length = size;
          return code;
        }));
  };
  auto copy = [&](std::string body, int32_t code) {
    EXPECT_CALL(mock, readPostData(::testing::NotNull(), _))
        .WillOnce(Invoke([=](char* buffer, uint32_t* length) {
          EXPECT_EQ(*length, body.size());
          std::memcpy(buffer, body.data(), body.size());
          return code;
        }));
  };
  probe(codes::k_POSTDATAAVAILABLE, 9);
  copy(std::string("{\"a\":1}\0x", 9), 0);
  EXPECT_EQ(request.readPostData(), "{\"a\":1}");

  probe(codes::k_UNKNOWNREQUEST, 0);
  EXPECT_EQ(recordOf([&] { request.readPostData(); }),
            checkFailure(-411200, "kInternalSoftwareError", 82, "expectedWarning >= 0"));
  probe(codes::k_POSTDATAAVAILABLE, 2);
  copy("ab", codes::k_BUFFERTOOSMALL);
  EXPECT_EQ(recordOf([&] { request.readPostData(); }),
            hostFailure(codes::k_BUFFERTOOSMALL, 86,
                        "ReadPostData_C_REST_KO_GXWS_(_requestID, *inputptrHandle, length)"));
}

// What succeeds is seen by every client over HTTP; a failed flush is not.
TEST_F(RequestTest, WritersPassThroughAndReportHostFailures) {
  const std::string output("{\"x\":\"\0\"}", 9);
  {
    ::testing::InSequence order;
    EXPECT_CALL(mock, writeOutput(output)).WillOnce(Return(0));
    EXPECT_CALL(mock, flush()).WillOnce(Return(codes::k_UNKNOWNREQUEST));  // ignored
  }
  request.writeOutput(output);

  EXPECT_CALL(mock, setCode(200)).WillOnce(Return(codes::k_UNKNOWNREQUEST));
  EXPECT_EQ(recordOf([&] { request.setHTTPResponseCode(200); }),
            hostFailure(codes::k_UNKNOWNREQUEST, 93,
                        "SetHTTPResponseCode_KO_GXWS_(_requestID, code)"));
  EXPECT_CALL(mock, writeOutput("x")).WillOnce(Return(codes::k_OUTOFMEMORY));
  EXPECT_EQ(recordOf([&] { request.writeOutput("x"); }),
            hostFailure(codes::k_OUTOFMEMORY, 98,
                        "WriteOutput_C_REST_KO_GXWS_(_requestID, output.c_str(), "
                        "static_cast<uint32_t>(output.size()))"));
  EXPECT_CALL(mock, setMimeType("a/b")).WillOnce(Return(codes::k_INVALIDARGUMENT));
  EXPECT_EQ(recordOf([&] { request.setHTTPResponseMimeType("a/b"); }),
            hostFailure(codes::k_INVALIDARGUMENT, 192,
                        "SetHTTPResponseMimeType_C_REST_KO_GXWS_(_requestID, "
                        "responseContentType.c_str())"));
}

TEST_F(RequestTest, CommandAndVariablesKeepTheLowByteOfEachCharacter) {
  const std::u32string command = U"r\u00e9s\u20ac";
  EXPECT_CALL(info, command()).WillOnce(::testing::ReturnRef(command));
  EXPECT_EQ(request.getCommand(), "r\xE9s\xAC");

  EXPECT_CALL(info, lookupVariable(std::u32string(U"n\u00e9"), _))
      .WillOnce(Invoke([](const std::u32string&, std::u32string& value) {
        EXPECT_TRUE(value.empty());
        value = U"\U0001F600x";
        return true;
      }));
  // U+1F600 keeps its low byte 0x00.
  EXPECT_EQ(request.getUriVariable("n\xE9"), std::string("\0x", 2));
  // A variable the request lacks reads as "", not as the one read before.
  EXPECT_CALL(info, lookupVariable(std::u32string(U"resourceType"), _)).WillOnce(Return(false));
  EXPECT_EQ(request.getUriVariable("resourceType"), "");
  EXPECT_CALL(info, lookupVariable(std::u32string(U"name"), _))
      .WillOnce(Invoke([](const std::u32string&, std::u32string& value) {
        value = U"gm";
        return true;
      }));
  EXPECT_EQ(request.getUriVariable("name"), "gm");
  EXPECT_CALL(info, lookupVariable(std::u32string(U"plugin"), _)).WillOnce(Return(false));
  EXPECT_EQ(request.getUriVariable("plugin"), "");
}

}  // namespace

// The host's C interface, scripted by the current test's MockHost.
extern "C" {
int32_t ReadRequestVariable_C_REST_KO_GXWS_(uint32_t id, const char* name, char* buffer,
                                            uint32_t* length) {
  EXPECT_EQ(id, kId);
  return host->readVariable(name, buffer, length);
}
int32_t ReadPostData_C_REST_KO_GXWS_(uint32_t id, char* buffer, uint32_t* length) {
  EXPECT_EQ(id, kId);
  return host->readPostData(buffer, length);
}
int32_t WriteOutput_C_REST_KO_GXWS_(uint32_t id, const char* data, uint32_t size) {
  EXPECT_EQ(id, kId);
  return host->writeOutput(std::string(data, size));
}
int32_t FlushOutput_KO_GXWS_(uint32_t id) {
  EXPECT_EQ(id, kId);
  return host->flush();
}
int32_t SetHTTPResponseCode_KO_GXWS_(uint32_t id, int32_t code) {
  EXPECT_EQ(id, kId);
  return host->setCode(code);
}
int32_t SetHTTPResponseMimeType_C_REST_KO_GXWS_(uint32_t id, const char* mimeType) {
  EXPECT_EQ(id, kId);
  return host->setMimeType(mimeType);
}
}
