#include "support/http_client.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <stdexcept>
#include <strings.h>

namespace quillon::test_support {

namespace {

constexpr int kTimeoutSeconds = 30;

[[noreturn]] void fail(const std::string& what) {
  throw std::runtime_error("http client: " + what);
}

bool hasHeader(const HeaderList& headers, std::string_view name) {
  for (const auto& [key, value] : headers) {
    if (key.size() == name.size() && ::strncasecmp(key.data(), name.data(), name.size()) == 0) {
      return true;
    }
  }
  return false;
}

}  // namespace

std::optional<std::string> HttpResponse::header(std::string_view name) const {
  for (const auto& [key, value] : headers) {
    if (key.size() == name.size() && ::strncasecmp(key.data(), name.data(), name.size()) == 0) {
      return value;
    }
  }
  return std::nullopt;
}

HttpClient::HttpClient(uint16_t port, const std::string& address) {
  sockaddr_in target{};
  target.sin_family = AF_INET;
  target.sin_port = htons(port);
  if (inet_pton(AF_INET, address.c_str(), &target.sin_addr) != 1) fail("bad address " + address);
  fd_ = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
  if (fd_ < 0) fail(std::string("socket: ") + std::strerror(errno));
  timeval timeout{kTimeoutSeconds, 0};
  ::setsockopt(fd_, SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof timeout);
  ::setsockopt(fd_, SOL_SOCKET, SO_SNDTIMEO, &timeout, sizeof timeout);
  const int on = 1;
  ::setsockopt(fd_, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
  if (::connect(fd_, reinterpret_cast<sockaddr*>(&target), sizeof target) != 0) {
    const std::string reason = std::strerror(errno);
    ::close(fd_);
    fail("connect to " + address + ":" + std::to_string(port) + ": " + reason);
  }
}

HttpClient::~HttpClient() {
  if (fd_ >= 0) ::close(fd_);
}

bool HttpClient::fill() {
  char chunk[16384];
  while (true) {
    const ssize_t got = ::recv(fd_, chunk, sizeof chunk, 0);
    if (got > 0) {
      buffer_.append(chunk, static_cast<size_t>(got));
      return true;
    }
    if (got == 0) return false;
    if (errno == EINTR) continue;
    if (errno == ECONNRESET) return false;
    fail(std::string("recv: ") + std::strerror(errno));
  }
}

std::string HttpClient::readLine() {
  size_t end;
  while ((end = buffer_.find("\r\n")) == std::string::npos) {
    if (!fill()) fail("connection closed inside the answer's head");
  }
  std::string line = buffer_.substr(0, end);
  buffer_.erase(0, end + 2);
  return line;
}

std::string HttpClient::readExactly(size_t size) {
  while (buffer_.size() < size) {
    if (!fill()) fail("connection closed inside the answer's body");
  }
  std::string data = buffer_.substr(0, size);
  buffer_.erase(0, size);
  return data;
}

HttpResponse HttpClient::send(const HttpRequest& request) {
  if (closed_) fail("the server closed this connection");
  std::string text = request.method + " " + request.target + " HTTP/1.1\r\n";
  if (!hasHeader(request.headers, "Host")) text += "Host: 127.0.0.1\r\n";
  for (const auto& [name, value] : request.headers) text += name + ": " + value + "\r\n";
  if (!hasHeader(request.headers, "Content-Length") &&
      !hasHeader(request.headers, "Transfer-Encoding") &&
      (!request.body.empty() || request.method == "PUT" || request.method == "POST")) {
    text += "Content-Length: " + std::to_string(request.body.size()) + "\r\n";
  }
  text += "\r\n";
  text += request.body;
  for (size_t sent = 0; sent < text.size();) {
    const ssize_t put = ::send(fd_, text.data() + sent, text.size() - sent, MSG_NOSIGNAL);
    if (put < 0 && errno == EINTR) continue;
    if (put < 0) fail(std::string("send: ") + std::strerror(errno));
    sent += static_cast<size_t>(put);
  }

  HttpResponse response;
  const std::string statusLine = readLine();
  if (statusLine.compare(0, 9, "HTTP/1.1 ") != 0 && statusLine.compare(0, 9, "HTTP/1.0 ") != 0) {
    fail("bad status line '" + statusLine + "'");
  }
  response.status = std::stoi(statusLine.substr(9, 3));
  for (std::string line = readLine(); !line.empty(); line = readLine()) {
    const auto colon = line.find(':');
    if (colon == std::string::npos) fail("bad header line '" + line + "'");
    const auto valueStart = line.find_first_not_of(" \t", colon + 1);
    response.headers.emplace_back(line.substr(0, colon),
                                  valueStart == std::string::npos ? "" : line.substr(valueStart));
  }

  const auto connection = response.header("Connection");
  const bool closeAfter =
      connection && ::strcasecmp(connection->c_str(), "close") == 0;
  const bool noBody = request.method == "HEAD" || response.status == 204 ||
                      response.status == 304 || response.status / 100 == 1;
  const auto encoding = response.header("Transfer-Encoding");
  const auto length = response.header("Content-Length");
  if (noBody) {
  } else if (encoding && ::strcasecmp(encoding->c_str(), "chunked") == 0) {
    while (true) {
      const size_t size = std::stoul(readLine(), nullptr, 16);
      if (size == 0) {
        while (!readLine().empty()) {
        }
        break;
      }
      response.body += readExactly(size);
      readLine();
    }
  } else if (length) {
    response.body = readExactly(std::stoul(*length));
  } else {
    while (fill()) {
    }
    response.body.swap(buffer_);
    closed_ = true;
  }
  if (closeAfter) closed_ = true;
  return response;
}

HttpResponse httpRequest(uint16_t port, const std::string& method, const std::string& target,
                         const HeaderList& headers, const std::string& body) {
  HttpClient client(port);
  return client.send(HttpRequest{method, target, headers, body});
}

}  // namespace quillon::test_support
