// The host behind a real reverse proxy (Debian's nginx, run by the test on
// loopback with its own configuration): for each request shape that could be
// framed two ways, the requests that reach the host are exactly the ones the
// proxy forwarded, and the device changes only when the proxy forwarded a PUT.
#include <netinet/in.h>
#include <signal.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
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

using quillon::test_support::HostProcess;
using quillon::test_support::RawConnection;

constexpr const char* kNginx = "/usr/sbin/nginx";
constexpr const char* kDevice = "/quillon/syncableDevices/pendulo/timekeeper/genericTk";
const std::string kBody = "{\"maxOffsetNanos\":4343}";
const std::string kHiddenPut = "PUT " + std::string(kDevice) +
                               " HTTP/1.1\r\nHost: t\r\nContent-Type: vnd.ko.syncDomain.v0/json; "
                               "charset=utf-8\r\nContent-Length: " +
                               std::to_string(kBody.size()) + "\r\n\r\n" + kBody;

uint16_t freePort() {
  const int fd = ::socket(AF_INET, SOCK_STREAM, 0);
  sockaddr_in address{};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  socklen_t length = sizeof address;
  ::bind(fd, reinterpret_cast<sockaddr*>(&address), sizeof address);
  ::getsockname(fd, reinterpret_cast<sockaddr*>(&address), &length);
  ::close(fd);
  return ntohs(address.sin_port);
}

// nginx in the foreground, one process, everything under `dir`.
class Proxy {
 public:
  Proxy(const answers_test::ScratchDir& dir, uint16_t upstream) : port_(freePort()) {
    std::ofstream(dir.file("nginx.conf"))
        << "daemon off; master_process off; worker_processes 1;\n"
        << "pid " << dir.file("nginx.pid") << "; error_log " << dir.file("error.log") << ";\n"
        << "events { worker_connections 64; }\nhttp {\n"
        << "  log_format forwarded '$request_method $uri $upstream_status $upstream_addr';\n"
        << "  access_log " << dir.file("access.log") << " forwarded;\n"
        << "  client_body_temp_path " << dir.file("body") << "; proxy_temp_path " << dir.file("proxy")
        << ";\n  fastcgi_temp_path " << dir.file("f") << "; uwsgi_temp_path " << dir.file("u")
        << "; scgi_temp_path " << dir.file("s") << ";\n"
        << "  upstream host { server 127.0.0.1:" << upstream << "; keepalive 4; }\n"
        << "  server { listen 127.0.0.1:" << port_ << ";\n"
        << "    location / { proxy_pass http://host; proxy_http_version 1.1;\n"
        << "                 proxy_set_header Connection \"\"; } }\n}\n";
    const std::string conf = dir.file("nginx.conf");
    const std::string prefix = dir.file("");
    std::vector<std::string> args = {kNginx, "-p", prefix, "-c", conf};
    std::vector<char*> argv;
    for (std::string& arg : args) argv.push_back(arg.data());
    argv.push_back(nullptr);
    if (posix_spawn(&pid_, kNginx, nullptr, nullptr, argv.data(), environ) != 0) pid_ = -1;
    for (int i = 0; i < 300 && pid_ > 0; ++i) {
      try {
        RawConnection probe(port_);
        return;
      } catch (const std::exception&) {
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
      }
    }
  }
  ~Proxy() {
    if (pid_ <= 0) return;
    ::kill(pid_, SIGTERM);
    ::waitpid(pid_, nullptr, 0);
  }
  uint16_t port() const { return port_; }

 private:
  uint16_t port_;
  pid_t pid_ = -1;
};

// The lines of `log` from `from` on, each as "METHOD PATH STATUS".
std::vector<std::string> requests(const std::string& log, size_t from, bool proxyLog) {
  std::vector<std::string> out;
  std::istringstream lines(log.substr(from));
  for (std::string line; std::getline(lines, line);) {
    std::istringstream fields(line);
    std::string a, method, path, status;
    if (proxyLog) {
      fields >> method >> path >> status >> a;
      if (a == "-") continue;  // answered by the proxy itself
    } else {
      fields >> a >> method >> path >> status;
    }
    out.push_back(method + " " + path + " " + status);
  }
  // Requests on separate connections to the host may be logged in any order.
  std::sort(out.begin(), out.end());
  return out;
}

std::string hex(size_t value) {
  std::ostringstream out;
  out << std::hex << value;
  return out.str();
}

std::string deviceDocument(uint16_t port) {
  RawConnection connection(port);
  connection.send("GET " + std::string(kDevice) + " HTTP/1.1\r\nHost: t\r\nConnection: close\r\n\r\n");
  return connection.receive(2000);
}

TEST(BehindAProxy, TheHostServesExactlyWhatTheProxyForwarded) {
  if (::access(kNginx, X_OK) != 0) GTEST_SKIP() << "nginx is not installed (nginx-light)";
  answers_test::ScratchDir scratch;
  HostProcess host({"--access-log", scratch.file("host.log")});
  Proxy proxy(scratch, host.port());
  const std::string get = "GET /quillon/resources HTTP/1.1\r\nHost: t\r\n";
  const std::string shapes[] = {
      get + "Content-Length : " + std::to_string(kHiddenPut.size()) + "\r\n\r\n" + kHiddenPut,
      get + "Accept : text/html\r\n\r\n" + kHiddenPut,
      get + "Transfer-Encoding: gzip, chunked\r\n\r\n0\r\n\r\n" + kHiddenPut,
      get + "Transfer-Encoding: xchunked\r\n\r\n" + kHiddenPut,
      get + "Transfer-Encoding: chunked, identity\r\n\r\n" + kHiddenPut,
      get + "Content-Length: 5\r\nTransfer-Encoding: chunked\r\n\r\n0\r\n\r\n" + kHiddenPut,
      get + "Content-Length: 0\r\nContent-Length: 5\r\n\r\n" + kHiddenPut,
      get + "Content-Length: 2, 2x\r\n\r\n" + kHiddenPut,
      get + "Transfer-Encoding:\r\n chunked\r\n\r\n0\r\n\r\n" + kHiddenPut,
      get + "X: a\r\n b\r\n\r\n" + kHiddenPut,
      "GET http://t/quillon/resources HTTP/1.1\r\nHost: t\r\n\r\n",
      "GET /quillon/resources HTTP/1.1\nHost: t\n\n",
      // PUTs meant as such, the second one's body in chunks with extensions.
      get + "\r\n" + kHiddenPut,
      "PUT " + std::string(kDevice) + " HTTP/1.1\r\nHost: t\r\nContent-Type: vnd.ko.syncDomain.v0/json; "
          "charset=utf-8\r\nTransfer-Encoding: chunked\r\n\r\n3;a=b\r\n" + kBody.substr(0, 3) + "\r\n" +
          hex(kBody.size() - 3) + "\r\n" + kBody.substr(3) + "\r\n0\r\n\r\n",
  };
  std::string device = deviceDocument(host.port());
  for (const std::string& shape : shapes) {
    SCOPED_TRACE(shape);
    const size_t hostFrom = scratch.read("host.log").size();
    const size_t proxyFrom = scratch.read("access.log").size();
    {
      // The proxy logs a request once its connection is closed.
      RawConnection client(proxy.port());
      client.send(shape + get + "Connection: close\r\n\r\n");
      client.receive(3000);
    }
    // Both write their lines once an answer has left, so they may lag.
    std::vector<std::string> forwarded, served;
    for (int i = 0; i < 100; ++i) {
      forwarded = requests(scratch.read("access.log"), proxyFrom, true);
      served = requests(scratch.read("host.log"), hostFrom, false);
      if (served == forwarded && i >= 5) break;
      std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    EXPECT_EQ(served, forwarded);
    const bool putForwarded = std::any_of(forwarded.begin(), forwarded.end(),
                                          [](const std::string& r) { return r.rfind("PUT ", 0) == 0; });
    const std::string now = deviceDocument(host.port());
    if (!putForwarded) {
      EXPECT_EQ(now.substr(now.find("\r\n\r\n")), device.substr(device.find("\r\n\r\n")));
    }
    device = now;
  }
  EXPECT_NE(device.find("4343"), std::string::npos) << "the PUT meant as such was served";
  EXPECT_EQ(host.stop(), 0);
}

}  // namespace
