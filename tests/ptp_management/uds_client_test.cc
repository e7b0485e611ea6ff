// The shared client socket and its exchanges against scripted peers: what
// is taken as an answer, what is ignored, how a daemon that is away or stuck
// ends an exchange, and exchanges with several daemons at once on the one
// socket.
#include "ptp_management/shared_uds_client.h"

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

#include <cerrno>
#include <future>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "support/ptp_fake.h"
#include "support/scratch.h"

namespace ptpmgmt {
namespace {

using quillon::test_support::Bytes;
using quillon::test_support::DatagramPeer;
using quillon::test_support::errorStatusAnswer;
using quillon::test_support::managementAnswer;

constexpr std::chrono::milliseconds kWait{2000};

bool exists(const std::string& path) {
  struct stat info;
  return ::lstat(path.c_str(), &info) == 0;
}

PendingGet get(ManagementId id, uint8_t transportSpecific = 0) {
  PendingGet pending;
  pending.request.transportSpecific = transportSpecific;
  pending.request.source.port = 0x4242;
  pending.request.id = id;
  return pending;
}

// One exchange of `gets` with the socket at `server`, as the live service runs it.
ExchangeOutcome exchangeWith(SharedUdsClient& client, const std::string& server,
                             std::vector<PendingGet>& gets, Until until,
                             std::chrono::milliseconds timeout = kWait) {
  SharedUdsClient::Exchange exchange(client, server, gets);
  ExchangeOutcome outcome;
  outcome.failure = exchange.send();
  if (outcome.failure.call != nullptr) return outcome;
  return exchange.collect(until, Clock::now() + timeout);
}

struct Scene {
  answers_test::ScratchDir dir;
  DatagramPeer daemon{dir.file("daemon.sock")};
  SystemFailure failure;
  SharedUdsClient client{dir.str()};
  const bool opened = client.open(&failure);

  // Runs the exchange on another thread while the test plays the daemon.
  std::future<ExchangeOutcome> start(std::vector<PendingGet>& gets, Until until,
                                     std::chrono::milliseconds timeout = kWait,
                                     DatagramPeer* peer = nullptr) {
    const std::string server = (peer != nullptr ? peer : &daemon)->path();
    return std::async(std::launch::async, [this, &gets, until, timeout, server] {
      return exchangeWith(client, server, gets, until, timeout);
    });
  }
  // The requests the client sent, decoded.
  std::vector<std::pair<Answer, Bytes>> requests(size_t count, DatagramPeer* peer = nullptr) {
    std::vector<std::pair<Answer, Bytes>> out;
    for (size_t i = 0; i < count; ++i) {
      auto received = (peer != nullptr ? peer : &daemon)->receive(kWait);
      if (!received) break;
      EXPECT_EQ(received->from, client.path());
      out.emplace_back(Answer{}, received->bytes);
      EXPECT_EQ(decodeAnswer(out.back().second.data(), out.back().second.size(),
                             &out.back().first),
                DecodeError::kNone);
    }
    return out;
  }
};

TEST(UdsClient, AnswersAreMatchedByTheirRequestAndStraysIgnored) {
  Scene scene;
  ASSERT_TRUE(scene.opened) << scene.failure.call << ": " << scene.failure.error;
  std::vector<PendingGet> gets{get(ManagementId::kDefaultDataSet),
                               get(ManagementId::kPortDataSet)};
  auto outcome = scene.start(gets, Until::kEveryAnswer);
  auto requests = scene.requests(2);
  ASSERT_EQ(requests.size(), 2u);
  const Answer& first = requests[0].first;
  const Answer& second = requests[1].first;
  EXPECT_NE(first.sequenceId, second.sequenceId);

  Answer wrongSequence = first;
  ++wrongSequence.sequenceId;
  Answer wrongTransport = first;
  wrongTransport.transportSpecific = 1;
  Answer someoneElse = first;
  someoneElse.source.port = 0x4243;
  const Bytes strays[] = {
      managementAnswer(wrongSequence, quillon::test_support::defaultDataSet(1)),
      managementAnswer(wrongTransport, quillon::test_support::defaultDataSet(1)),
      managementAnswer(someoneElse, quillon::test_support::defaultDataSet(1)),
      // The right request, but answered under another management id.
      managementAnswer(first, quillon::test_support::defaultDataSet(1), 0, 0x2001),
      requests[0].second,  // its own GET echoed back is no RESPONSE
  };
  for (const Bytes& stray : strays) scene.daemon.sendTo(scene.client.path(), stray);
  // The right answer from another socket is not the daemon's.
  DatagramPeer impostor(scene.dir.file("impostor.sock"));
  impostor.sendTo(scene.client.path(),
                  managementAnswer(first, quillon::test_support::defaultDataSet(1)));
  // Answers in reverse order still find their requests.
  scene.daemon.sendTo(scene.client.path(), errorStatusAnswer(second, 0x0004));
  scene.daemon.sendTo(scene.client.path(),
                      managementAnswer(first, quillon::test_support::defaultDataSet(2)));

  const ExchangeOutcome result = outcome.get();
  EXPECT_EQ(result.failure.call, nullptr);
  EXPECT_FALSE(result.timedOut);
  ASSERT_TRUE(gets[0].answered);
  DefaultDataSet defaults;
  ASSERT_EQ(decodeDataSet(gets[0].answer, &defaults), DecodeError::kNone);
  EXPECT_EQ(defaults.numberPorts, 2);
  ASSERT_TRUE(gets[1].answered);
  EXPECT_TRUE(gets[1].answer.isErrorStatus);
  EXPECT_EQ(gets[1].answer.managementErrorId, 0x0004);
}

TEST(UdsClient, BrokenAnswersEndAsMalformedAndSilenceAsTimeOut) {
  Scene scene;
  std::vector<PendingGet> gets{get(ManagementId::kDefaultDataSet),
                               get(ManagementId::kParentDataSet)};
  auto outcome = scene.start(gets, Until::kEveryAnswer, std::chrono::milliseconds(300));
  auto requests = scene.requests(2);
  ASSERT_EQ(requests.size(), 2u);
  // Cut after its sequence id: it is known whose answer failed.
  Bytes cut = managementAnswer(requests[0].first, quillon::test_support::defaultDataSet(1));
  cut.resize(40);
  scene.daemon.sendTo(scene.client.path(), cut);
  // Too short to tell whose it is.
  scene.daemon.sendTo(scene.client.path(), Bytes(10, 0x0D));
  const ExchangeOutcome result = outcome.get();
  EXPECT_TRUE(result.timedOut);
  EXPECT_EQ(result.unmatchedMalformed, DecodeError::kShorterThanHeader);
  EXPECT_TRUE(gets[0].answered);
  EXPECT_EQ(gets[0].malformed, DecodeError::kShorterThanHeader);
  EXPECT_FALSE(gets[1].answered);
}

TEST(UdsClient, DaemonsAwayOrNotReadingFailTheSendAtOnce) {
  Scene scene;
  std::vector<PendingGet> one{get(ManagementId::kDefaultDataSet)};
  struct Case {
    const char* what;
    std::string server;
    int error;
  } cases[] = {
      {"no socket file", scene.dir.file("none.sock"), ENOENT},
      {"a file nobody has bound", scene.dir.write("stale.sock", ""), ECONNREFUSED},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    const ExchangeOutcome result = exchangeWith(scene.client, c.server, one, Until::kEveryAnswer);
    ASSERT_NE(result.failure.call, nullptr);
    EXPECT_STREQ(result.failure.call, "sendto");
    EXPECT_EQ(result.failure.error, c.error);
  }
  // A daemon that stopped reading fills its queue; the client never blocks.
  std::vector<PendingGet> many(64, get(ManagementId::kDefaultDataSet));
  const ExchangeOutcome full =
      exchangeWith(scene.client, scene.daemon.path(), many, Until::kEveryAnswer);
  EXPECT_STREQ(full.failure.call, "sendto");
  EXPECT_EQ(full.failure.error, EAGAIN);
}

// Two daemons, and two exchanges with one of them, in flight at once: each
// answer reaches the exchange that asked, by sender and sequence id.
TEST(UdsClient, ConcurrentExchangesShareTheSocket) {
  Scene scene;
  DatagramPeer other(scene.dir.file("other.sock"));
  std::vector<PendingGet> first{get(ManagementId::kDefaultDataSet)};
  std::vector<PendingGet> second{get(ManagementId::kDefaultDataSet)};
  std::vector<PendingGet> third{get(ManagementId::kDefaultDataSet)};
  auto one = scene.start(first, Until::kEveryAnswer);
  auto two = scene.start(second, Until::kEveryAnswer);
  auto three = scene.start(third, Until::kEveryAnswer, kWait, &other);
  auto toDaemon = scene.requests(2);
  auto toOther = scene.requests(1, &other);
  ASSERT_EQ(toDaemon.size(), 2u);
  ASSERT_EQ(toOther.size(), 1u);
  // Answered with the number of ports telling who answered what, in reverse.
  other.sendTo(scene.client.path(),
               managementAnswer(toOther[0].first, quillon::test_support::defaultDataSet(3)));
  for (int i = 1; i >= 0; --i) {
    scene.daemon.sendTo(scene.client.path(),
                        managementAnswer(toDaemon[i].first,
                                         quillon::test_support::defaultDataSet(10 + i)));
  }
  std::map<uint16_t, uint16_t> portsBySequence{{toDaemon[0].first.sequenceId, 10},
                                               {toDaemon[1].first.sequenceId, 11}};
  EXPECT_FALSE(one.get().timedOut);
  EXPECT_FALSE(two.get().timedOut);
  EXPECT_FALSE(three.get().timedOut);
  const auto ports = [](const std::vector<PendingGet>& gets) {
    DefaultDataSet defaults;
    return gets[0].answered && decodeDataSet(gets[0].answer, &defaults) == DecodeError::kNone
               ? defaults.numberPorts
               : 0;
  };
  EXPECT_EQ(ports(first), portsBySequence[first[0].request.sequenceId]);
  EXPECT_EQ(ports(second), portsBySequence[second[0].request.sequenceId]);
  EXPECT_EQ(ports(third), 3);
}

TEST(UdsClient, PathsAreTheClientsOwnAndNeverLeftBehind) {
  answers_test::ScratchDir dir;
  // A client path of a process that is gone, and one of a process that runs.
  const pid_t gone = ::fork();
  if (gone == 0) ::_exit(0);
  ::waitpid(gone, nullptr, 0);
  const std::string stale = dir.write("kopdm." + std::to_string(gone) + ".0", "");
  const std::string alive = dir.write("kopdm." + std::to_string(::getppid()) + ".0", "");
  const std::string other = dir.write("kopdm.notapid", "");
  std::string path;
  {
    SystemFailure failure;
    auto first = UdsClient::open(dir.str(), &failure);
    auto second = UdsClient::open(dir.str(), &failure);
    ASSERT_NE(first, nullptr);
    ASSERT_NE(second, nullptr);
    EXPECT_NE(first->path(), second->path());
    path = first->path();
    EXPECT_TRUE(exists(path));
  }
  EXPECT_FALSE(exists(path));
  EXPECT_FALSE(exists(stale));
  EXPECT_TRUE(exists(alive));
  EXPECT_TRUE(exists(other));

  SystemFailure failure;
  EXPECT_EQ(UdsClient::open(dir.str() + "/" + std::string(120, 'x'), &failure), nullptr);
  EXPECT_STREQ(failure.call, "bind");
  EXPECT_EQ(failure.error, ENAMETOOLONG);
}

// A service's runtime directory wins when it can hold client paths.
TEST(UdsClient, ClientPathsGoToTheServiceRuntimeDirectoryWhenItIsUsable) {
  answers_test::ScratchDir dir;
  const struct {
    std::optional<std::string> runtime;
    std::string expected;
  } cases[] = {
      {dir.str(), dir.str()},
      {dir.str() + ":/run/other", dir.str()},
      {dir.str() + "/gone", "/var/tmp"},
      {"/" + std::string(64, 'x'), "/var/tmp"},
      {std::nullopt, "/var/tmp"},
  };
  answers_test::ScopedEnv tmp("TMPDIR", "/var/tmp");
  for (const auto& c : cases) {
    SCOPED_TRACE(c.runtime.value_or("(unset)"));
    answers_test::ScopedEnv runtime("RUNTIME_DIRECTORY", c.runtime);
    EXPECT_EQ(UdsClient::defaultDirectory(), c.expected);
  }
}

}  // namespace
}  // namespace ptpmgmt
