// ApiWrapper and TimescaleHelpers against the real stand-in library, driven by
// scenario files that each test writes.
#include <cjson/cJSON.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <chrono>
#include <cstdio>
#include <fstream>
#include <functional>
#include <memory>
#include <iterator>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "error_record/error.h"
#include "kopdm_clientapi.h"
#include "kopdm_clientapi/api_wrapper.h"
#include "kosdtools_timescales/timescale_helpers.h"
#include "support/raised.h"
#include "support/scratch.h"

namespace {

using Strings = std::vector<std::string>;
using quillon::test_support::Raised;
using quillon::test_support::raisedBy;

// The scenario the stand-in of this process serves. KOPDM_SIM_SCENARIO is set
// before main() runs, so the stand-in's first call already reads it; it
// notices rewrites on its own watch thread.
const answers_test::ScratchDir kScenarioDir;
const std::string kScenario = [] {
  const std::string path = kScenarioDir.file("scenario.json");
  setenv("KOPDM_SIM_SCENARIO", path.c_str(), 1);
  return path;
}();

// True once `condition` holds, false when it did not within ten seconds.
bool eventually(const std::function<bool()>& condition) {
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
  while (!condition()) {
    if (std::chrono::steady_clock::now() > deadline) return false;
    std::this_thread::yield();
  }
  return true;
}

// Writes `text` (renamed over the scenario when `atomically`, else in place)
// and waits until `served()` holds.
void serve(const std::string& text, const std::function<bool()>& served, bool atomically = false) {
  const std::string path = atomically ? kScenario + ".new" : kScenario;
  std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
  if (atomically) {
    ASSERT_EQ(std::rename(path.c_str(), kScenario.c_str()), 0);
  }
  ASSERT_TRUE(eventually(served)) << text;
}

// Serves `{"pdmMetadata":{"revision":N},<members>}`, N counting installs.
void install(const std::string& members) {
  static int revision = 0;
  const std::string metadata = "{\"revision\":" + std::to_string(++revision) + "}";
  serve("{\"pdmMetadata\":" + metadata + "," + members + "}", [&] {
    char buffer[1024] = {};
    koerr::Status status;
    kopdmclientapi_getPdmMetadataJson(buffer, sizeof buffer, &status);
    koerr::releaseText(status);
    return metadata == buffer;
  }, true);
}

constexpr int32_t kServiceDown = -1074100992;
constexpr int32_t kScenarioUnusable = -1074100993;

std::string tr(const std::string& id, const std::string& type, const std::string& gm,
               const std::string& port) {
  return "\"" + id + "\":{\"attrs\":{\"type\":\"" + type + "\",\"gmClockId\":\"" + gm +
         "\",\"portState\":\"" + port + "\"}}";
}

// Four TRs covering each way into (and out of) the published list.
const std::string kFourTrs =
    "\"selectedTrId\":\"slave 1\",\"selectedTrOffsetNanos\":-1500,\"trs\":{" +
    tr("master0", "IEEE 1588-2008", "gm m", "PTP_MASTER") + "," +
    tr("slave 1", "IEEE 802.1AS-2011", "gm s", "PTP_SLAVE") + "," +
    tr("bc2", "IEEE 1588-2008 BC", "gm-b", "PTP_LISTENING") + "," +
    tr("idle3", "IEEE 1588-2008", "gm i", "PTP_SLAVE") + "}";

struct Record {
  explicit Record(const char* text) : root(cJSON_Parse(text)) {}
  ~Record() { cJSON_Delete(root); }
  const cJSON* at(const char* key, const cJSON* in = nullptr) const {
    return cJSON_GetObjectItemCaseSensitive(in != nullptr ? in : root, key);
  }
  std::string text(const char* key, const cJSON* in = nullptr) const {
    const cJSON* item = at(key, in);
    return cJSON_IsString(item) ? item->valuestring : "<missing " + std::string(key) + ">";
  }
  cJSON* root;
};

// The message of the record every call fails with while the scenario is
// unusable, checking the record's code and file name on the way.
std::string unusableBecause(kopendulo::ApiWrapper& wrapper) {
  std::string answer;
  const Raised failure = raisedBy([&] { wrapper.getTrMetadataJson("any", &answer); });
  const Record record(failure.record.c_str());
  const cJSON* debug = record.at("kopdmclientapi_debug");
  return failure.code == kScenarioUnusable && record.text("scenarioFile", debug) == kScenario
             ? record.text("message", debug)
             : "<usable>";
}

class AgainstStandIn : public ::testing::Test {
 protected:
  std::shared_ptr<kopendulo::ApiWrapper> wrapper = std::make_shared<kopendulo::ApiWrapper>();
  kosdtools::pendulo::TimescaleHelpers helpers{wrapper};
};

TEST_F(AgainstStandIn, FaultsReachTheHelpersAsTheLibraryWroteThem) {
  const std::string longText(1023 - std::string("{\"t\":\"\"}").size(), 'x');
  install(kFourTrs.substr(0, kFourTrs.size() - 1) +
          ",\"long\":{\"metadata\":{\"t\":\"" + longText + "\"}}" +
          ",\"longer\":{\"metadata\":{\"t\":\"" + longText + "y\"}}}," +
          "\"faults\":["
          "{\"call\":\"getTrAttrJson\",\"key\":\"gmClockId\",\"code\":7},"
          "{\"call\":\"getTrAttrJson\",\"trId\":\"idle3\",\"code\":-1074100990},"
          "{\"call\":\"setTrAttr\",\"code\":-5}]");

  // The warning on every grandmaster read is dropped: the URI still comes out.
  EXPECT_EQ(helpers.getTimescaleUri("master0"), "/quillon/timescales/pendulo/master0/gm-m");

  // Only idle3's reads fail, as not set: the helpers' replacement shows it.
  EXPECT_EQ(raisedBy([&] { (void)helpers.getTrType("idle3"); }).code, -52006);
  EXPECT_EQ(helpers.getTrType("master0"), "IEEE 1588-2008");

  std::string metadata;
  wrapper->getTrMetadataJson("long", &metadata);
  EXPECT_EQ(metadata, "{\"t\":\"" + longText + "\"}");
  wrapper->getTrMetadataJson("longer", &metadata);
  EXPECT_EQ(metadata, "{\"t\":\"" + longText + "y\"");  // cut to the buffer less its NUL

  EXPECT_EQ(raisedBy([&] { wrapper->setTrAttr("bc2", "portState", "PTP_MASTER"); }).code, -5);
}

TEST_F(AgainstStandIn, LibraryFailuresArriveUnchangedAndNeverDuringUnwinding) {
  install(kFourTrs + ",\"faults\":[{\"call\":\"getTrMetadataJson\",\"code\":-5}]");
  koerr::Status status;
  char buffer[16] = {};
  (void)kopdmclientapi_getTrMetadataJson("bc2", buffer, sizeof buffer, &status);
  const std::string libraryRecord = status.json != nullptr ? status.json : "";
  koerr::releaseText(status);

  std::string metadata = "unchanged";
  const Raised failure = raisedBy([&] { wrapper->getTrMetadataJson("bc2", &metadata); });
  EXPECT_EQ(failure.code, -5);
  EXPECT_EQ(failure.record, libraryRecord);  // nothing added by the wrapper
  EXPECT_EQ(metadata, "unchanged");

  // A second exception would end the process; the call counts as done and
  // hands over the (untouched, empty) buffer instead.
  struct ReadsWhileUnwinding {
    kopendulo::ApiWrapper& wrapper;
    std::string& out;
    ~ReadsWhileUnwinding() { wrapper.getTrMetadataJson("bc2", &out); }
  };
  try {
    ReadsWhileUnwinding reader{*wrapper, metadata};
    throw std::runtime_error("first");
  } catch (const std::runtime_error& e) {
    EXPECT_STREQ(e.what(), "first");
  }
  EXPECT_EQ(metadata, "");
}

TEST_F(AgainstStandIn, SelectedTrIdsUpTo255CharactersArriveWhole) {
  for (const size_t length : {255u, 256u}) {
    SCOPED_TRACE(length);
    const std::string id(length, 's');
    install("\"selectedTrId\":\"" + id + "\",\"trs\":{" +
            tr(id, "IEEE 1588-2008", "gm", "PTP_SLAVE") + "}");
    std::string selected;
    ASSERT_TRUE(wrapper->getSelectedTrId(&selected));
    EXPECT_EQ(selected, id.substr(0, 255));
    // A cut identifier no longer names its TR, so nothing is published.
    EXPECT_EQ(helpers.getTimescaleUris().size(), length == 255 ? 1u : 0u);
  }
  // A warning while nothing is selected must not pass for a selection.
  install("\"trs\":{},\"faults\":[{\"call\":\"getSelectedTrId\",\"code\":3}]");
  std::string selected = "unchanged";
  EXPECT_FALSE(wrapper->getSelectedTrId(&selected));
  EXPECT_EQ(selected, "unchanged");
  EXPECT_TRUE(helpers.getTrIds().empty());
}

// The priority order of the published list is checked end to end over HTTP.
TEST_F(AgainstStandIn, StateChangingCallsActOnTheServedState) {
  install(kFourTrs);
  EXPECT_EQ(wrapper->getApiVersion(), 1);
  wrapper->setTrAttr("idle3", "portState", "PTP_DISABLED");
  wrapper->setTrAttr("idle3", "domainNumber", "24");
  std::string answer;
  wrapper->getTrAttrJson("idle3", "domainNumber", &answer);
  EXPECT_EQ(answer, "{\"domainNumber\":24}");
  EXPECT_EQ(helpers.getTrPortState("idle3"), "PTP_DISABLED");

  wrapper->updateTrFromConfig("idle3");  // back to the loaded configuration
  EXPECT_EQ(helpers.getTrPortState("idle3"), "PTP_SLAVE");

  wrapper->setTrAttr("idle3", "portState", "PTP_MASTER");
  wrapper->persistConfig();
  wrapper->setTrAttr("idle3", "portState", "PTP_SLAVE");
  wrapper->restartService();  // drops what was not persisted
  EXPECT_EQ(helpers.getTrPortState("idle3"), "PTP_MASTER");

  EXPECT_EQ(wrapper->adjustTime(2, -500), 0);
  int64_t offset = 0;
  EXPECT_EQ(wrapper->getSelectedTrOffsetNanos(&offset), 0);
  EXPECT_EQ(offset, 2 * 1000000000LL - 500 - 1500);

  wrapper->bringDownService();
  EXPECT_EQ(wrapper->getApiVersion(), kServiceDown);
  EXPECT_EQ(raisedBy([&] { (void)helpers.getTimescaleUris(); }).code, kServiceDown);
  wrapper->bringUpService();
  EXPECT_EQ(helpers.getTimescaleUris().size(), 4u);
}

// Good rewrites are waited for by every install.
TEST_F(AgainstStandIn, BrokenScenarioFilesAreReportedUntilAGoodOneIsServed) {
  struct Broken {
    const char* text;
    const char* problem;
  };
  const Broken cases[] = {
      {"{\"trs\":{},\n  \"faults\": [}",
       "the text is not valid JSON (syntax error at line 2, column 14)"},
      {"{\"trs\":[]}", "\"trs\" must be an object"},
  };
  for (const Broken& broken : cases) {
    SCOPED_TRACE(broken.text);
    const std::string message = std::string("Unusable scenario: ") + broken.problem + ".";
    serve(broken.text, [&] { return unusableBecause(*wrapper) == message; });
    std::string answer = "unchanged";
    EXPECT_THROW(wrapper->getPdmAttrJson("timeReferences", &answer), koerr::Exception);
    EXPECT_EQ(answer, "unchanged");
  }
  ASSERT_EQ(std::remove(kScenario.c_str()), 0);
  EXPECT_TRUE(eventually([&] {
    return unusableBecause(*wrapper) ==
           "Unusable scenario: the file cannot be opened: No such file or directory.";
  }));
  install(kFourTrs);
  EXPECT_EQ(helpers.getTimescaleUris().size(), 3u);
}

TEST_F(AgainstStandIn, ConcurrentReadersSeeWholeStatesWhileOthersChangeThem) {
  install(kFourTrs);
  std::vector<std::thread> readers;
  for (int t = 0; t < 3; ++t) {
    readers.emplace_back([&] {
      for (int i = 0; i < 200; ++i) {
        const Strings uris = helpers.getTimescaleUris();
        // idle3 flips between master (published at the back) and slave (not).
        ASSERT_TRUE(uris.size() == 3 || uris.size() == 4);
      }
    });
  }
  for (int i = 0; i < 200; ++i) {
    wrapper->setTrAttr("idle3", "portState", i % 2 ? "PTP_MASTER" : "PTP_SLAVE");
  }
  for (std::thread& reader : readers) reader.join();
}

// No two examples in a row give the same answer, so the stand-in's previous
// state cannot pass for the example just served.
TEST_F(AgainstStandIn, ExampleScenariosAreServedAsDocumented) {
  const std::string prefix = "/quillon/timescales/pendulo/";
  struct Example {
    const char* name;
    Strings uris;
    int32_t code;  // the error getTimescaleUris raises instead, if any
  };
  const Example examples[] = {
      {"default", {prefix + "tr1/00-1B-21-FF-FE-AB-CD-EF", prefix + "tr0/00-80-2F-FF-FE-12-34-56",
                   prefix + "tr2/00-80-2F-FF-FE-65-43-21"}, 0},
      {"many_references", {prefix + "cell-uplink/gm-cell-1", prefix + "tab/00-1B-21-FF-FE-00-00-0A",
                           prefix + "off/00-80-2F-FF-FE-00-00-0D"}, 0},
      {"faults", {}, -52005},
      {"older_service", {}, -52006},
  };
  for (const Example& example : examples) {
    SCOPED_TRACE(example.name);
    std::ifstream file(std::string(QUILLON_EXAMPLE_SCENARIOS) + "/" + example.name + ".json");
    serve(std::string(std::istreambuf_iterator<char>(file), {}), [&] {
      Strings uris;
      return raisedBy([&] { uris = helpers.getTimescaleUris(); }).code == example.code &&
             uris == example.uris;
    }, true);
  }
}

TEST_F(AgainstStandIn, LibraryRefusesUnusableArgumentsWithARecord) {
  install(kFourTrs);
  constexpr int32_t kInvalidArgument = -1074100994;
  char buffer[4] = {'a', 'b', 'c', 'd'};
  koerr::Status status;
  EXPECT_EQ(kopdmclientapi_getTrAttrJson("bc2", nullptr, buffer, 4, &status), kInvalidArgument);
  EXPECT_EQ(status.code, kInvalidArgument);
  EXPECT_EQ(Record(status.json).text("call", Record(status.json).at("kopdmclientapi_debug")),
            "getTrAttrJson");
  koerr::releaseText(status);
  status = koerr::Status();
  // Capacity 1 holds the terminator only; nothing past the capacity is written.
  EXPECT_EQ(kopdmclientapi_getTrAttrJson("bc2", "type", buffer, 1, &status), 0);
  EXPECT_EQ(std::string(buffer, 4), std::string("\0bcd", 4));
}

TEST(ApiWrapper, MissingOutParametersAreRefusedBeforeTheLibraryIsCalled) {
  kopendulo::ApiWrapper wrapper;
  struct Case {
    const char* name;
    int line;
    std::function<void()> call;
  };
  const std::string tr = "tr0";
  const Case cases[] = {
      {"selectedTrIdOut", 29, [&] { wrapper.getSelectedTrId(nullptr); }},
      {"selectedTrOffsetNanosOut", 48, [&] { wrapper.getSelectedTrOffsetNanos(nullptr); }},
      {"pdmAttrJsonOut", 58, [&] { wrapper.getPdmAttrJson("timeReferences", nullptr); }},
      {"pdmMetadataJsonOut", 75, [&] { wrapper.getPdmMetadataJson(nullptr); }},
      {"trAttrJsonOut", 97, [&] { wrapper.getTrAttrJson(tr, "type", nullptr); }},
      {"trMetadataJsonOut", 116, [&] { wrapper.getTrMetadataJson(tr, nullptr); }},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    const Raised refused = raisedBy(c.call);
    EXPECT_EQ(refused.code, -52005);
    EXPECT_EQ(refused.record,
              "{\"error_constant\":\"koapalerr_invalidParameter\","
              "\"file\":\"kopdm_clientapi/apiWrapper\",\"line\":" + std::to_string(c.line) +
                  ",\"component\":\"quillon\",\"kopendulo_debug\":{\"message\":\"Encountered "
                  "missing parameter needed for task completion.\",\"" + c.name + "\":\"nullptr\"}}");
  }
}

}  // namespace
