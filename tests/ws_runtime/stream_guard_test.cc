#include "stream_guard.h"

#include <cerrno>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace {

using ws::host::Refusal;
using ws::host::StreamGuard;

constexpr ws::host::HeadLimits kLimits{16384, 30720, 64};

// A socket that hands out its bytes `step` at a time, then would block.
struct Trickle {
  std::string bytes;
  size_t step;
  size_t at = 0;
  static ssize_t read(void* context, char* buffer, size_t size) {
    auto& self = *static_cast<Trickle*>(context);
    const size_t n = self.bytes.copy(buffer, std::min(size, self.step), self.at);
    self.at += n;
    errno = EAGAIN;
    return n == 0 ? -1 : static_cast<ssize_t>(n);
  }
};

// What the library reads through `guard`, `room` bytes at a time.
std::string drain(StreamGuard& guard, Trickle& socket, size_t room) {
  std::string seen;
  std::string buffer(room, '\0');
  for (size_t before = socket.at;; before = socket.at) {
    const ssize_t got = guard.read(buffer.data(), room, &Trickle::read, &socket);
    if (got > 0) {
      seen.append(buffer, 0, static_cast<size_t>(got));
    } else if (socket.at == socket.bytes.size() || socket.at == before) {
      return seen;
    }
  }
}

TEST(StreamGuard, PassesTheSameStreamHoweverItArrivesAndStopsAtARefusal) {
  const std::string chunked = "PUT /a HTTP/1.1\r\nHost: h\r\nTransfer-Encoding: chunked\r\n\r\n"
                              "005;x=\"y\"\r\nhello\r\n0\r\nTrailer: t\r\n\r\n";
  const std::string chunkedHead = chunked.substr(0, chunked.find("\r\n\r\n") + 4);
  const std::string plain = "GET /b HTTP/1.1\r\nHost: h\r\nContent-Length: 3\r\n\r\nxyz";
  // Heads whose queries the library never sees, pipelined past the most
  // the guard keeps waiting.
  const std::string longQuery(15000, 'q');
  std::string queued;
  for (int i = 0; i < 5; ++i) queued += "GET /q?" + longQuery + " HTTP/1.1\r\nHost: h\r\n\r\n";
  struct Case {
    const char* name;
    std::string in;
    std::string seen;
    uint64_t refusedHead;
    Refusal refusal;
    std::vector<const char*> queries;  // each head's, in order; null for none
  } cases[] = {
      {"pipelined, chunked, absolute form", "\r\n" + chunked + plain + "GET http://h:1?q HTTP/1.1\r\nX: 1\r\nHost: h\r\n\r\n",
       "PUT /a HTTP/1.1\r\nHost: h\r\nTransfer-Encoding: chunked\r\n\r\n5\r\nhello\r\n0\r\n\r\n" + plain +
           "GET / HTTP/1.1\r\nHost: h\r\n\r\n",
       0, Refusal::kNone, {nullptr, nullptr, "q"}},
      {"queries, empty and absolute", "GET /a?x=1&y HTTP/1.1\r\nHost: h\r\n\r\nGET /b? HTTP/1.0\r\n\r\n"
       "GET http://h/c/d?e=/f?g HTTP/1.1\r\nHost: h\r\n\r\n",
       "GET /a HTTP/1.1\r\nHost: h\r\n\r\nGET /b HTTP/1.0\r\n\r\nGET /c/d HTTP/1.1\r\nHost: h\r\n\r\n", 0,
       Refusal::kNone, {"x=1&y", "", "e=/f?g"}},
      {"too many queries waiting", queued,
       std::string("GET /q HTTP/1.1\r\nHost: h\r\n\r\n") + "GET /q HTTP/1.1\r\nHost: h\r\n\r\n" +
           "GET /q HTTP/1.1\r\nHost: h\r\n\r\n" + "GET /q HTTP/1.1\r\nHost: h\r\n\r\n" +
           "GET / HTTP/1.1\r\nHost: -\r\n\r\n",
       5, Refusal::kHeadTooLarge, {longQuery.c_str(), longQuery.c_str(), longQuery.c_str(), longQuery.c_str(), nullptr}},
      {"a refused head after a good one", plain + "GET /c HTTP/1.1\r\nHost : h\r\n\r\n" + plain,
       plain + "GET / HTTP/1.1\r\nHost: -\r\n\r\n", 2, Refusal::kMalformedField, {}},
      {"a malformed chunk", chunkedHead + "5\r\nhelloXX" + plain, chunkedHead + "5\r\nhello\r\n0\r\n\r\n", 1, Refusal::kMalformedChunk, {}},
      {"a head with no end in sight", "GET /" + std::string(17000, 'a'), "GET / HTTP/1.1\r\nHost: -\r\n\r\n", 1,
       Refusal::kHeadTooLarge, {}},
  };
  for (const Case& c : cases) {
    for (const size_t step : {1, 2, 7, 100, 65536}) {
      for (const size_t room : {1, 5, 64, 16384}) {
        SCOPED_TRACE(std::string(c.name) + " step " + std::to_string(step) + " room " + std::to_string(room));
        StreamGuard guard(kLimits);
        Trickle socket{c.in, step};
        EXPECT_EQ(drain(guard, socket, room), c.seen);
        EXPECT_EQ(guard.refusalFor(c.refusedHead), c.refusal);
        EXPECT_EQ(guard.refusalFor(c.refusedHead + 1), Refusal::kNone);
        for (size_t head = 1; head <= c.queries.size(); ++head) {
          std::string query = "unchanged";
          EXPECT_EQ(guard.takeNotes(head, query).hasQuery, c.queries[head - 1] != nullptr) << head;
          EXPECT_EQ(query, c.queries[head - 1] != nullptr ? c.queries[head - 1] : "unchanged") << head;
        }
      }
    }
  }
}

}  // namespace

TEST(StreamGuard, KeepsEachQueryForItsHeadWhileTheClientStaysAhead) {
  StreamGuard guard(kLimits);
  char buffer[256];
  std::string query;
  for (int head = 1; head <= 300; ++head) {
    SCOPED_TRACE(head);
    Trickle socket{"GET /a?n=" + std::to_string(head) + " HTTP/1.1\r\nHost: h\r\n\r\n", 4096};
    ASSERT_EQ(guard.read(buffer, sizeof buffer, &Trickle::read, &socket), 28);  // without the query
    // The library begins each request only once the next head has arrived.
    if (head > 1) {
      ASSERT_TRUE(guard.takeNotes(head - 1, query).hasQuery);
      EXPECT_EQ(query, "n=" + std::to_string(head - 1));
    }
  }
}
