// A small blocking HTTP/1.1 client for end-to-end tests: one keep-alive
// connection to a loopback port, one request at a time, whole answers.
// Thread-safety: one client per thread.
#ifndef QUILLON_TESTS_SUPPORT_HTTP_CLIENT_H_
#define QUILLON_TESTS_SUPPORT_HTTP_CLIENT_H_

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace quillon::test_support {

using HeaderList = std::vector<std::pair<std::string, std::string>>;

struct HttpRequest {
  std::string method = "GET";  // any but HEAD: answers are read by their length
  std::string target = "/";    // path and query, sent as is
  HeaderList headers;          // Host and Content-Length are added unless given
  std::string body;
};

struct HttpResponse {
  int status = 0;
  HeaderList headers;
  std::string body;
  // The first header of that name (case-insensitive).
  std::optional<std::string> header(std::string_view name) const;
};

class HttpClient {
 public:
  // Connects to 127.0.0.1:`port`; every failure, and no answer within 30 s,
  // throws std::runtime_error.
  explicit HttpClient(uint16_t port);
  ~HttpClient();
  HttpClient(const HttpClient&) = delete;
  HttpClient& operator=(const HttpClient&) = delete;

  HttpResponse send(const HttpRequest& request);
  // Whether the server closed the connection after the last answer.
  bool closedByServer() const { return closed_; }

 private:
  bool fill();  // false at end of stream
  std::string take(size_t size);
  std::string readLine();

  int fd_ = -1;
  std::string buffer_;
  bool closed_ = false;
};

// A connection that sends bytes exactly as given, for heads the client above
// cannot write (repeated or malformed headers, requests sent in pieces, idle
// or trickling connections).
class RawConnection {
 public:
  // Connects to 127.0.0.1:`port`; throws std::runtime_error on failure.
  explicit RawConnection(uint16_t port);
  ~RawConnection();
  RawConnection(const RawConnection&) = delete;
  RawConnection& operator=(const RawConnection&) = delete;

  // False when the server has closed or reset the connection.
  bool send(std::string_view bytes);
  // What arrives until the server closes the connection or `timeoutMs`
  // passes, whichever is first.
  std::string receive(int timeoutMs);
  // Whether the server has closed the connection (reads its end, waiting up
  // to `timeoutMs`).
  bool closedByServer(int timeoutMs);

 private:
  int fd_;
};

// One request on a fresh connection.
HttpResponse httpRequest(uint16_t port, const std::string& method, const std::string& target,
                         const HeaderList& headers = {}, const std::string& body = "");

}  // namespace quillon::test_support

#endif  // QUILLON_TESTS_SUPPORT_HTTP_CLIENT_H_
