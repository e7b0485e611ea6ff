// The live time service against scripted daemon sockets: what each call
// answers, what a burst of calls costs, and the record of every way a daemon
// or a configuration can fail. Real daemons are the integration test's.
#include "live/live_time_service.h"

#include <cjson/cJSON.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <functional>
#include <future>
#include <string>
#include <thread>
#include <vector>

#include "error_record/status.h"
#include "live/live_config.h"
#include "support/ptp_fake.h"
#include "support/scratch.h"

namespace kopdmlive {
namespace {

using ptpmgmt::ManagementId;
using quillon::test_support::FakeDaemon;
using quillon::test_support::healthyDaemon;

constexpr uint8_t kMaster = 6;
constexpr uint8_t kUncalibrated = 8;
constexpr uint8_t kSlave = 9;

struct Reply {
  int32_t code = 0;
  std::string text;  // the answer, or the record's selected members
};

// "constant|message|k=v|..." of a record, for the keys asked.
std::string summary(const koerr::Status& status, const std::vector<std::string>& keys) {
  cJSON* root = cJSON_Parse(status.json != nullptr ? status.json : "");
  const cJSON* constant = cJSON_GetObjectItemCaseSensitive(root, "error_constant");
  const cJSON* debug = cJSON_GetObjectItemCaseSensitive(root, "kopdmclientapi_debug");
  std::string out = cJSON_IsString(constant) ? constant->valuestring : "?";
  for (const std::string& key : keys) {
    const cJSON* value = cJSON_GetObjectItemCaseSensitive(debug, key.c_str());
    char* printed = value != nullptr ? cJSON_PrintUnformatted(value) : nullptr;
    out += "|" + key + "=" + (printed != nullptr ? printed : "<none>");
    cJSON_free(printed);
  }
  cJSON_Delete(root);
  return out;
}

class Live {
 public:
  explicit Live(const std::string& config) {
    path_ = dir.write("tr.json", config);
    service = std::make_unique<LiveTimeService>(path_, dir.str());
  }
  std::string socket(const std::string& name) const { return dir.file(name); }

  Reply attr(const std::string& trId, const std::string& key,
             const std::vector<std::string>& recordKeys = {}) {
    return text([&](char* buffer, koerr::Status* status) {
      return service->getTrAttrJson(trId.c_str(), key.c_str(), buffer, 1024, status);
    }, recordKeys);
  }
  Reply pdmAttr(const std::string& key, const std::vector<std::string>& recordKeys = {}) {
    return text([&](char* buffer, koerr::Status* status) {
      return service->getPdmAttrJson(key.c_str(), buffer, 1024, status);
    }, recordKeys);
  }
  Reply selected() {
    Reply reply = text([&](char* buffer, koerr::Status* status) {
      return service->getSelectedTrId(buffer, 256, status);
    }, {});
    return reply;
  }
  Reply offset(const std::vector<std::string>& recordKeys = {}) {
    int64_t nanos = 0;
    koerr::Status status;
    const int32_t result = service->getSelectedTrOffsetNanos(&nanos, &status);
    Reply reply{result, result < 0 ? summary(status, recordKeys) : std::to_string(nanos)};
    koerr::releaseText(status);
    return reply;
  }

  answers_test::ScratchDir dir;
  std::unique_ptr<LiveTimeService> service;

 private:
  template <typename Call>
  Reply text(Call&& call, const std::vector<std::string>& recordKeys) {
    char buffer[1024] = {};
    koerr::Status status;
    const int32_t result = call(buffer, &status);
    Reply reply{result, result < 0 ? summary(status, recordKeys) : std::string(buffer)};
    if (result == 1) reply.text = "selected " + reply.text;
    koerr::releaseText(status);
    return reply;
  }
  std::string path_;
};

std::string config(const std::string& trs, const std::string& rest = "") {
  return "{\"timeReferences\":[" + trs + "]" + rest + "}";
}

std::string tr(const std::string& id, const std::string& socket, const std::string& extra = "") {
  return "{\"id\":\"" + id + "\",\"uds\":\"" + socket + "\"" + extra + "}";
}

TEST(LiveTimeService, AnswersComeFromTheDaemonsDataSets) {
  answers_test::ScratchDir sockets;
  FakeDaemon master(sockets.file("m.sock"), healthyDaemon(kMaster));
  FakeDaemon slave(sockets.file("s.sock"), healthyDaemon(kSlave, 0, 1, -815));
  Live live(config(tr("trM", master.path()) + "," + tr("tr_S", slave.path())));
  const struct {
    const char* tr;
    const char* key;
    std::string answer;
  } cases[] = {
      {"trM", "type", "{\"type\":\"IEEE 1588-2008\"}"},
      {"trM", "portState", "{\"portState\":\"PTP_MASTER\"}"},
      {"tr_S", "portState", "{\"portState\":\"PTP_SLAVE\"}"},
      {"tr_S", "gmClockId", "{\"gmClockId\":\"02-00-00-FF-FE-00-00-09\"}"},
      {"tr_S", "meanPathDelayNanos", "{\"meanPathDelayNanos\":-0.5}"},
      {"tr_S", "masterOffsetNanos", "{\"masterOffsetNanos\":-815}"},
      {"tr_S", "ptpTimescale", "{\"ptpTimescale\":true}"},
      {"tr_S", "interface", "{\"interface\":\"veth0\"}"},
      {"tr_S", "delayMechanism", "{\"delayMechanism\":\"E2E\"}"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.tr) + " " + c.key);
    const Reply reply = live.attr(c.tr, c.key);
    EXPECT_EQ(reply.code, 0) << reply.text;
    EXPECT_EQ(reply.text, c.answer);
  }
  EXPECT_EQ(live.pdmAttr("timeReferences").text, "{\"timeReferences\":[\"trM\",\"tr_S\"]}");
  EXPECT_EQ(live.pdmAttr("selection").text, "{\"selection\":\"automatic\"}");
  // The first locked slave in file order; its offset is the device's.
  EXPECT_EQ(live.selected().text, "selected tr_S");
  EXPECT_EQ(live.pdmAttr("selectedTr").text, "{\"selectedTr\":\"tr_S\"}");
  EXPECT_EQ(live.offset().text, "-815");

  // Without a locked slave nothing is selected and no offset is known.
  slave.setScript(healthyDaemon(kUncalibrated));
  Live unlocked(config(tr("trM", master.path()) + "," + tr("tr_S", slave.path())));
  EXPECT_EQ(unlocked.selected().code, 0);
  EXPECT_EQ(unlocked.pdmAttr("selectedTr").text, "{\"selectedTr\":null}");
  EXPECT_EQ(unlocked.offset({"message"}).code, -1074101000);
  // A configured selection holds whatever the ports do.
  Live configured(config(tr("trM", master.path()) + "," + tr("tr_S", slave.path()),
                         ",\"selectedTr\":\"trM\""));
  EXPECT_EQ(configured.selected().text, "selected trM");
  EXPECT_EQ(configured.offset().text, "-42");
}

TEST(LiveTimeService, TypeFollowsTransportAndPortsUnlessConfigured) {
  answers_test::ScratchDir sockets;
  const struct {
    uint8_t transport;
    uint16_t ports;
    const char* configured;
    const char* type;
  } cases[] = {
      {0, 1, "", "IEEE 1588-2008"},
      {1, 1, "", "IEEE 802.1AS-2011"},
      {0, 2, "", "IEEE 1588-2008 BC"},
      {1, 3, "", "IEEE 802.1AS-2011 TAB"},
      {0, 1, ",\"type\":\"IEEE 802.1AS-2011 TAB\"", "IEEE 802.1AS-2011 TAB"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.type) + " from transport " + std::to_string(c.transport));
    FakeDaemon daemon(sockets.file("d.sock"), healthyDaemon(kSlave, c.transport, c.ports));
    Live live(config(tr("tr0", daemon.path(), c.configured)));
    EXPECT_EQ(live.attr("tr0", "type").text, std::string("{\"type\":\"") + c.type + "\"}");
    // Once known, the transport is not probed again.
    EXPECT_EQ(live.attr("tr0", "portState").text, "{\"portState\":\"PTP_SLAVE\"}");
  }
}

// One listing asks every time reference's type, port state (twice), the
// selection and the grandmaster: that must cost one exchange per daemon and
// data set, and a later burst asks again.
TEST(LiveTimeService, ABurstCostsOneRoundTripPerDaemonAndDataSet) {
  answers_test::ScratchDir sockets;
  FakeDaemon a(sockets.file("a.sock"), healthyDaemon(kMaster));
  FakeDaemon b(sockets.file("b.sock"), healthyDaemon(kSlave));
  Live live(config(tr("a", a.path()) + "," + tr("b", b.path()), ",\"maxAgeMillis\":400"));
  const auto burst = [&] {
    live.pdmAttr("timeReferences");
    for (const char* id : {"a", "b"}) {
      live.attr(id, "type");
      live.attr(id, "portState");
      live.attr(id, "portState");
      live.selected();
      live.attr(id, "gmClockId");
    }
  };
  burst();  // the first contact probes both transports
  EXPECT_EQ(a.requests(ManagementId::kDefaultDataSet), 2);
  // Past the serving limit, so that the burst waits for its exchange.
  std::this_thread::sleep_for(std::chrono::milliseconds(1000));
  a.resetCounts();
  b.resetCounts();
  burst();
  for (const FakeDaemon* daemon : {&a, &b}) {
    for (ManagementId id : {ManagementId::kDefaultDataSet, ManagementId::kPortDataSet,
                            ManagementId::kParentDataSet, ManagementId::kTimeStatusNp}) {
      SCOPED_TRACE(ptpmgmt::managementIdName(static_cast<uint16_t>(id)));
      EXPECT_EQ(daemon->requests(id), 1);
    }
  }
}

// A daemon slower than the answers' age: a steady caller costs one exchange
// per age period counted from the answers' arrival, calls made while one is
// in flight get the previous answers, and only calls with nothing younger
// than 950 ms wait, all for the same exchange. Even the first exchange, which
// finds out the daemon's transportSpecific, is one round trip.
TEST(LiveTimeService, ASlowDaemonCostsOneExchangePerPeriodAndStallsNobody) {
  using std::chrono::milliseconds;
  answers_test::ScratchDir sockets;
  FakeDaemon daemon(sockets.file("d.sock"), healthyDaemon(kSlave));
  daemon.setDelay(milliseconds(200));
  Live live(config(tr("d", daemon.path()), ",\"timeoutMillis\":350,\"maxAgeMillis\":100"));
  const auto exchanges = [&] { return daemon.requests(ManagementId::kPortDataSet); };
  const auto concurrently = [&](const std::string& expected) {
    std::vector<std::future<Reply>> calls;
    for (int i = 0; i < 8; ++i) {
      calls.push_back(std::async(std::launch::async, [&] { return live.attr("d", "portState"); }));
    }
    for (auto& call : calls) EXPECT_EQ(call.get().text, "{\"portState\":\"" + expected + "\"}");
  };
  concurrently("PTP_SLAVE");  // nothing known: all wait for the first exchange
  EXPECT_EQ(exchanges(), 1);

  int before = exchanges();
  for (auto end = std::chrono::steady_clock::now() + milliseconds(1000);
       std::chrono::steady_clock::now() < end;) {
    ASSERT_EQ(live.attr("d", "portState").code, 0);
  }
  std::this_thread::sleep_for(milliseconds(200));
  EXPECT_GE(exchanges() - before, 2);
  EXPECT_LE(exchanges() - before, 4);  // 1000 ms / (200 ms + 100 ms), and the one under way

  std::this_thread::sleep_for(milliseconds(1000));
  daemon.setScript(healthyDaemon(kMaster));
  before = exchanges();
  concurrently("PTP_MASTER");  // nothing recent enough: the new state, from one exchange
  EXPECT_EQ(exchanges() - before, 1);

  // Answers held past the time-out: a caller that waited would fail.
  daemon.setDelay(milliseconds(1500));
  std::this_thread::sleep_for(milliseconds(150));
  concurrently("PTP_MASTER");
  std::this_thread::sleep_for(milliseconds(1200));
  EXPECT_EQ(exchanges() - before, 2);
  EXPECT_EQ(live.attr("d", "portState").code, -1074100996);
}

TEST(LiveTimeService, DaemonFailuresNameTheReferenceTheSocketAndTheRequest) {
  answers_test::ScratchDir sockets;
  using ptpmgmt::Answer;
  using quillon::test_support::Bytes;
  FakeDaemon refusing(sockets.file("r.sock"), [](const Answer& request) -> std::vector<Bytes> {
    if (request.managementId == 0x2004) {
      return {quillon::test_support::errorStatusAnswer(request, 0x0004)};
    }
    return healthyDaemon(kSlave)(request);
  });
  FakeDaemon garbling(sockets.file("g.sock"), [](const Answer& request) -> std::vector<Bytes> {
    if (request.managementId == 0x2002) {
      return {quillon::test_support::managementAnswer(request, Bytes(10, 0))};
    }
    return healthyDaemon(kSlave)(request);
  });
  FakeDaemon silent(sockets.file("q.sock"), [](const Answer&) { return std::vector<Bytes>{}; });
  Live live(config(tr("refusing", refusing.path(), ",\"port\":7") + "," +
                       tr("garbling", garbling.path()) + "," + tr("silent", silent.path()) + "," +
                       tr("away", sockets.file("none.sock")) + "," +
                       tr("typed", sockets.file("none.sock"), ",\"type\":\"IEEE 1588-2008 BC\""),
                   ",\"timeoutMillis\":100"));
  const struct {
    const char* tr;
    const char* key;
    int32_t code;
    std::vector<std::string> keys;
    std::string record;
  } cases[] = {
      {"refusing", "portState", -1074100997,
       {"trId", "managementId", "managementIdName", "managementErrorId", "managementErrorName"},
       "kopdmclientapi_managementError|trId=\"refusing\"|managementId=8196|"
       "managementIdName=\"PORT_DATA_SET\"|managementErrorId=4|"
       "managementErrorName=\"WRONG_VALUE\""},
      {"garbling", "gmClockId", -1074100998, {"managementIdName", "problem"},
       "kopdmclientapi_malformedAnswer|managementIdName=\"PARENT_DATA_SET\"|"
       "problem=\"the data set is shorter than its fields\""},
      {"silent", "portState", -1074100996,
       {"message", "uds", "managementIdName", "timeoutMillis", "transportSpecific"},
       "koapalerr_communicationsFault|message=\"The ptp4l daemon of the time reference did not "
       "answer in time.\"|uds=\"" + silent.path() + "\"|managementIdName=\"PORT_DATA_SET\"|"
       "timeoutMillis=100|transportSpecific=\"0 and 1\""},
      {"away", "type", -1074100995, {"uds", "managementIdName", "systemCall", "systemError"},
       "koapalerr_communicationsFault|uds=\"" + sockets.file("none.sock") +
           "\"|managementIdName=\"DEFAULT_DATA_SET\"|systemCall=\"sendto\"|"
           "systemError=\"No such file or directory\""},
      {"nobody", "type", -1074100991, {"trId"}, "kopdmclientapi_trDoesNotExist|trId=\"nobody\""},
      {"silent", "nonsense", -1074100990, {"attrKey"},
       "kopdmclientapi_attrNotSet|attrKey=\"nonsense\""},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(std::string(c.tr) + " " + c.key);
    const Reply reply = live.attr(c.tr, c.key, c.keys);
    EXPECT_EQ(reply.code, c.code);
    EXPECT_EQ(reply.text, c.record);
  }
  // A configured type needs no daemon.
  EXPECT_EQ(live.attr("typed", "type").text, "{\"type\":\"IEEE 1588-2008 BC\"}");
  // Data sets that did answer are served all the same.
  EXPECT_EQ(live.attr("refusing", "gmClockId").text,
            "{\"gmClockId\":\"02-00-00-FF-FE-00-00-09\"}");
  // A reference whose port state cannot be had is passed over.
  EXPECT_EQ(live.selected().text, "selected garbling");
  // Every daemon was asked through the one client socket of the process.
  int clientSockets = 0;
  for (const auto& entry : std::filesystem::directory_iterator(live.dir.str())) {
    clientSockets += entry.path().filename().string().rfind("kopdm.", 0) == 0 ? 1 : 0;
  }
  EXPECT_EQ(clientSockets, 1);
}

TEST(LiveTimeService, AStuckDaemonHoldsUpOnlyItsOwnCalls) {
  answers_test::ScratchDir sockets;
  FakeDaemon stuck(sockets.file("s.sock"), [](const ptpmgmt::Answer&) {
    return std::vector<quillon::test_support::Bytes>{};
  });
  FakeDaemon healthy(sockets.file("h.sock"), healthyDaemon(kMaster));
  Live live(config(tr("stuck", stuck.path()) + "," + tr("healthy", healthy.path()),
                   ",\"timeoutMillis\":3000,\"maxAgeMillis\":900"));
  auto waiting = std::async(std::launch::async, [&] { return live.attr("stuck", "portState"); });
  // Asked while the other call still waits for its daemon.
  EXPECT_EQ(live.attr("healthy", "portState").text, "{\"portState\":\"PTP_MASTER\"}");
  EXPECT_EQ(waiting.wait_for(std::chrono::seconds(0)), std::future_status::timeout);
  EXPECT_EQ(waiting.get().code, -1074100996);
  // Known to be stuck now: the next call does not wait again.
  auto again = std::async(std::launch::async, [&] { return live.attr("stuck", "type"); });
  EXPECT_EQ(again.wait_for(std::chrono::seconds(1)), std::future_status::ready);
}

TEST(LiveTimeService, TheConfigurationIsWatchedAndItsProblemsReported) {
  Live live("{\"timeReferences\":[{\"id\":\"tr0\"}]}");
  const Reply broken = live.pdmAttr("timeReferences", {"message", "call"});
  EXPECT_EQ(broken.code, -1074100993);
  EXPECT_EQ(broken.text,
            "kopdmclientapi_configUnusable|message=\"Unusable ptp4l configuration: "
            "\\\"timeReferences\\\"[0].\\\"uds\\\" is missing.\"|call=\"getPdmAttrJson\"");
  EXPECT_EQ(live.service->getApiVersion(), -1074100993);
  const std::string fixed = live.dir.file("fixed.json");
  std::ofstream(fixed) << config(tr("tr0", "/nowhere"));
  ASSERT_EQ(std::rename(fixed.c_str(), live.dir.file("tr.json").c_str()), 0);
  for (int i = 0; i < 500 && live.service->getApiVersion() != 1; ++i) {
    std::this_thread::sleep_for(std::chrono::milliseconds(10));
  }
  EXPECT_EQ(live.pdmAttr("timeReferences").text, "{\"timeReferences\":[\"tr0\"]}");
}

TEST(LiveTimeService, CallsThatWouldChangeADaemonAreRefused) {
  Live live(config(tr("tr0", "/nowhere")));
  const std::pair<const char*, std::function<int32_t(koerr::Status*)>> calls[] = {
      {"setTrAttr", [&](koerr::Status* s) { return live.service->setTrAttr("tr0", "a", "1", s); }},
      {"restartService", [&](koerr::Status* s) { return live.service->restartService(s); }},
      {"bringDownService", [&](koerr::Status* s) { return live.service->bringDownService(s); }},
      {"bringUpService", [&](koerr::Status* s) { return live.service->bringUpService(s); }},
      {"persistConfig", [&](koerr::Status* s) { return live.service->persistConfig(s); }},
      {"updateTrFromConfig",
       [&](koerr::Status* s) { return live.service->updateTrFromConfig("tr0", s); }},
      {"adjustTime", [&](koerr::Status* s) { return live.service->adjustTime(1, 0, s); }},
  };
  for (const auto& [name, call] : calls) {
    SCOPED_TRACE(name);
    koerr::Status status;
    EXPECT_EQ(call(&status), -1074100999);
    EXPECT_EQ(summary(status, {"call"}),
              std::string("kopdmclientapi_readOnly|call=\"") + name + "\"");
    koerr::releaseText(status);
    EXPECT_EQ(call(nullptr), -1074100994);
  }
}

TEST(LiveConfig, ProblemsSayWhatAndWhere) {
  // Five ids whose answer takes 1024 bytes, one more than the plug-in reads.
  const auto fiveIds = [](size_t lastLength) {
    std::string trs;
    for (char id = 'a'; id <= 'e'; ++id) {
      trs += std::string(trs.empty() ? "" : ",") + "{\"id\":\"" +
             std::string(id == 'e' ? lastLength : 199, id) + "\",\"uds\":\"/s\"}";
    }
    return "{\"timeReferences\":[" + trs + "]}";
  };
  const struct {
    std::string text;
    std::string problem;
  } cases[] = {
      {fiveIds(193), "\"timeReferences\" lists more than the plug-in can read: the answer "
                     "naming them would be 1024 bytes, more than 1023"},
      {std::string("{\"timeReferences\":[]}\0x", 23), "the text holds a NUL byte at offset 21"},
      {"{", "the text is not valid JSON (syntax error at line 1, column 2)"},
      {"[]", "the configuration must be an object"},
      {"{\"timeReferences\":[],\"timeout\":1}", "unknown member \"timeout\""},
      {"{}", "\"timeReferences\" is missing"},
      {"{\"timeReferences\":{}}", "\"timeReferences\" must be an array"},
      {"{\"timeReferences\":[1]}", "\"timeReferences\"[0] must be an object"},
      {"{\"timeReferences\":[{\"id\":\"a\",\"uds\":\"/s\",\"prot\":1}]}",
       "\"timeReferences\"[0]: unknown member \"prot\""},
      {"{\"timeReferences\":[{\"id\":\"\",\"uds\":\"/s\"}]}",
       "\"timeReferences\"[0].\"id\" must be a non-empty string"},
      {"{\"timeReferences\":[{\"id\":\"a/b\",\"uds\":\"/s\"}]}",
       "\"timeReferences\"[0].\"id\" holds the byte 0x2F at offset 1: only letters A-Z and "
       "a-z, digits and \"-._~\" may be used"},
      {"{\"timeReferences\":[{\"id\":\"a\\\"\",\"uds\":\"/s\"}]}",
       "\"timeReferences\"[0].\"id\" holds the byte 0x22 at offset 1: only letters A-Z and "
       "a-z, digits and \"-._~\" may be used"},
      {"{\"timeReferences\":[{\"id\":\"\xC3\",\"uds\":\"/s\"}]}",
       "\"timeReferences\"[0].\"id\" holds the byte 0xC3 at offset 0: only letters A-Z and "
       "a-z, digits and \"-._~\" may be used"},
      {"{\"timeReferences\":[{\"id\":\"..\",\"uds\":\"/s\"}]}",
       "\"timeReferences\"[0].\"id\" must not be \".\" or \"..\" nor be longer than 255 bytes"},
      {"{\"timeReferences\":[{\"id\":\"a\",\"uds\":\"/s\\u0000x\"}]}",
       "\"timeReferences\"[0].\"uds\" must not contain NUL (\\u0000)"},
      {"{\"timeReferences\":[{\"id\":\"a\",\"uds\":\"/s\"}],\"selectedTr\":\"a\\u0000\"}",
       "\"selectedTr\" must not contain NUL (\\u0000)"},
      {"{\"timeReferences\":[{\"id\":\"a\",\"uds\":\"/s\",\"port\":0}]}",
       "\"timeReferences\"[0].\"port\" must be an integer from 1 to 65534"},
      {"{\"timeReferences\":[{\"id\":\"a\",\"uds\":\"/s\",\"domainNumber\":1.5}]}",
       "\"timeReferences\"[0].\"domainNumber\" must be an integer from 0 to 255"},
      {"{\"timeReferences\":[{\"id\":\"a\",\"uds\":\"/s\",\"type\":\"PTP\"}]}",
       "\"timeReferences\"[0].\"type\" must be \"IEEE 1588-2008\", \"IEEE 1588-2008 BC\", "
       "\"IEEE 802.1AS-2011\" or \"IEEE 802.1AS-2011 TAB\""},
      {"{\"timeReferences\":[{\"id\":\"a\",\"uds\":\"/s\"},{\"id\":\"a\",\"uds\":\"/t\"}]}",
       "\"timeReferences\" names the time reference \"a\" twice"},
      {"{\"timeReferences\":[{\"id\":\"a\",\"uds\":\"/s\"}],\"selectedTr\":\"b\"}",
       "\"selectedTr\" names \"b\", which is not in \"timeReferences\""},
      {"{\"timeReferences\":[],\"timeoutMillis\":0}",
       "\"timeoutMillis\" must be an integer from 1 to 10000"},
      {"{\"timeReferences\":[],\"maxAgeMillis\":1000}",
       "\"maxAgeMillis\" must be an integer from 0 to 900"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.text);
    LiveConfig config;
    std::string problem;
    EXPECT_FALSE(parseLiveConfig(c.text, &config, &problem));
    EXPECT_EQ(problem, c.problem);
  }
  LiveConfig config;
  std::string problem;
  EXPECT_TRUE(parseLiveConfig(fiveIds(192), &config, &problem)) << problem;
  ASSERT_TRUE(parseLiveConfig(
      "{\"timeReferences\":[{\"id\":\"a\",\"uds\":\"/s\",\"port\":2,\"domainNumber\":24}],"
      "\"selectedTr\":\"a\",\"timeoutMillis\":50}",
      &config, &problem))
      << problem;
  EXPECT_FALSE(config.automaticSelection);
  EXPECT_EQ(config.trs[0].port, 2);
  EXPECT_EQ(config.trs[0].domainNumber, 24);
  EXPECT_EQ(config.timeoutMillis, 50u);
  EXPECT_EQ(config.maxAgeMillis, 100u);
}

}  // namespace
}  // namespace kopdmlive
