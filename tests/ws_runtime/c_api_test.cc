// The C request interface as a plug-in sees it, driven through in-process
// exchanges.
#include <atomic>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "ws_runtime/exchange.h"
#include "ws_runtime/ws_runtime.h"

namespace codes = ws::runtime::errorCodes;
using ws::runtime::Exchange;

namespace {

TEST(RequestVariables, ReadsMethodAndHeadersWithinTheBufferSize) {
  // Reads that fit, and resets between requests, are pinned over HTTP.
  Exchange exchange;
  exchange.request().method = "DELETE";
  struct Case {
    const char* name;
    uint32_t bufferSize;
    int32_t code;
    const char* text;      // the buffer afterwards
    uint32_t lengthAfter;
  } cases[] = {
      {"REQUEST_METHOD", 7, 0, "DELETE", 7},
      {"REQUEST_METHOD", 6, codes::k_BUFFERTOOSMALL, "xxxxx", 7},  // untouched
      {"CONTENT_TYPE", 128, codes::k_VARNOTDEFINED, "", 128},
      {"HTTP_HOST", 0, codes::k_VARNOTDEFINED, "xxxxx", 0},  // unknown, no room: untouched
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string(c.name) + " in " + std::to_string(c.bufferSize) + " bytes");
    char buffer[128] = "xxxxx";
    uint32_t length = c.bufferSize;
    EXPECT_EQ(ReadRequestVariable_C_REST_KO_GXWS_(exchange.id(), c.name, buffer, &length), c.code);
    EXPECT_STREQ(buffer, c.text);
    EXPECT_EQ(length, c.lengthAfter);
  }
}

TEST(RequestBody, ProbesThenCopiesExactlyTheBodyWithoutTerminator) {
  Exchange exchange;
  exchange.request().body = std::string("a\0b", 3);
  uint32_t length = 0;
  EXPECT_EQ(ReadPostData_C_REST_KO_GXWS_(exchange.id(), nullptr, &length),
            codes::k_POSTDATAAVAILABLE);
  EXPECT_EQ(length, 3u);

  char buffer[4] = {'x', 'x', 'x', 'x'};
  uint32_t small = 2;
  EXPECT_EQ(ReadPostData_C_REST_KO_GXWS_(exchange.id(), buffer, &small), codes::k_BUFFERTOOSMALL);
  EXPECT_EQ(small, 3u);
  EXPECT_EQ(buffer[0], 'x');

  EXPECT_EQ(ReadPostData_C_REST_KO_GXWS_(exchange.id(), buffer, &length), 0);
  EXPECT_EQ(std::string(buffer, 4), std::string("a\0bx", 4));

  exchange.reset();
  length = 99;
  EXPECT_EQ(ReadPostData_C_REST_KO_GXWS_(exchange.id(), nullptr, &length), 0);
  EXPECT_EQ(length, 0u);
}

TEST(Response, ConcatenatesWritesAndKeepsTheLastCodeAndMimeType) {
  Exchange exchange;
  const uint32_t id = exchange.id();
  EXPECT_EQ(WriteOutput_C_REST_KO_GXWS_(id, "{\"a\":", 5), 0);
  EXPECT_EQ(WriteOutput_C_REST_KO_GXWS_(id, nullptr, 0), 0);
  EXPECT_EQ(WriteOutput_C_REST_KO_GXWS_(id, "1}", 2), 0);
  EXPECT_EQ(FlushOutput_KO_GXWS_(id), 0);
  EXPECT_EQ(SetHTTPResponseCode_KO_GXWS_(id, 404), 0);
  EXPECT_EQ(SetHTTPResponseCode_KO_GXWS_(id, -52006), 0);
  EXPECT_EQ(SetHTTPResponseMimeType_C_REST_KO_GXWS_(id, "text/plain"), 0);
  EXPECT_EQ(SetHTTPResponseMimeType_C_REST_KO_GXWS_(id, "application/json"), 0);
  // Bad arguments are refused without touching the response.
  EXPECT_EQ(WriteOutput_C_REST_KO_GXWS_(id, nullptr, 3), codes::k_INVALIDARGUMENT);
  EXPECT_EQ(SetHTTPResponseMimeType_C_REST_KO_GXWS_(id, nullptr), codes::k_INVALIDARGUMENT);
  EXPECT_EQ(ReadRequestVariable_C_REST_KO_GXWS_(id, "ACCEPT", nullptr, nullptr),
            codes::k_INVALIDARGUMENT);
  EXPECT_EQ(exchange.response().body, "{\"a\":1}");
  EXPECT_EQ(exchange.response().code, -52006);
  EXPECT_EQ(exchange.response().mimeType, "application/json");
  EXPECT_EQ(exchange.response().flushes, 1u);
}

TEST(Identifiers, StaleAndUnknownIdentifiersAreRefusedEverywhere) {
  uint32_t stale;
  {
    Exchange exchange;
    stale = exchange.id();
    exchange.reset();
    EXPECT_NE(exchange.id(), stale);
    EXPECT_EQ(SetHTTPResponseCode_KO_GXWS_(stale, 500), codes::k_UNKNOWNREQUEST);
    EXPECT_EQ(exchange.response().code, 200);
    stale = exchange.id();
  }
  // The slot is free again; a new exchange that takes it gets a new id.
  Exchange next;
  EXPECT_NE(next.id(), stale);
  char buffer[8];
  uint32_t length = sizeof buffer;
  for (uint32_t id : {stale, 0u, 0xFFFFFFFFu}) {
    SCOPED_TRACE(id);
    EXPECT_EQ(ReadRequestVariable_C_REST_KO_GXWS_(id, "ACCEPT", buffer, &length),
              codes::k_UNKNOWNREQUEST);
    EXPECT_EQ(ReadPostData_C_REST_KO_GXWS_(id, nullptr, &length), codes::k_UNKNOWNREQUEST);
    EXPECT_EQ(WriteOutput_C_REST_KO_GXWS_(id, "x", 1), codes::k_UNKNOWNREQUEST);
    EXPECT_EQ(FlushOutput_KO_GXWS_(id), codes::k_UNKNOWNREQUEST);
    EXPECT_EQ(SetHTTPResponseCode_KO_GXWS_(id, 200), codes::k_UNKNOWNREQUEST);
    EXPECT_EQ(SetHTTPResponseMimeType_C_REST_KO_GXWS_(id, "a/b"), codes::k_UNKNOWNREQUEST);
  }
}

TEST(Identifiers, TableRefusesMoreThanItsCapacityAndRecovers) {
  std::vector<std::unique_ptr<Exchange>> all;
  for (uint32_t i = 0; i < Exchange::kMaxInFlight; ++i) all.push_back(std::make_unique<Exchange>());
  EXPECT_THROW(Exchange(), std::runtime_error);
  all.pop_back();
  Exchange again;
  EXPECT_EQ(SetHTTPResponseCode_KO_GXWS_(again.id(), 201), 0);
}

TEST(Identifiers, ConcurrentRequestsNeverSeeEachOthersAnswers) {
  constexpr int kThreads = 4;
  constexpr int kRequests = 2000;
  std::atomic<int> crossTalk{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([t, &crossTalk] {
      const std::string mine = "thread" + std::to_string(t);
      for (int i = 0; i < kRequests; ++i) {
        Exchange exchange;
        WriteOutput_C_REST_KO_GXWS_(exchange.id(), mine.data(), static_cast<uint32_t>(mine.size()));
        SetHTTPResponseCode_KO_GXWS_(exchange.id(), 200 + t);
        if (exchange.response().body != mine || exchange.response().code != 200 + t) ++crossTalk;
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(crossTalk.load(), 0);
}

}  // namespace
