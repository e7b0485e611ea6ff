// Request shapes that a proxy in front and the host could frame differently,
// sent to a real ws-runtime serving the plug-in: each must get exactly the
// answers expected, the first with the status expected, and must leave the
// device as it was, whatever PUT was smuggled along.
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "support/host_process.h"
#include "support/http_client.h"

namespace {

using namespace std::string_literals;
using quillon::test_support::HostProcess;
using quillon::test_support::RawConnection;

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
  for (size_t at = bytes.find("HTTP/1.1 "); at != std::string::npos;
       at = bytes.find("HTTP/1.1 ", at + 1)) {
    ++count;
  }
  return count;
}

std::string deviceDocument(uint16_t port) {
  RawConnection connection(port);
  connection.send("GET " + std::string(kDevice) + " HTTP/1.1\r\nHost: t\r\nConnection: close\r\n\r\n");
  const std::string answer = connection.receive(2000);
  return answer.substr(answer.find("\r\n\r\n"));
}

TEST(Framing, EveryShapeIsReadOneWayAndAnsweredOnce) {
  HostProcess host({"--quiet"});
  const std::string before = deviceDocument(host.port());
  ASSERT_EQ(before.find("4242"), std::string::npos);
  const std::string get = "GET /quillon/resources HTTP/1.1\r\n";
  const std::string close = "Connection: close\r\n";
  struct Case {
    const char* name;
    std::string bytes;
    const char* status;
    size_t answers;
  } cases[] = {
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
  for (const Case& c : cases) {
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
  const std::string request = " /quillon/resources HTTP/1.1\r\nHost: t\r\nConnection: close\r\n\r\n";
  RawConnection getConnection(host.port());
  getConnection.send("GET" + request);
  const std::string get = getConnection.receive(2000);
  RawConnection headConnection(host.port());
  headConnection.send("HEAD" + request);
  const std::string head = headConnection.receive(2000);
  const auto fields = [](const std::string& answer) {
    std::string out = answer.substr(0, answer.find("\r\n\r\n") + 4);
    return out.erase(out.find("Date: "), out.find("\r\n", out.find("Date: ")) + 2 - out.find("Date: "));
  };
  EXPECT_EQ(fields(head), fields(get));
  EXPECT_EQ(head, head.substr(0, head.find("\r\n\r\n") + 4)) << "no body";
  EXPECT_EQ(get.substr(0, 15), "HTTP/1.1 200 OK");
  EXPECT_EQ(host.stop(), 0);
}

TEST(Framing, EveryHeadAtTheEdgeOfTheConnectionMemoryIsAnswered) {
  HostProcess host({"--quiet"});
  // A long query, then a long Accept, then as many short Accept fields: the
  // parts of a head that the library keeps, swept across its memory's edge.
  for (size_t size = 6000; size < 16600; size += 97) {
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

}  // namespace
