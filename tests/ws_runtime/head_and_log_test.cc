// The host's pieces that judge a request head, split its query, escape the
// access log and choose connections to evict.
#include <sys/socket.h>
#include <unistd.h>

#include <atomic>
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

#include "access_log.h"
#include "connection_table.h"
#include "request_head.h"
#include "url_mapping.h"

namespace {

using ws::host::HeadVerdict;
using ws::host::RequestHead;

TEST(RequestHead, JudgesTrimsAndCombines) {
  struct Case {
    std::vector<std::pair<std::string, std::string>> headers;
    HeadVerdict verdict;
    const char* contentType;  // null: not sent
    const char* accept;
    bool expects;
    long long length;  // -1: none usable
  } cases[] = {
      {{}, HeadVerdict::kAccepted, nullptr, nullptr, false, -1},
      {{{"content-TYPE", " \ta/b\t "}, {"ACCEPT", "x "}}, HeadVerdict::kAccepted, "a/b", "x", false, -1},
      {{{"Accept", "a"}, {"Accept", ""}, {"accept", " c "}}, HeadVerdict::kAccepted, nullptr, "a, , c", false, -1},
      {{{"Content-Type", "a"}, {"Content-Type", "a "}}, HeadVerdict::kAccepted, "a", nullptr, false, -1},
      {{{"Content-Type", "a"}, {"Content-Type", "A"}}, HeadVerdict::kConflictingContentType, "A", nullptr, false, -1},
      {{{"Content-Length", "12"}, {"Content-Length", " 12"}}, HeadVerdict::kAccepted, nullptr, nullptr, false, 12},
      {{{"Accept", "a/b"}, {"Accept", "c"}, {"Accept", " a/b "}, {"Accept", "c"}}, HeadVerdict::kAccepted, nullptr, "a/b, c", false, -1},
      {{{"Expect", "100-Continue"}, {"Content-Length", "99999999999999999999"}}, HeadVerdict::kAccepted, nullptr, nullptr, true, -1},
      {{{"Expect", "something"}, {"Content-Length", "1x"}, {"", "x"}}, HeadVerdict::kAccepted, nullptr, nullptr, false, -1},
  };
  RequestHead head;
  for (const Case& c : cases) {
    SCOPED_TRACE(testing::PrintToString(c.headers));
    head.clear();
    for (const auto& [name, value] : c.headers) head.add(name, value);
    EXPECT_EQ(head.verdict(), c.verdict);
    EXPECT_EQ(head.contentType() ? std::string(*head.contentType()) : "<none>",
              c.contentType ? c.contentType : "<none>");
    EXPECT_EQ(head.accept() ? std::string(*head.accept()) : "<none>", c.accept ? c.accept : "<none>");
    EXPECT_EQ(head.expectsContinue(), c.expects);
    uint64_t length = 0;
    EXPECT_EQ(head.declaredLength(length) ? static_cast<long long>(length) : -1, c.length);
  }
}

TEST(SplitQuery, SplitsAsTheDaemonDid) {
  struct Case {
    std::string query;
    std::vector<std::pair<std::string, std::string>> parameters;
  } cases[] = {
      {"", {}},
      {"a", {{"a", ""}}},
      {"a&", {{"a", ""}}},
      {"&", {{"", ""}}},
      {"a&&b=", {{"a", ""}, {"", ""}, {"b", ""}}},
      {"a+b=c+%2B=d&=v", {{"a b", "c %2B=d"}, {"", "v"}}},
  };
  std::vector<ws::host::RawParameter> out;
  for (Case& c : cases) {
    SCOPED_TRACE(c.query);
    ws::host::splitQuery(c.query, out);
    std::vector<std::pair<std::string, std::string>> got;
    for (const auto& p : out) got.emplace_back(std::string(p.key), std::string(p.value));
    EXPECT_EQ(got, c.parameters);
  }
}

TEST(AccessLog, EscapesWhatCouldForgeALineOrDriveATerminal) {
  struct Case {
    std::string in;
    std::string out;
  } cases[] = {
      {"/plain/path?x=1", "/plain/path?x=1"},
      {"a\r\nb\x1b[2J\x7f\x08\t", "a\\x0D\\x0Ab\\x1B[2J\\x7F\\x08\\x09"},
      {"back\\slash", "back\\x5Cslash"},
      {"\xc3\xa9\xe2\x82\xac\xf0\x9f\x98\x80", "\xc3\xa9\xe2\x82\xac\xf0\x9f\x98\x80"},
      {"\xc0\xaf\xed\xa0\x80\xf4\x90\x80\x80\xc3", "\\xC0\\xAF\\xED\\xA0\\x80\\xF4\\x90\\x80\\x80\\xC3"},
      {std::string("nul\0end", 7), "nul\\x00end"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.in);
    EXPECT_EQ(ws::host::escapeForLog(c.in, 1024), c.out);
  }
  EXPECT_EQ(ws::host::escapeForLog("abcdef", 3), "abc");
}

TEST(ConnectionTable, EvictsTheLongestWaitingSlowOnesAndNeverABusyOne) {
  constexpr int kCount = 6;
  int pairs[kCount][2];
  ws::host::ConnectionTable::Entry entries[kCount];
  ws::host::ConnectionTable table(4, 2, ws::host::Pace{1024, 0, 60000});
  std::atomic<uint64_t> received{0};
  for (int i = 0; i < kCount; ++i) ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM, 0, pairs[i]), 0);
  const auto shut = [&](int i) {
    char byte;
    return recv(pairs[i][1], &byte, 1, MSG_DONTWAIT) == 0;
  };
  for (int i = 0; i < 4; ++i) {
    EXPECT_EQ(table.add(entries[i], pairs[i][0], i == 2 ? &received : nullptr), 0u);
    usleep(20000);  // distinct waiting times on the coarse clock
  }
  entries[0].busy();
  entries[3].busy();
  entries[2].reading();
  received += 1000000;  // a body arriving fast
  // The fifth arrival finds 4 open: down to 2 if it can, taking the oldest
  // slow one (1), never the fast 2 nor the busy 0 and 3.
  EXPECT_EQ(table.add(entries[4], pairs[4][0]), 1u);
  EXPECT_EQ(std::vector<bool>({shut(0), shut(1), shut(2), shut(3), shut(4)}),
            std::vector<bool>({false, true, false, false, false}));
  table.remove(entries[1]);
  table.remove(entries[3]);
  EXPECT_EQ(table.size(), 3u);
  // Below the mark nothing is evicted.
  EXPECT_EQ(table.add(entries[5], pairs[5][0]), 0u);
  EXPECT_EQ(table.size(), 4u);
  // Not a byte for the idle time, whatever the phase: shut.
  ws::host::ConnectionTable idle(100, 50, ws::host::Pace{1024, 0, 30});
  ws::host::ConnectionTable::Entry still, moving;
  idle.add(still, pairs[0][0]);
  idle.add(moving, pairs[3][0], &received);
  usleep(40000);
  received += 1;
  EXPECT_EQ(idle.check(), 1u);
  EXPECT_EQ(std::vector<bool>({shut(0), shut(3)}), std::vector<bool>({true, false}));
  for (auto& pair : pairs) {
    close(pair[0]);
    close(pair[1]);
  }
}

}  // namespace
