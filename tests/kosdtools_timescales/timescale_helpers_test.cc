#include "kosdtools_timescales/timescale_helpers.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "error_record/error.h"
#include "support/raised.h"

namespace {

using ::testing::_;
using ::testing::Invoke;
using ::testing::NiceMock;
using Strings = std::vector<std::string>;

constexpr int32_t kNotSet = -1074100990;
constexpr int32_t kNoTr = -1074100991;

class MockClient : public kopendulo::ApiWrapperInterface {
 public:
  MOCK_METHOD(int32_t, getApiVersion, (), (override));
  MOCK_METHOD(bool, getSelectedTrId, (std::string*), (override));
  MOCK_METHOD(int32_t, getSelectedTrOffsetNanos, (int64_t*), (override));
  MOCK_METHOD(void, getPdmAttrJson, (const std::string&, std::string*), (override));
  MOCK_METHOD(void, getPdmMetadataJson, (std::string*), (override));
  MOCK_METHOD(void, getTrAttrJson, (const std::string&, const std::string&, std::string*),
              (override));
  MOCK_METHOD(void, getTrMetadataJson, (const std::string&, std::string*), (override));
  MOCK_METHOD(void, setTrAttr, (const std::string&, const std::string&, const std::string&),
              (override));
  MOCK_METHOD(void, restartService, (), (override));
  MOCK_METHOD(void, bringDownService, (), (override));
  MOCK_METHOD(void, bringUpService, (), (override));
  MOCK_METHOD(void, persistConfig, (), (override));
  MOCK_METHOD(void, updateTrFromConfig, (const std::string&), (override));
  MOCK_METHOD(int32_t, adjustTime, (int64_t, int64_t), (override));
};

// A time service made of answer texts; a missing TR attribute answer throws
// the service's not-set error, as the real library does.
struct Service {
  std::string trList;
  std::map<std::pair<std::string, std::string>, std::string> trAttrs;
  std::string selected;  // empty: none selected
  std::shared_ptr<NiceMock<MockClient>> client = std::make_shared<NiceMock<MockClient>>();

  Service() {
    ON_CALL(*client, getPdmAttrJson("timeReferences", _))
        .WillByDefault(Invoke([this](const std::string&, std::string* out) { *out = trList; }));
    ON_CALL(*client, getTrAttrJson(_, _, _))
        .WillByDefault(Invoke([this](const std::string& tr, const std::string& key, std::string* out) {
          const auto found = trAttrs.find({tr, key});
          if (found == trAttrs.end()) raiseServiceError(kNotSet);
          *out = found->second;
        }));
    ON_CALL(*client, getSelectedTrId(_)).WillByDefault(Invoke([this](std::string* out) {
      if (selected.empty()) return false;
      *out = selected;
      return true;
    }));
  }
  void add(const std::string& tr, const std::string& type, const std::string& gm,
           const std::string& port) {
    trAttrs[{tr, "type"}] = "{\"type\":\"" + type + "\"}";
    trAttrs[{tr, "gmClockId"}] = "{\"gmClockId\":\"" + gm + "\"}";
    trAttrs[{tr, "portState"}] = "{\"portState\":\"" + port + "\"}";
  }
  [[noreturn]] static void raiseServiceError(int32_t code) {
    koerr::Error(code, "pdmErr", "pdm/lib", 3, "pdm_debug").add("m", "x").raise();
  }
};

// The record helpers raise: fixed head, then the channel's lines.
std::string helperRecord(const char* constant, int line, const std::string& lines,
                         const std::string& nested = "") {
  return std::string("{\"error_constant\":\"") + constant +
         "\",\"file\":\"kosdtools_timescales/timescaleHelpers\",\"line\":" +
         std::to_string(line) + ",\"component\":\"quillon\",\"kosyncdomain_debug\":{" + lines +
         "}" + nested + "}";
}

std::string nestedServiceError(int32_t code) {
  return ",\"nested_error\":[{\"error_constant\":\"pdmErr\",\"file\":\"pdm/lib\",\"line\":3,"
         "\"component\":\"quillon\",\"pdm_debug\":{\"m\":\"x\"},\"code\":" +
         std::to_string(code) + "}]";
}

std::string thrownBy(const std::function<void()>& call) {
  return quillon::test_support::raisedBy(call).record;
}

// The order of an ordinary listing is pinned end to end; these are the types
// and reads only this level sees.
TEST(TimescaleHelpers, OrdersBoundaryClocksAndTheSelectedSlaveFirstAndMastersLast) {
  Service service;
  service.trList = "{\"timeReferences\":[\"a\",\"b\",\"c\",\"e\",\"f\",\"tr 8\"]}";
  service.add("a", "IEEE 802.1AS-2011 TAB", "ga", "PTP_SLAVE");
  service.add("b", "IEEE 1588-2008", "gb", "PTP_MASTER");
  service.add("c", "IEEE 802.1AS-2011", "gc", "PTP_SLAVE");
  service.add("e", "IEEE 1588-2019", "ge", "PTP_MASTER");
  service.add("f", "IEEE 1588-2008 BC", "gf", "PTP_MASTER");
  service.add("tr 8", "IEEE 1588-2008", "gm A", "PTP_MASTER");
  service.selected = "c";
  kosdtools::pendulo::TimescaleHelpers helpers(service.client);

  const std::string prefix = "/quillon/timescales/pendulo/";
  EXPECT_EQ(helpers.getTimescaleUris(), (Strings{prefix + "f/gf", prefix + "c/gc", prefix + "a/ga",
                                                 prefix + "b/gb", prefix + "tr-8/gm-A"}));
  EXPECT_EQ(helpers.getFirstTrTimescaleUri(), prefix + "a/ga");
  EXPECT_EQ(helpers.getFirstTrGmId(), "ga");
}

TEST(TimescaleHelpers, ComposedOperationsGoThroughOverrides) {
  Service service;
  service.trList = "{\"timeReferences\":[\"x\"]}";
  struct Overriding : kosdtools::pendulo::TimescaleHelpers {
    using TimescaleHelpers::TimescaleHelpers;
    std::string getTrGmId(const std::string& trId) override { return "gm of " + trId; }
    std::string getTrType(const std::string&) override { return "IEEE 1588-2008 BC"; }
  } helpers(service.client);
  EXPECT_EQ(helpers.getFirstTrTimescaleUri(), "/quillon/timescales/pendulo/x/gm-of-x");
  EXPECT_EQ(helpers.getTimescaleUris(), Strings{"/quillon/timescales/pendulo/x/gm-of-x"});

  // A replacement that hands back another string makes that string the URI.
  struct Replacing : kosdtools::pendulo::TimescaleHelpers {
    using TimescaleHelpers::TimescaleHelpers;
    std::string getTrGmId(const std::string&) override { return "g m"; }
    std::string& replaceSpacesWithDashes(std::string&) override { return other; }
    std::string other = "elsewhere";
  } replacing(service.client);
  EXPECT_EQ(replacing.getTimescaleUri("x"), "elsewhere");

  kosdtools::pendulo::TimescaleHelpers plain(service.client);
  for (const char* text : {"", " ", "  a  b ", "no-space"}) {
    SCOPED_TRACE(text);
    std::string replaced = text;
    std::string expected = text;
    for (char& c : expected) c = c == ' ' ? '-' : c;
    EXPECT_EQ(plain.replaceSpacesWithDashes(replaced), expected);
  }
}

TEST(TimescaleHelpers, TrAttributeErrorsNameTheTrAndKeepTheServiceError) {
  Service service;
  kosdtools::pendulo::TimescaleHelpers helpers(service.client);
  struct Case {
    const char* what;
    const char* answer;  // null: the service throws `code`
    int32_t code;
    std::function<std::string()> read;
    std::string expected;
  };
  const auto type = [&] { return helpers.getTrType("t"); };
  const auto gm = [&] { return helpers.getTrGmId("t"); };
  const auto port = [&] { return helpers.getTrPortState("t"); };
  // Only the type reads name their key; the service's record is kept (`nested`) where replaced.
  const auto notFound = [](int line, const std::string& message, bool namesKey, int32_t nested) {
    return helperRecord("koapalerr_resourceNotFound", line,
                        "\"message\":\"The specified Pendulo Time Reference" + message +
                            "\",\"timeReferenceId\":\"t\"" +
                            (namesKey ? ",\"timeReferenceTypeKey\":\"type\"" : ""),
                        nested != 0 ? nestedServiceError(nested) : "");
  };
  const Case cases[] = {
      {"type not set", nullptr, kNotSet, type,
       notFound(214, " has not set a Time Reference Type", true, kNotSet)},
      {"type of unknown TR", nullptr, kNoTr, type, notFound(221, " does not exist.", true, kNoTr)},
      {"type null", "{\"type\":null}", 0, type, notFound(240, "'s Type is null.", true, 0)},
      {"type a number", "{\"type\":5}", 0, type,
       "{\"error_constant\":\"errCode\",\"file\":\"kosynctools_cjson/jsonHelperFunctions\","
       "\"line\":50,\"component\":\"quillon\",\"kosync_debug\":{\"message\":\"Error parsing: "
       "expected data type does not match the parsed value.\",\"JSON\":\"{\\\"type\\\":5}\","
       "\"key\":\"type\"}}"},
      {"gm not set", nullptr, kNotSet, gm,
       notFound(87, " has not set a Grandmaster ID.", false, kNotSet)},
      {"gm member missing", "{\"gm\":\"a\"}", 0, gm,
       helperRecord("koapalerr_invalidParameter", 106,
                    "\"message\":\"Failed to parse gmClockId key from gmIdJson.\","
                    "\"gmClockIdKey\":\"gmClockId\",\"gmIdJson\":\"{\\\"gm\\\":\\\"a\\\"}\"")},
      {"port in an array", "[{\"portState\":\"PTP_MASTER\"}]", 0, port,
       helperRecord("koapalerr_invalidParameter", 279,
                    "\"message\":\"Failed to parse portStateKey key from trStateJson.\","
                    "\"portStateKey\":\"portState\",\"trStateJson\":"
                    "\"[{\\\"portState\\\":\\\"PTP_MASTER\\\"}]\"")},
      {"port empty", "{\"portState\":\"\"}", 0, port,
       notFound(287, "'s Port State is null.", false, 0)},
      {"other service errors pass unchanged", nullptr, -1074100000, port,
       "{\"error_constant\":\"pdmErr\",\"file\":\"pdm/lib\",\"line\":3,\"component\":\"quillon\","
       "\"pdm_debug\":{\"m\":\"x\"}}"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.what);
    EXPECT_CALL(*service.client, getTrAttrJson("t", _, _))
        .WillOnce(Invoke([&](const std::string&, const std::string&, std::string* out) {
          if (c.answer == nullptr) Service::raiseServiceError(c.code);
          *out = c.answer;
        }));
    EXPECT_EQ(thrownBy([&] { (void)c.read(); }), c.expected);
  }
}

// An unparsable list and the older service's record are pinned end to end.
TEST(TimescaleHelpers, TrListsAreReadLenientlyButNeverGuessed) {
  Service service;
  kosdtools::pendulo::TimescaleHelpers helpers(service.client);
  const auto firstError = [](const std::string& list) {
    return helperRecord("koapalerr_invalidParameter", 160,
                        "\"message\":\"Failed to parse TR ID from TR list JSON or TR list is "
                        "empty.\",\"trListJson\":\"" + list + "\",\"trId\":\"timeReferences\"");
  };

  service.trList = "{\"timeReferences\":null}";
  EXPECT_TRUE(helpers.getTrIds().empty());
  EXPECT_EQ(thrownBy([&] { (void)helpers.getFirstTrId(); }),
            firstError("{\\\"timeReferences\\\":null}"));
  service.trList = "";
  EXPECT_EQ(thrownBy([&] { (void)helpers.getFirstTrId(); }), firstError(""));
  // The JSON layer's own records pass unchanged.
  service.trList = "{\"timeReferences\":\"a\"}";
  EXPECT_EQ(thrownBy([&] { (void)helpers.getTrIds(); }),
            "{\"error_constant\":\"jsonErrorsNotAnArray\",\"file\":\"kojsonlh/cJSONUtils\","
            "\"line\":83,\"component\":\"quillon\"}");
}

// The key list it splits with must match the URI's six parts exactly, or
// parsing fails (those records are the URI parser's own).
TEST(TimescaleHelpers, NormalizingDropsTheRemoteHostOnly) {
  Service service;
  kosdtools::pendulo::TimescaleHelpers helpers(service.client);
  EXPECT_EQ(helpers.normalizeTimescaleUri("/host/quillon/timescales/pendulo/tr 0/gm0/"),
            "/quillon/timescales/pendulo/tr 0/gm0");
}

}  // namespace
