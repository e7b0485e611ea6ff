// Request shapes that a proxy in front and the host could frame differently,
// sent to a real ws-runtime serving the plug-in, directly and through a real
// nginx: directly, each must get exactly the answers expected, the first
// with the status expected, and leave the device as it was, whatever PUT was
// smuggled along; through nginx, the requests that reach the host must be
// exactly the ones nginx forwarded, and the device changes only by a PUT it
// forwarded.
#include <netinet/in.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <fstream>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "support/host_process.h"
#include "support/http_client.h"
#include "support/scratch.h"

extern char** environ;

namespace {

using namespace std::string_literals;
using quillon::test_support::HostProcess;
using quillon::test_support::RawConnection;

constexpr const char* kNginx = "/usr/sbin/nginx";

constexpr const char* kDevice = "/quillon/syncableDevices/pendulo/timekeeper/genericTk";
const std::string kMediaType = "vnd.ko.syncDomain.v0/json; charset=utf-8";
// A PUT that would change the device, to be hidden inside another request.
const std::string kBody = "{\"maxOffsetNanos\":4242}";
const std::string kHiddenPut = "PUT " + std::string(kDevice) +
                               " HTTP/1.1\r\nHost: t\r\nContent-Type: " + kMediaType +
                               "\r\nContent-Length: " + std::to_string(kBody.size()) + "\r\n\r\n" +
                               kBody;

size_t countAnswers(const std::string& bytes) {
  size_t count = 0;
  for (size_t at = bytes.find("HTTP/1.1 "); at != std::string::npos; at = bytes.find("HTTP/1.1 ", at + 1)) ++count;
  return count;
}

std::string deviceDocument(uint16_t port) {
  RawConnection connection(port);
  connection.send("GET " + std::string(kDevice) + " HTTP/1.1\r\nHost: t\r\nConnection: close\r\n\r\n");
  const std::string answer = connection.receive(2000);
  return answer.substr(answer.find("\r\n\r\n"));
}

struct Case {
  const char* name;
  std::string bytes;
  const char* status;  // of the first answer
  size_t answers;
};

// The shapes, each smuggling a PUT where a second reader could find one.
std::vector<Case> shapes() {
  const std::string get = "GET /quillon/resources HTTP/1.1\r\n";
  const std::string close = "Connection: close\r\n";
  return {
      {"space before the colon of Content-Length",
       get + "Host: t\r\nContent-Length : " + std::to_string(kHiddenPut.size()) + "\r\n\r\n" + kHiddenPut,
       "400 Bad Request", 1},
      {"space before the colon of Accept", get + "Host: t\r\nAccept : text/html\r\n\r\n" + kHiddenPut,
       "400 Bad Request", 1},
      {"a coding before chunked", get + "Host: t\r\nTransfer-Encoding: gzip, chunked\r\n\r\n0\r\n\r\n",
       "501 Not Implemented", 1},
      {"xchunked", get + "Host: t\r\nTransfer-Encoding: xchunked\r\n\r\n" + kHiddenPut, "400 Bad Request", 1},
      {"chunked, identity", get + "Host: t\r\nTransfer-Encoding: chunked, identity\r\n\r\n" + kHiddenPut,
       "400 Bad Request", 1},
      {"chunked twice", get + "Host: t\r\nTransfer-Encoding: chunked\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n",
       "400 Bad Request", 1},
      {"Transfer-Encoding in HTTP/1.0",
       "GET /quillon/resources HTTP/1.0\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n", "400 Bad Request", 1},
      {"Content-Length with Transfer-Encoding",
       get + "Host: t\r\nContent-Length: 5\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n" + kHiddenPut,
       "400 Bad Request", 1},
      {"two Content-Length values", get + "Host: t\r\nContent-Length: 0\r\nContent-Length: 5\r\n\r\n" + kHiddenPut,
       "400 Bad Request", 1},
      {"Content-Length abc", get + "Host: t\r\nContent-Length: abc\r\n\r\n", "400 Bad Request", 1},
      {"Content-Length +2", get + "Host: t\r\nContent-Length: +2\r\n\r\nab", "400 Bad Request", 1},
      {"Content-Length 0x2", get + "Host: t\r\nContent-Length: 0x2\r\n\r\nab", "400 Bad Request", 1},
      {"Content-Length -1", get + "Host: t\r\nContent-Length: -1\r\n\r\n", "400 Bad Request", 1},
      {"Content-Length 2, 2x", get + "Host: t\r\nContent-Length: 2, 2x\r\n\r\nab", "400 Bad Request", 1},
      {"NUL in a PUT's target",
       "PUT " + std::string(kDevice) + "\0/else"s + " HTTP/1.1\r\nHost: t\r\nContent-Type: " +
           kMediaType + "\r\nContent-Length: " + std::to_string(kBody.size()) + "\r\n\r\n" + kBody,
       "400 Bad Request", 1},
      {"NUL in a GET's target", "GET /quillon/resources\0x HTTP/1.1\r\nHost: t\r\n\r\n"s,
       "400 Bad Request", 1},
      {"NUL in a field value", get + "Host: t\r\nX: a\0b\r\n\r\n"s,
       "400 Bad Request", 1},
      {"bare CR in a field value", get + "Host: t\r\nX: a\rb\r\n\r\n", "400 Bad Request", 1},
      {"no Host", get + "\r\n" + kHiddenPut, "400 Bad Request", 1},
      {"two Host fields", get + "Host: t\r\nHost: u\r\n\r\n", "400 Bad Request", 1},
      {"two spaces in the request line", "GET  /quillon/resources  HTTP/1.1\r\nHost: t\r\n\r\n",
       "400 Bad Request", 1},
      {"tabs in the request line", "GET\t/quillon/resources\tHTTP/1.1\r\nHost: t\r\n\r\n", "400 Bad Request", 1},
      {"a folded field", get + "Host: t\r\nX: a\r\n b\r\n\r\n", "400 Bad Request", 1},
      {"a field without a colon", get + "Host: t\r\nX a\r\n\r\n", "400 Bad Request", 1},
      {"HTTP/2.0", "GET /quillon/resources HTTP/2.0\r\nHost: t\r\n\r\n", "505 HTTP Version Not Supported", 1},
      {"a malformed chunk size",
       "PUT " + std::string(kDevice) + " HTTP/1.1\r\nHost: t\r\nTransfer-Encoding: chunked\r\n\r\nzz\r\n" + kHiddenPut,
       "400 Bad Request", 1},
      {"chunk data without its CRLF",
       "PUT " + std::string(kDevice) + " HTTP/1.1\r\nHost: t\r\nTransfer-Encoding: chunked\r\n\r\n2\r\n{}xx\r\n0\r\n\r\n",
       "400 Bad Request", 1},
      {"absolute form", "GET http://x/quillon/resources HTTP/1.1\r\nHost: t\r\n" + close + "\r\n", "200 OK", 1},
      {"bare LF line ends", "GET /quillon/resources HTTP/1.1\nHost: t\n" + std::string("Connection: close\n\n"),
       "200 OK", 1},
      {"empty lines before the request line", "\r\n\r\n" + get + "Host: t\r\n" + close + "\r\n", "200 OK", 1},
      {"chunk extensions and a trailer",
       get + "Host: t\r\nTransfer-Encoding: chunked\r\n" + close + "\r\n2;a=b;c\r\nxy\r\n0\r\nT: v\r\n\r\n",
       "200 OK", 1},
      {"two requests pipelined", get + "Host: t\r\nContent-Length: 2\r\n\r\nxy" + get + "Host: t\r\n" + close + "\r\n",
       "200 OK", 2},
      {"the media type in two Accept fields",
       "GET " + std::string(kDevice) + " HTTP/1.1\r\nHost: t\r\nAccept: " + kMediaType + "\r\nAccept: " +
           kMediaType + "\r\n" + close + "\r\n",
       "200 OK", 1},
  };
}

TEST(Framing, EveryShapeIsReadOneWayAndAnsweredOnce) {
  HostProcess host({"--quiet"});
  const std::string before = deviceDocument(host.port());
  ASSERT_EQ(before.find("4242"), std::string::npos);

  for (const Case& c : shapes()) {
    SCOPED_TRACE(c.name);
    RawConnection connection(host.port());
    connection.send(c.bytes);
    const std::string answer = connection.receive(2000);
    EXPECT_EQ(answer.substr(0, answer.find("\r\n")), std::string("HTTP/1.1 ") + c.status);
    EXPECT_EQ(countAnswers(answer), c.answers) << answer;
    EXPECT_EQ(deviceDocument(host.port()), before);
  }
  EXPECT_EQ(host.stop(), 0);
}

TEST(Framing, HeadIsAnsweredAsGetWithoutItsBody) {
  HostProcess host({"--quiet"});
  const auto ask = [&host](const std::string& method) {
    RawConnection connection(host.port());
    connection.send(method + " /quillon/resources HTTP/1.1\r\nHost: t\r\nConnection: close\r\n\r\n");
    std::string answer = connection.receive(2000);
    const size_t date = answer.find("Date: ");
    return date == std::string::npos ? answer : answer.erase(date, answer.find("\r\n", date) + 2 - date);
  };
  const std::string get = ask("GET");
  EXPECT_EQ(ask("HEAD"), get.substr(0, get.find("\r\n\r\n") + 4));
  EXPECT_EQ(get.substr(0, 15), "HTTP/1.1 200 OK");
  EXPECT_EQ(host.stop(), 0);
}

TEST(Framing, EveryHeadAtTheEdgeOfTheConnectionMemoryIsAnswered) {
  HostProcess host({"--quiet"});
  // A long query, then a long Accept, then as many short Accept fields: the
  // parts of a head that the library keeps, swept across its memory's edge.
  for (size_t size = 4000; size < 16600; size += 97) {
    const std::string fill(size, 'a');
    std::string fields;
    for (size_t i = 0; i * 12 < size; ++i) fields += "Accept: a/" + std::to_string(i % 100) + "\r\n";
    for (const std::string& head : {"GET /quillon/resources?" + fill + " HTTP/1.1\r\nHost: t\r\n",
                                    "GET /quillon/resources HTTP/1.1\r\nHost: t\r\nAccept: " + fill + "\r\n",
                                    "GET /quillon/resources HTTP/1.1\r\nHost: t\r\n" + fields}) {
      SCOPED_TRACE(head.substr(0, 60) + " " + std::to_string(head.size()));
      RawConnection connection(host.port());
      connection.send(head + "Connection: close\r\n\r\n");
      // The plug-in answers 500 to an Accept longer than it reads; any
      // answer will do, but silence.
      const std::string status = connection.receive(2000).substr(0, 12);
      EXPECT_TRUE(status == "HTTP/1.1 200" || status == "HTTP/1.1 431" || status == "HTTP/1.1 500") << status;
    }
  }
  EXPECT_EQ(host.stop(), 0);
}


// nginx (Debian's nginx-light) in front of the host, run by the test on
// loopback with everything under `dir`.
class Proxy {
 public:
  Proxy(const answers_test::ScratchDir& dir, uint16_t upstream) {
    const int probe = ::socket(AF_INET, SOCK_STREAM, 0);
    sockaddr_in address{AF_INET, 0, {htonl(INADDR_LOOPBACK)}, {}};
    socklen_t length = sizeof address;
    ::bind(probe, reinterpret_cast<sockaddr*>(&address), sizeof address);
    ::getsockname(probe, reinterpret_cast<sockaddr*>(&address), &length);
    ::close(probe);
    port_ = ntohs(address.sin_port);
    std::ofstream(dir.file("nginx.conf"))
        << "daemon off; master_process off; pid nginx.pid; error_log error.log;\n"
        << "events {}\nhttp {\n  log_format forwarded '$request_method $uri $upstream_status $upstream_addr';\n"
        << "  access_log access.log forwarded; client_body_temp_path b; proxy_temp_path p;\n"
        << "  fastcgi_temp_path f; uwsgi_temp_path u; scgi_temp_path s;\n"
        << "  upstream host { server 127.0.0.1:" << upstream << "; keepalive 4; }\n"
        << "  server { listen 127.0.0.1:" << port_ << "; location / { proxy_pass http://host;\n"
        << "    proxy_http_version 1.1; proxy_set_header Connection \"\"; } }\n}\n";
    std::string prefix = dir.file(""), conf = dir.file("nginx.conf");
    char* argv[] = {const_cast<char*>(kNginx), const_cast<char*>("-p"), prefix.data(), const_cast<char*>("-c"),
                    conf.data(), nullptr};
    if (posix_spawn(&pid_, kNginx, nullptr, nullptr, argv, environ) != 0) pid_ = -1;
    for (int i = 0; i < 300 && pid_ > 0 && !up(); ++i) std::this_thread::sleep_for(std::chrono::milliseconds(10));
  }
  ~Proxy() {
    if (pid_ > 0 && ::kill(pid_, SIGTERM) == 0) ::waitpid(pid_, nullptr, 0);
  }
  uint16_t port() const { return port_; }

 private:
  bool up() const try {
    return RawConnection(port_), true;
  } catch (const std::exception&) {
    return false;
  }
  uint16_t port_ = 0;
  pid_t pid_ = -1;
};

// The requests in `log` from `from` on, as "METHOD PATH STATUS", sorted:
// requests on separate connections to the host may be logged in any order.
std::vector<std::string> logged(const std::string& log, size_t from, bool byProxy) {
  std::vector<std::string> out;
  std::istringstream lines(log.substr(from));
  for (std::string line; std::getline(lines, line);) {
    std::istringstream fields(line);
    std::string client, method, path, status, upstream;
    if (byProxy) fields >> method >> path >> status >> upstream;
    if (!byProxy) fields >> client >> method >> path >> status;
    if (upstream != "-") out.push_back(method + " " + path + " " + status);  // "-": the proxy answered
  }
  std::sort(out.begin(), out.end());
  return out;
}

TEST(Framing, BehindAProxyTheHostServesExactlyWhatTheProxyForwarded) {
  if (::access(kNginx, X_OK) != 0) GTEST_SKIP() << "nginx is not installed (Debian's nginx-light)";
  answers_test::ScratchDir scratch;
  HostProcess host({"--access-log", scratch.file("host.log")});
  Proxy proxy(scratch, host.port());
  std::vector<Case> cases = shapes();
  cases.push_back({"a PUT meant as such", kHiddenPut, "", 1});
  std::string device = deviceDocument(host.port());
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    const size_t hostFrom = scratch.read("host.log").size();
    const size_t proxyFrom = scratch.read("access.log").size();
    {
      // The proxy logs a request once its connection is closed.
      RawConnection client(proxy.port());
      client.send(c.bytes + "GET /quillon/resources HTTP/1.1\r\nHost: t\r\nConnection: close\r\n\r\n");
      client.receive(3000);
    }
    // Both write their lines once an answer has left, so either may lag.
    std::vector<std::string> forwarded, served;
    for (int i = 0; i < 100 && (i < 5 || served != forwarded); ++i) {
      std::this_thread::sleep_for(std::chrono::milliseconds(10));
      forwarded = logged(scratch.read("access.log"), proxyFrom, true);
      served = logged(scratch.read("host.log"), hostFrom, false);
    }
    EXPECT_EQ(served, forwarded);
    const std::string now = deviceDocument(host.port());
    if (std::none_of(forwarded.begin(), forwarded.end(), [](const std::string& r) { return r[0] == 'P'; })) {
      EXPECT_EQ(now, device);
    }
    device = now;
  }
  EXPECT_NE(device.find("4242"), std::string::npos) << "the PUT meant as such was served";
  EXPECT_EQ(host.stop(), 0);
}

}  // namespace
