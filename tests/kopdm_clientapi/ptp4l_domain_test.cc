// The live time service against real ptp4l daemons: a master-capable clock
// and a slave-only clock in network namespaces of their own, joined by a
// veth pair (scripts/ptp-domain.sh). The service is read over HTTP through
// ws-runtime and, at the same time, in this process through the library.
//
// The daemons run with software time stamps and free_running 1: no test
// steps or pulls this machine's clock. The slave is driven between SLAVE
// and UNCALIBRATED by its synchronisation uncertainty.
//
// main() owns the domain: it creates it under a name of its own, runs the
// tests in a child process and removes the domain whatever the child did;
// domains of runs that were killed are swept at the next start. Without
// the means to make network namespaces the test is skipped, saying why.
#include <cjson/cJSON.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <iterator>
#include <string>
#include <thread>

#include "kopdm_clientapi.h"
#include "support/envelopes.h"
#include "support/host_process.h"
#include "support/http_client.h"
#include "support/scratch.h"

namespace {

namespace test = quillon::test_support;

constexpr const char* kDomainScript = QUILLON_SOURCE_DIR "/scripts/ptp-domain.sh";
constexpr const char* kDeviceUri = "/quillon/syncableDevices/pendulo/timekeeper/genericTk";
constexpr const char* kMasterClock = "02-51-00-FF-FE-00-00-01";

// Set by main() in the child.
std::string domainDir;

std::string shell(const std::string& command) {
  std::string output;
  FILE* pipe = ::popen((command + " 2>&1").c_str(), "r");
  if (pipe == nullptr) return "popen failed";
  char chunk[256];
  while (std::fgets(chunk, sizeof chunk, pipe) != nullptr) output += chunk;
  const int status = ::pclose(pipe);
  return WIFEXITED(status) && WEXITSTATUS(status) == 0 ? "" : "failed: " + output;
}

// Runs a verb of the domain script; `role` for those that take one.
void domain(const std::string& verb, const std::string& role = "") {
  ASSERT_EQ(shell(std::string(kDomainScript) + " " + verb + " " + domainDir + " " + role), "")
      << verb;
}

double monotonicSeconds() {
  timespec now;
  ::clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

std::string readFile(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

// The time stamp (CLOCK_MONOTONIC seconds) of the first line of `role`'s log
// after byte `from` that contains `text`; negative when there is none yet.
double logged(const std::string& role, size_t from, const std::string& text) {
  const std::string log = readFile(domainDir + "/" + role + ".log");
  if (from > log.size()) return -1;
  const size_t at = log.find(text, from);
  if (at == std::string::npos) return -1;
  const size_t newline = log.rfind('\n', at);
  const size_t lineStart = newline == std::string::npos ? 0 : newline + 1;
  // Lines begin "ptp4l[<seconds>]: ".
  const std::string prefix = "ptp4l[";
  if (log.compare(lineStart, prefix.size(), prefix) != 0) return -1;
  return std::strtod(log.c_str() + lineStart + prefix.size(), nullptr);
}

size_t logSize(const std::string& role) { return readFile(domainDir + "/" + role + ".log").size(); }

// Polls `condition` every 10 ms; the monotonic time it first held, or a
// negative value when it did not within `seconds`.
double whenTrue(const std::function<bool()>& condition, double seconds = 20) {
  const double deadline = monotonicSeconds() + seconds;
  while (monotonicSeconds() < deadline) {
    if (condition()) return monotonicSeconds();
    std::this_thread::sleep_for(std::chrono::milliseconds(10));
  }
  return -1;
}

std::string timescale(const char* tr) {
  return std::string("/quillon/timescales/pendulo/") + tr + "/" + kMasterClock;
}

std::string listing(const std::vector<std::string>& timescales) {
  std::string resources = std::string("[{\"uri\":\"") + kDeviceUri + "\"}";
  for (const std::string& uri : timescales) resources += ",{\"uri\":\"" + uri + "\"}";
  return answers_test::successEnvelope("{\"version\":1,\"resources\":" + resources + "]}");
}

const std::string kLockedListing = listing({timescale("tr1"), timescale("tr0")});
const std::string kUnlockedListing = listing({timescale("tr0")});

// One attribute of a time reference through this process's own library.
std::string attr(const char* tr, const char* key) {
  char buffer[1024] = {};
  koerr::Status status;
  const int32_t result = kopdmclientapi_getTrAttrJson(tr, key, buffer, sizeof buffer, &status);
  std::string answer = result < 0 ? "error " + std::to_string(result) : buffer;
  koerr::releaseText(status);
  return answer;
}

class Ptp4lDomain : public ::testing::Test {
 protected:
  static void SetUpTestSuite() {
    // Written by the domain script: tr0 is the master, tr1 the slave.
    const std::string config = domainDir + "/tr.json";
    ::setenv("KOPDM_PTP4L_CONFIG", config.c_str(), 1);
    const std::string marker = domainDir + "/share.dir";
    std::ofstream(marker) << QUILLON_SHARE_DIR;
    host = new test::HostProcess({"--quiet"}, {{"KOPDM_PTP4L_CONFIG", config},
                                               {"KOSYSQ_SHARE_DIR_FILE", marker}});
  }
  static void TearDownTestSuite() {
    // Stopped cleanly, so that it removes its client sockets.
    host->stop(SIGTERM);
    delete host;
    host = nullptr;
  }
  void SetUp() override {
    domain("lock");
    ASSERT_GT(whenTrue([] { return get("/quillon/resources").body == kLockedListing; }), 0)
        << get("/quillon/resources").body;
  }

  static test::HttpResponse get(const std::string& target) {
    return test::httpRequest(host->port(), "GET", target);
  }
  static std::string device() { return get(kDeviceUri).body; }

  struct TimeKeeper {
    bool coherent = false;
    bool offsetKnown = false;
    long long offsetNanos = 0;
  };
  // The device document's coherence and offset.
  static TimeKeeper timeKeeper() {
    TimeKeeper out;
    cJSON* root = cJSON_Parse(device().c_str());
    const cJSON* result = cJSON_GetObjectItemCaseSensitive(root, "result");
    const cJSON* offset = cJSON_GetObjectItemCaseSensitive(result, "offsetNanos");
    out.coherent = cJSON_IsTrue(cJSON_GetObjectItemCaseSensitive(result, "coherent"));
    out.offsetKnown = cJSON_IsNumber(offset);
    if (out.offsetKnown) out.offsetNanos = static_cast<long long>(offset->valuedouble);
    cJSON_Delete(root);
    return out;
  }

  static test::HostProcess* host;
};

test::HostProcess* Ptp4lDomain::host = nullptr;

TEST_F(Ptp4lDomain, TheLockedSlaveIsSelectedAndPublishedFirst) {
  EXPECT_EQ(attr("tr0", "portState"), "{\"portState\":\"PTP_MASTER\"}");
  EXPECT_EQ(attr("tr1", "portState"), "{\"portState\":\"PTP_SLAVE\"}");
  EXPECT_EQ(attr("tr1", "type"), "{\"type\":\"IEEE 1588-2008\"}");
  EXPECT_EQ(attr("tr1", "gmClockId"), std::string("{\"gmClockId\":\"") + kMasterClock + "\"}");
  char selected[256] = {};
  koerr::Status status;
  EXPECT_EQ(kopdmclientapi_getSelectedTrId(selected, sizeof selected, &status), 1);
  EXPECT_STREQ(selected, "tr1");

  EXPECT_EQ(get("/quillon/timescales/pendulo/tr1/" + std::string(kMasterClock)).body,
            answers_test::successEnvelope(
                "{\"version\":1,\"uri\":\"" + timescale("tr1") +
                "\",\"data\":{\"grandmasterId\":\"02:51:00:ff:fe:00:00:01\"}}"));
  // The time keeper carries the selected reference's offset, and is coherent
  // exactly when that offset is within the bound it was given.
  const TimeKeeper unbounded = timeKeeper();
  ASSERT_TRUE(unbounded.offsetKnown);
  EXPECT_TRUE(unbounded.coherent);
  for (int64_t bound : {1, 1000000000}) {
    SCOPED_TRACE(bound);
    test::httpRequest(host->port(), "PUT", kDeviceUri, {},
                      "{\"maxOffsetNanos\":" + std::to_string(bound) + "}");
    const TimeKeeper bounded = timeKeeper();
    ASSERT_TRUE(bounded.offsetKnown);
    EXPECT_EQ(bounded.coherent, std::llabs(bounded.offsetNanos) <= bound);
  }
  test::httpRequest(host->port(), "PUT", kDeviceUri, {}, "{}");
}

TEST_F(Ptp4lDomain, TheSlavesTimescaleFollowsItsPortStateWithinOneSecond) {
  const struct {
    const char* verb;
    const char* logLine;
    const std::string& listing;
  } steps[] = {
      {"unlock", "SLAVE to UNCALIBRATED", kUnlockedListing},
      {"lock", "UNCALIBRATED to SLAVE", kLockedListing},
  };
  for (const auto& step : steps) {
    SCOPED_TRACE(step.verb);
    const size_t logStart = logSize("slave");
    domain(step.verb);
    const double served =
        whenTrue([&] { return get("/quillon/resources").body == step.listing; });
    ASSERT_GT(served, 0) << get("/quillon/resources").body;
    const double changed = logged("slave", logStart, step.logLine);
    ASSERT_GT(changed, 0) << readFile(domainDir + "/slave.log");
    EXPECT_LE(served - changed, 1.0);
    // Nothing is selected without a locked slave.
    EXPECT_EQ(timeKeeper().offsetKnown, step.listing == kLockedListing);
  }
}

// `errorInfo` of an error answer, unquoted enough to search.
bool errorNames(const std::string& body, int32_t code, const std::vector<std::string>& parts) {
  if (body.find("\"errorCode\":" + std::to_string(code) + ",") == std::string::npos) return false;
  for (const std::string& part : parts) {
    if (body.find(part) == std::string::npos) return false;
  }
  return true;
}

TEST_F(Ptp4lDomain, AStoppedMasterIsReportedAndUsedAgainOnceItIsBack) {
  domain("stop", "master");
  const std::string socket = domainDir + "/master.sock";
  const std::vector<std::string> named = {
      "koapalerr_communicationsFault", "\\\"trId\\\":\\\"tr0\\\"",
      "\\\"uds\\\":\\\"" + socket + "\\\"",
      "\\\"systemError\\\":\\\"No such file or directory\\\""};
  // Answers already asked for may be served for a moment longer.
  test::HttpResponse listed;
  EXPECT_GT(whenTrue([&] {
              listed = get("/quillon/resources");
              return listed.status == 500;
            }),
            0);
  EXPECT_EQ(listed.header("X-Status-Code").value_or(""), "-1074100995");
  EXPECT_TRUE(errorNames(listed.body, -1074100995, named)) << listed.body;
  // The slave-only clock loses its master: it listens for another, and the
  // time keeper no longer knows its offset.
  EXPECT_GT(whenTrue([] {
              return attr("tr1", "portState") == "{\"portState\":\"PTP_LISTENING\"}";
            }),
            0);
  EXPECT_GT(whenTrue([] { return !timeKeeper().offsetKnown; }), 0);
  domain("start", "master");
  // SetUp of the next test waits for the whole domain to be back.
  EXPECT_GT(whenTrue([] { return get("/quillon/resources").body == kLockedListing; }), 0);
}

TEST_F(Ptp4lDomain, AStuckMasterTimesOutWithoutHoldingUpTheTimeKeeper) {
  const pid_t master = std::stoi(readFile(domainDir + "/master.pid"));
  ASSERT_EQ(::kill(master, SIGSTOP), 0);
  EXPECT_GT(whenTrue([] {
              return errorNames(get("/quillon/resources").body, -1074100996,
                                {"koapalerr_communicationsFault", "\\\"trId\\\":\\\"tr0\\\""});
            }),
            0);
  // Each answer waits at most one time-out for the stuck daemon.
  for (int i = 0; i < 5; ++i) {
    const double start = monotonicSeconds();
    EXPECT_NE(device().find("\"plugin\":\"pendulo\""), std::string::npos);
    EXPECT_LT(monotonicSeconds() - start, 2.0);
  }
  ASSERT_EQ(::kill(master, SIGCONT), 0);
  EXPECT_GT(whenTrue([] { return get("/quillon/resources").body == kLockedListing; }), 0);
}

}  // namespace

// Returns the child's exit code, or 128 + the signal that ended it.
int main(int argc, char** argv) {
  const std::string script = kDomainScript;
  std::string why = shell(script + " check");
  if (!why.empty()) {
    std::printf("SKIPPED: the ptp4l domain test needs root, linuxptp and network namespaces: %s\n",
                why.c_str());
    return 77;
  }
  shell(script + " sweep");
  answers_test::ScratchDir dir;
  const std::string prefix = "qptp" + std::to_string(::getpid());
  why = shell(script + " up " + dir.str() + " " + prefix);
  int result = 1;
  if (!why.empty()) {
    std::printf("the ptp4l domain did not come up: %s\n", why.c_str());
  } else {
    const pid_t child = ::fork();
    if (child == 0) {
      domainDir = dir.str();
      ::testing::InitGoogleTest(&argc, argv);
      std::exit(RUN_ALL_TESTS());
    }
    int status = 0;
    ::waitpid(child, &status, 0);
    result = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
  }
  shell(script + " down " + dir.str());
  return result;
}
