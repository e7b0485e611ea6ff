// The attacks a hostile client or a careless operator makes, replayed against
// a real ws-runtime serving the plug-in over the platform stand-ins; after
// each, a normal client must still be answered, within a second.
#include <sys/resource.h>

#include <chrono>
#include <csignal>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/host_process.h"
#include "support/http_client.h"
#include "support/scratch.h"

namespace {

using quillon::test_support::HostProcess;
using quillon::test_support::RawConnection;

constexpr const char* kMediaType = "vnd.ko.syncDomain.v0/json; charset=utf-8";
constexpr const char* kDevice = "/quillon/syncableDevices/pendulo/timekeeper/genericTk";

std::string statusLine(const std::string& answer) { return answer.substr(0, answer.find("\r\n")); }

// One request on a connection of its own, closed by the server after the
// answer; "" when no answer came within `timeoutMs`.
std::string askOnce(uint16_t port, const std::string& head, const std::string& body = "",
                     int timeoutMs = 1000) {
  RawConnection connection(port);
  connection.send(head + "Host: t\r\nConnection: close\r\n\r\n" + body);
  return connection.receive(timeoutMs);
}

std::string get(const std::string& target, const std::string& headers = "") {
  return "GET " + target + " HTTP/1.1\r\n" + headers;
}

class Robustness : public testing::Test {
 protected:
  static void SetUpTestSuite() {
    rlimit limit{};
    getrlimit(RLIMIT_NOFILE, &limit);
    if (limit.rlim_cur < 4096 && limit.rlim_max >= 4096) {
      limit.rlim_cur = 4096;
      setrlimit(RLIMIT_NOFILE, &limit);
    }
  }

  void expectNormalClientServed(const std::string& after) {
    SCOPED_TRACE("a normal client after " + after);
    const std::string answer = askOnce(host_->port(), get("/quillon/resources"));
    EXPECT_EQ(statusLine(answer), "HTTP/1.1 200 OK");
    EXPECT_NE(answer.find("{\"error\":{\"success\":true"), std::string::npos);
  }

  answers_test::ScratchDir scratch_;
  std::unique_ptr<HostProcess> host_ = std::make_unique<HostProcess>(
      std::vector<std::string>{"--threads", "2", "--max-body", "4096", "--access-log",
                               scratch_.file("access.log")});
};

TEST_F(Robustness, EveryAttackLeavesTheServiceToNormalClients) {
  const uint16_t port = host_->port();
  std::string manyParameters = "/quillon/resources?resourceType=timescales";
  for (int i = 0; i < 250; ++i) manyParameters += "&k" + std::to_string(i) + "=v";
  std::string manyHeaders;
  for (int i = 0; i < 150; ++i) manyHeaders += "X-H" + std::to_string(i) + ": v\r\n";

  struct Attack {
    const char* name;
    std::function<void()> run;
  } attacks[] = {
      {"2,000 connections sending their heads a byte at a time",
       [&] {
         std::vector<std::unique_ptr<RawConnection>> crowd;
         for (int i = 0; i < 2000; ++i) {
           crowd.push_back(std::make_unique<RawConnection>(port));
           crowd.back()->send("GET /quillon/resources HTTP/1.1\r\nX");
         }
         for (auto& connection : crowd) connection->send("a");
         expectNormalClientServed("the crowd arrived, while it holds on");
       }},
      {"250 query parameters",
       [&] { EXPECT_EQ(statusLine(askOnce(port, get(manyParameters))), "HTTP/1.1 200 OK"); }},
      {"150 headers",
       [&] { EXPECT_EQ(statusLine(askOnce(port, get("/quillon/resources", manyHeaders))), "HTTP/1.1 200 OK"); }},
      {"a head of 17 KiB",
       [&] {
         EXPECT_EQ(statusLine(askOnce(port, get("/quillon/resources?x=" + std::string(17 * 1024, 'x')))),
                   "HTTP/1.1 431 Request Header Fields Too Large");
       }},
      {"control bytes in the URL",
       [&] {
         askOnce(port, get("/quillon/resources\r127.0.0.1 GET /forged 200 0 1us\x1b[2J\x08"));
         const std::string log = scratch_.read("access.log");
         EXPECT_EQ(log.find('\r'), std::string::npos) << log;
         EXPECT_NE(log.find(" GET /quillon/resources\\x0D127.0.0.1 GET /forged 200 0 1us\\x1B[2J\\x08 400 "),
                   std::string::npos) << log;
       }},
      {"Expect: 100-continue with too large a body",
       [&] {
         const std::string answer = askOnce(
             port, "PUT " + std::string(kDevice) + " HTTP/1.1\r\nExpect: 100-continue\r\nContent-Length: 5000\r\n");
         EXPECT_EQ(statusLine(answer), "HTTP/1.1 413 Content Too Large");
       }},
      {"two different Content-Length headers",
       [&] {
         const std::string answer = askOnce(
             port, "PUT " + std::string(kDevice) + " HTTP/1.1\r\nContent-Length: 2\r\nContent-Length: 24\r\n",
             "{\"maxOffsetNanos\":1000}");
         EXPECT_EQ(statusLine(answer), "HTTP/1.1 400 Bad Request");
       }},
      {"header values with spaces around them, Accept on two lines",
       [&] {
         const std::string answer = askOnce(
             port,
             "PUT " + std::string(kDevice) + " HTTP/1.1\r\nContent-Type: " + kMediaType +
                 "  \r\nAccept: text/html\r\nAccept: \t*/*\r\nContent-Length: 23\r\n",
             "{\"maxOffsetNanos\":1000}");
         EXPECT_EQ(statusLine(answer), "HTTP/1.1 200 OK");
         EXPECT_NE(answer.find("{\"error\":{\"success\":true"), std::string::npos) << answer;
       }},
      {"SIGHUP, SIGUSR1 and SIGUSR2",
       [&] {
         host_->signal(SIGHUP);
         host_->signal(SIGUSR1);
         host_->signal(SIGUSR2);
         EXPECT_TRUE(host_->waitForLog("ignoring SIGUSR2"));
       }},
  };
  for (const Attack& attack : attacks) {
    SCOPED_TRACE(attack.name);
    const auto started = std::chrono::steady_clock::now();
    attack.run();
    expectNormalClientServed(attack.name);
    std::printf("%-60s %5lld ms\n", attack.name,
                static_cast<long long>(std::chrono::duration_cast<std::chrono::milliseconds>(
                                           std::chrono::steady_clock::now() - started)
                                           .count()));
  }

  // Last, a stop while a PUT is half-way through its body: it is served.
  RawConnection midBody(port);
  midBody.send("PUT " + std::string(kDevice) + " HTTP/1.1\r\nHost: t\r\nContent-Length: 23\r\n\r\n{\"maxOffset");
  EXPECT_EQ(statusLine(askOnce(port, get("/quillon/resources"))), "HTTP/1.1 200 OK");
  host_->signal(SIGTERM);
  ASSERT_TRUE(host_->waitForLog("stopping on SIGTERM"));
  midBody.send("Nanos\":1000}");
  const std::string answer = midBody.receive(2000);
  EXPECT_EQ(statusLine(answer), "HTTP/1.1 200 OK");
  EXPECT_NE(answer.find("{\"error\":{\"success\":true"), std::string::npos) << answer;
  EXPECT_EQ(host_->wait(), 0);
}

}  // namespace
