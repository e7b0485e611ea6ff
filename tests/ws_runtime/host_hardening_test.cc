// ws-runtime against clients and operators that do not play by the rules:
// ambiguous or oversized heads, control bytes for the log, stray signals, a
// stop in the middle of a body, and crowds of slow connections.
#include <sys/resource.h>

#include <chrono>
#include <csignal>
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
using Scratch = answers_test::ScratchDir;

constexpr int kAnswerMs = 2000;

std::vector<std::string> echoArgs(std::vector<std::string> extra = {}) {
  std::vector<std::string> args = {"--plugin", ECHO_PLUGIN_PATH, "--service", "echo"};
  args.insert(args.end(), extra.begin(), extra.end());
  return args;
}

// A GET of the echo command on a connection of its own that the server
// closes after the answer.
std::string echoGet(uint16_t port, const std::string& extraHead, const std::string& query = "") {
  RawConnection connection(port);
  connection.send("GET /echo/echo" + query + " HTTP/1.1\r\nHost: t\r\nConnection: close\r\n" +
                  extraHead + "\r\n");
  return connection.receive(kAnswerMs);
}

std::string statusLine(const std::string& answer) { return answer.substr(0, answer.find("\r\n")); }

std::string bodyOf(const std::string& answer) {
  const size_t end = answer.find("\r\n\r\n");
  return end == std::string::npos ? "" : answer.substr(end + 4);
}

std::string line(const std::string& body, const std::string& key) {
  const size_t start = body.find(key + "=");
  if (start == std::string::npos) return "<missing>";
  return body.substr(start + key.size() + 1, body.find('\n', start) - start - key.size() - 1);
}

TEST(HostHardening, RefusesAmbiguousHeadsAndTrimsAndCombinesHeaderValues) {
  HostProcess host(echoArgs({"--quiet"}));
  struct Case {
    const char* name;
    std::string head;
    const char* status;
    const char* contentType;  // the plug-in's view, or the host's refusal text
    const char* accept;
  } cases[] = {
      {"two Content-Length values", "Content-Length: 1\r\nContent-Length: 2\r\n",
       "HTTP/1.1 400 Bad Request", "Bad Request: conflicting Content-Length headers\n", nullptr},
      {"Content-Length and Transfer-Encoding",
       "Content-Length: 5\r\nTransfer-Encoding: chunked\r\n", "HTTP/1.1 400 Bad Request",
       "Bad Request: Content-Length together with Transfer-Encoding\n", nullptr},
      {"two Content-Type values", "Content-Type: a/b\r\ncontent-type: a/c\r\n",
       "HTTP/1.1 400 Bad Request", "Bad Request: conflicting Content-Type headers\n", nullptr},
      {"the same Content-Length twice", "Content-Length: 0\r\nContent-Length: 0\r\n",
       "HTTP/1.1 200 OK", "<undefined>", "<undefined>"},
      {"spaces and tabs around values", "Content-Type: \t x/y \t\r\nAccept: a/b  \r\n",
       "HTTP/1.1 200 OK", "x/y", "a/b"},
      {"repeated Accept, and one Content-Type said twice",
       "Accept: a/b\r\nContent-Type: x/y\r\nACCEPT:  c/d ;q=1 \r\nContent-Type: x/y \r\n",
       "HTTP/1.1 200 OK", "x/y", "a/b, c/d ;q=1"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    const std::string answer = echoGet(host.port(), c.head);
    EXPECT_EQ(statusLine(answer), c.status);
    if (c.accept == nullptr) {
      EXPECT_EQ(bodyOf(answer), c.contentType);
    } else {
      EXPECT_EQ(line(bodyOf(answer), "content-type"), c.contentType);
      EXPECT_EQ(line(bodyOf(answer), "accept"), c.accept);
    }
  }
  EXPECT_EQ(host.stop(), 0);
}

TEST(HostHardening, RefusesAnOversizedBodyBeforeTheClientSendsIt) {
  HostProcess host(echoArgs({"--max-body", "16", "--quiet"}));
  RawConnection tooLarge(host.port());
  tooLarge.send("PUT /echo/echo HTTP/1.1\r\nHost: t\r\nExpect: 100-continue\r\n"
                "Content-Length: 17\r\n\r\n");
  const std::string refused = tooLarge.receive(kAnswerMs);
  EXPECT_EQ(statusLine(refused), "HTTP/1.1 413 Content Too Large");
  EXPECT_EQ(bodyOf(refused), "Payload Too Large\n");

  // Within the limit the client is told to go on, and is served.
  RawConnection fits(host.port());
  fits.send("PUT /echo/echo HTTP/1.1\r\nHost: t\r\nExpect: 100-continue\r\n"
            "Content-Length: 16\r\nConnection: close\r\n\r\n");
  EXPECT_EQ(fits.receive(500), "HTTP/1.1 100 Continue\r\n\r\n");
  fits.send(std::string(16, 'y'));
  const std::string served = fits.receive(kAnswerMs);
  EXPECT_EQ(statusLine(served), "HTTP/1.1 200 OK");
  EXPECT_EQ(line(bodyOf(served), "body"), std::string(16, 'y'));
  EXPECT_EQ(host.stop(), 0);
}

TEST(HostHardening, ServesHeadsUpTo16KiBAndAnswersLargerOnes431AtOnce) {
  HostProcess host(echoArgs({"--quiet"}));
  std::string manyParameters = "?resourceType=x";
  for (int i = 0; i < 250; ++i) manyParameters += "&k" + std::to_string(i) + "=v";
  std::string manyHeaders;
  for (int i = 0; i < 150; ++i) manyHeaders += "X-H" + std::to_string(i) + ": v\r\n";
  // 8 KiB of query and 7.5 KiB of headers: just under 16 KiB in all.
  const std::string bigQuery = "?resourceType=" + std::string(8 * 1024, 'q');
  std::string bigHeaders;
  for (int i = 0; i < 15; ++i) bigHeaders += "X-B" + std::to_string(i) + ": " + std::string(500, 'h') + "\r\n";
  std::string tinyHeaders;
  for (int i = 0; i < 3000; ++i) tinyHeaders += "X" + std::to_string(i) + ":\r\n";

  struct Case {
    const char* name;
    std::string query;
    std::string head;
    const char* status;
  } cases[] = {
      {"250 query parameters", manyParameters, "", "HTTP/1.1 200 OK"},
      {"150 headers", "", manyHeaders, "HTTP/1.1 200 OK"},
      {"a head of nearly 16 KiB", bigQuery, bigHeaders, "HTTP/1.1 200 OK"},
      {"a head of over 16 KiB", bigQuery + std::string(600, 'q'), bigHeaders,
       "HTTP/1.1 431 Request Header Fields Too Large"},
      {"3000 empty headers", "", tinyHeaders, "HTTP/1.1 431 Request Header Fields Too Large"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    const std::string answer = echoGet(host.port(), c.head, c.query);
    EXPECT_EQ(statusLine(answer), c.status);
    if (std::string(c.status) == "HTTP/1.1 200 OK") {
      EXPECT_EQ(line(bodyOf(answer), "resourceType"),
                c.query.empty() ? "<undefined>" : c.query.substr(14, c.query.find('&') - 14));
    }
  }
  EXPECT_EQ(statusLine(echoGet(host.port(), "")), "HTTP/1.1 200 OK");
  EXPECT_EQ(host.stop(), 0);
}

TEST(HostHardening, LogsControlAndInvalidBytesEscaped) {
  HostProcess host(echoArgs());
  RawConnection connection(host.port());
  connection.send("GET /echo/e\x1b[2J\rX\x08\xff\xc3\xa9\\ HTTP/1.1\r\nHost: t\r\nConnection: close\r\n\r\n");
  connection.receive(kAnswerMs);
  EXPECT_EQ(host.stop(), 0);
  const std::string log = host.log();
  EXPECT_NE(log.find("127.0.0.1 GET /echo/e\\x1B[2J\\x0DX\\x08\\xFF\xc3\xa9\\x5C 400 36 "),
            std::string::npos)
      << log;
  EXPECT_EQ(log.find('\x1b'), std::string::npos);
}

TEST(HostHardening, SignalsReopenTheLogOrAreIgnoredAndNeverSkipFinalize) {
  Scratch scratch;
  const std::string accessLog = scratch.file("access.log");
  HostProcess host(echoArgs({"--access-log", accessLog}), {{"ECHO_PLUGIN_LOG", scratch.file("log")}});
  EXPECT_EQ(statusLine(echoGet(host.port(), "", "?n=1")), "HTTP/1.1 200 OK");
  // What a log rotation does: rename, then ask for a new file.
  ASSERT_EQ(std::rename(accessLog.c_str(), scratch.file("access.log.1").c_str()), 0);
  host.signal(SIGHUP);
  ASSERT_TRUE(host.waitForLog("access log reopened on SIGHUP"));
  for (const int stray : {SIGUSR1, SIGUSR2, SIGALRM, SIGPROF, SIGIO, SIGPWR, SIGRTMIN + 3}) {
    SCOPED_TRACE(stray);
    host.signal(stray);
    const std::string name = stray == SIGRTMIN + 3 ? "SIGRTMIN+3" : "SIG" + std::string(sigabbrev_np(stray));
    ASSERT_TRUE(host.waitForLog("ignoring " + name));
  }
  EXPECT_EQ(statusLine(echoGet(host.port(), "", "?n=2")), "HTTP/1.1 200 OK");
  EXPECT_EQ(host.stop(SIGQUIT), 0);
  EXPECT_NE(host.log().find("stopping on SIGQUIT"), std::string::npos);
  EXPECT_EQ(scratch.read("log"), "init\nfinalize\n");
  EXPECT_NE(scratch.read("access.log.1").find("GET /echo/echo 200"), std::string::npos);
  const std::string current = scratch.read("access.log");
  EXPECT_NE(current.find("GET /echo/echo 200"), std::string::npos) << current;
  EXPECT_EQ(current.find('\n'), current.size() - 1) << "only the request after the rotation";
}

TEST(HostHardening, RequestsWhoseHeadArrivedBeforeAStopAreServed) {
  Scratch scratch;
  HostProcess host(echoArgs({"--quiet"}), {{"ECHO_PLUGIN_LOG", scratch.file("log")}});
  RawConnection midBody(host.port());
  midBody.send("PUT /echo/echo HTTP/1.1\r\nHost: t\r\nContent-Length: 8\r\n\r\nhalf");
  // The head must have been read before the stop begins.
  RawConnection probe(host.port());
  probe.send("GET /echo/echo HTTP/1.1\r\nHost: t\r\n\r\n");
  ASSERT_EQ(statusLine(probe.receive(500)), "HTTP/1.1 200 OK");
  host.signal(SIGTERM);
  ASSERT_TRUE(host.waitForLog("stopping on SIGTERM"));
  // A head completed after the stop is refused at once.
  RawConnection late(host.port());
  late.send("GET /echo/echo HTTP/1.1\r\nHost: t\r\n\r\n");
  EXPECT_EQ(statusLine(late.receive(kAnswerMs)), "HTTP/1.1 503 Service Unavailable");
  midBody.send("rest");
  const std::string answer = midBody.receive(kAnswerMs);
  EXPECT_EQ(statusLine(answer), "HTTP/1.1 200 OK");
  EXPECT_EQ(line(bodyOf(answer), "body"), "halfrest");
  EXPECT_EQ(host.wait(), 0);
  EXPECT_EQ(scratch.read("log"), "init\nfinalize\n");
}

// Connections that send a request head a byte at a time, never finishing.
class SlowClients {
 public:
  SlowClients(uint16_t port, int count) {
    for (int i = 0; i < count; ++i) {
      connections_.push_back(std::make_unique<RawConnection>(port));
      connections_.back()->send("GET /echo/echo HTTP/1.1\r\nX");
    }
  }
  // One more byte on each; returns how many the server has closed.
  int trickle() {
    int closed = 0;
    for (auto& connection : connections_) closed += connection->send("a") ? 0 : 1;
    return closed;
  }
  int closedByServer() {
    int closed = 0;
    for (auto& connection : connections_) closed += connection->closedByServer(0) ? 1 : 0;
    return closed;
  }

 private:
  std::vector<std::unique_ptr<RawConnection>> connections_;
};

void allowDescriptors(rlim_t count) {
  rlimit limit{};
  getrlimit(RLIMIT_NOFILE, &limit);
  if (limit.rlim_cur < count && limit.rlim_max >= count) {
    limit.rlim_cur = count;
    setrlimit(RLIMIT_NOFILE, &limit);
  }
}

TEST(HostHardening, SlowClientsHoldingManyConnectionsDoNotDenyService) {
  allowDescriptors(4096);
  {
    // More than the HTTP library's own default limit of connections.
    HostProcess host(echoArgs({"--quiet"}));
    SlowClients crowd(host.port(), 1200);
    crowd.trickle();
    EXPECT_EQ(statusLine(echoGet(host.port(), "")), "HTTP/1.1 200 OK");
    EXPECT_EQ(crowd.closedByServer(), 0);
    EXPECT_EQ(host.stop(), 0);
  }
  // A crowd larger than the host allows: the longest-waiting are shut.
  HostProcess host(echoArgs({"--quiet", "--max-connections", "128"}));
  SlowClients crowd(host.port(), 400);
  crowd.trickle();
  EXPECT_EQ(statusLine(echoGet(host.port(), "")), "HTTP/1.1 200 OK");
  EXPECT_GE(crowd.closedByServer(), 400 - 128);
  EXPECT_EQ(host.stop(), 0);
}

TEST(HostHardening, ConnectionsHeldByStalledBodiesAreEvicted) {
  allowDescriptors(4096);
  HostProcess host(echoArgs({"--quiet", "--max-connections", "64"}));
  std::vector<std::unique_ptr<RawConnection>> stalled;
  for (int i = 0; i < 200; ++i) {
    stalled.push_back(std::make_unique<RawConnection>(host.port()));
    stalled.back()->send("PUT /echo/echo HTTP/1.1\r\nHost: t\r\nContent-Length: 100000\r\n\r\nx");
  }
  RawConnection client(host.port());
  client.send("GET /echo/echo HTTP/1.1\r\nHost: t\r\nConnection: close\r\n\r\n");
  EXPECT_EQ(statusLine(client.receive(1000)), "HTTP/1.1 200 OK");
  stalled.clear();
  EXPECT_EQ(host.stop(), 0);
}

}  // namespace
