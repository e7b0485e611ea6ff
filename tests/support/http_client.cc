#include "support/http_client.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <strings.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <stdexcept>

#include "support/answer_log.h"

namespace quillon::test_support {

namespace {

[[noreturn]] void fail(const std::string& what) {
  throw std::runtime_error("http client: " + what);
}

std::optional<std::string> findHeader(const HeaderList& headers, std::string_view name) {
  for (const auto& [key, value] : headers) {
    if (key.size() == name.size() && ::strncasecmp(key.data(), name.data(), name.size()) == 0) {
      return value;
    }
  }
  return std::nullopt;
}

int connectTo(uint16_t port) {
  const int fd = ::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0);
  if (fd < 0) fail(std::string("socket: ") + std::strerror(errno));
  sockaddr_in target{};
  target.sin_family = AF_INET;
  target.sin_port = htons(port);
  target.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  if (::connect(fd, reinterpret_cast<sockaddr*>(&target), sizeof target) != 0) {
    const std::string reason = std::strerror(errno);
    ::close(fd);
    fail("connect to port " + std::to_string(port) + ": " + reason);
  }
  return fd;
}

}  // namespace

std::optional<std::string> HttpResponse::header(std::string_view name) const {
  return findHeader(headers, name);
}

HttpClient::HttpClient(uint16_t port) : fd_(connectTo(port)) {
  const timeval timeout{30, 0};
  ::setsockopt(fd_, SOL_SOCKET, SO_RCVTIMEO, &timeout, sizeof timeout);
  ::setsockopt(fd_, SOL_SOCKET, SO_SNDTIMEO, &timeout, sizeof timeout);
  const int on = 1;
  ::setsockopt(fd_, IPPROTO_TCP, TCP_NODELAY, &on, sizeof on);
}

HttpClient::~HttpClient() { ::close(fd_); }

bool HttpClient::fill() {
  char chunk[16384];
  while (true) {
    const ssize_t got = ::recv(fd_, chunk, sizeof chunk, 0);
    if (got > 0) {
      buffer_.append(chunk, static_cast<size_t>(got));
      return true;
    }
    if (got == 0 || errno == ECONNRESET) return false;
    if (errno != EINTR) fail(std::string("recv: ") + std::strerror(errno));
  }
}

std::string HttpClient::take(size_t size) {
  while (buffer_.size() < size) {
    if (!fill()) fail("connection closed inside an answer");
  }
  std::string data = buffer_.substr(0, size);
  buffer_.erase(0, size);
  return data;
}

std::string HttpClient::readLine() {
  while (buffer_.find("\r\n") == std::string::npos) {
    if (!fill()) fail("connection closed inside an answer's head");
  }
  const std::string line = take(buffer_.find("\r\n") + 2);
  return line.substr(0, line.size() - 2);
}

HttpResponse HttpClient::send(const HttpRequest& request) {
  if (closed_) fail("the server closed this connection");
  std::string text = request.method + " " + request.target + " HTTP/1.1\r\n";
  if (!findHeader(request.headers, "Host")) text += "Host: 127.0.0.1\r\n";
  for (const auto& [name, value] : request.headers) text += name + ": " + value + "\r\n";
  if (!findHeader(request.headers, "Content-Length") &&
      !findHeader(request.headers, "Transfer-Encoding") &&
      (!request.body.empty() || request.method == "PUT" || request.method == "POST")) {
    text += "Content-Length: " + std::to_string(request.body.size()) + "\r\n";
  }
  text += "\r\n" + request.body;
  for (size_t sent = 0; sent < text.size();) {
    const ssize_t put = ::send(fd_, text.data() + sent, text.size() - sent, MSG_NOSIGNAL);
    if (put < 0 && errno != EINTR) fail(std::string("send: ") + std::strerror(errno));
    if (put > 0) sent += static_cast<size_t>(put);
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
  if (const auto length = response.header("Content-Length")) {
    response.body = take(std::stoul(*length));
  } else {  // the answer ends with the connection
    while (fill()) {
    }
    response.body.swap(buffer_);
    closed_ = true;
  }
  const auto connection = response.header("Connection");
  if (connection && ::strcasecmp(connection->c_str(), "close") == 0) closed_ = true;
  logAnswer(request, response);
  return response;
}

HttpResponse httpRequest(uint16_t port, const std::string& method, const std::string& target,
                         const HeaderList& headers, const std::string& body) {
  HttpClient client(port);
  return client.send(HttpRequest{method, target, headers, body});
}

RawConnection::RawConnection(uint16_t port) : fd_(connectTo(port)) {}

RawConnection::~RawConnection() { ::close(fd_); }

bool RawConnection::send(std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t sent = ::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (sent <= 0) return false;
    bytes.remove_prefix(static_cast<size_t>(sent));
  }
  return true;
}

std::string RawConnection::receive(int timeoutMs) {
  std::string out;
  char chunk[16384];
  pollfd wait{fd_, POLLIN, 0};
  while (::poll(&wait, 1, timeoutMs) == 1) {
    const ssize_t got = ::recv(fd_, chunk, sizeof chunk, 0);
    if (got <= 0) break;
    out.append(chunk, static_cast<size_t>(got));
  }
  return out;
}

bool RawConnection::closedByServer(int timeoutMs) {
  char byte;
  pollfd wait{fd_, POLLIN, 0};
  if (::poll(&wait, 1, timeoutMs) != 1) return false;
  return ::recv(fd_, &byte, 1, MSG_PEEK) <= 0;
}

}  // namespace quillon::test_support
