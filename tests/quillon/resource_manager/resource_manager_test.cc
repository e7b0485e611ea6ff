#include "quillon/resource_manager.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

#include "support/raised.h"

namespace {

using ::testing::Return;
using quillon::test_support::Raised;
using quillon::test_support::raisedBy;
using ::testing::StrictMock;
using Uris = std::vector<std::string>;

class MockHelpers : public kosdtools::pendulo::TimescaleHelpersInterface {
 public:
  MOCK_METHOD(std::string&, replaceSpacesWithDashes, (std::string&), (override));
  MOCK_METHOD(std::string, normalizeTimescaleUri, (const std::string&), (override));
  MOCK_METHOD(std::string, getTrGmId, (const std::string&), (override));
  MOCK_METHOD(std::string, getTimescaleUri, (const std::string&), (override));
  MOCK_METHOD(std::string, getFirstTrId, (), (override));
  MOCK_METHOD(std::string, getFirstTrTimescaleUri, (), (override));
  MOCK_METHOD(Uris, getTimescaleUris, (), (override));
  MOCK_METHOD(std::string, getFirstTrGmId, (), (override));
};

class MockDevice : public kosdlib::wrapper::SyncableDeviceInterface {
 public:
  MOCK_METHOD(void, setCoherencyRequirements, (const std::string&, const std::string&),
              (override));
  MOCK_METHOD(void, clearCoherencyRequirements, (const std::string&), (override));
  MOCK_METHOD(int32_t, isCoherent, (int32_t), (override));
  MOCK_METHOD(const char*, getUri, (), (override));
  MOCK_METHOD(std::string, toJson, (), (override));
  MOCK_METHOD(kosdlib::wrapper::SyncableDeviceHandle, getHandle, (), (override));
  MOCK_METHOD(kosdlib::wrapper::SyncableDeviceHandle, getNativeHandle, (), (override));
};

constexpr const char* kDevice = "/quillon/syncableDevices/pendulo/timekeeper/genericTk";

struct Fixture {
  std::shared_ptr<StrictMock<MockHelpers>> helpers = std::make_shared<StrictMock<MockHelpers>>();
  std::shared_ptr<StrictMock<MockDevice>> device = std::make_shared<StrictMock<MockDevice>>();
  quillon::ResourceManager manager{helpers, device};
};

// The not-found record raised at `line`, `members` (already JSON) in its debug object.
std::string notFound(int line, const std::string& members) {
  return "{\"error_constant\":\"koapalerr_resourceNotFound\",\"file\":\"quillon/ResourceManager\","
         "\"line\":" + std::to_string(line) + ",\"component\":\"quillon\",\"kosyncdomain_debug\":{" +
         members + "}}";
}

// Which filters fetch what; the exact listings over the real helpers are
// checked over HTTP by the end-to-end suite.
TEST(ResourceListing, EveryFilterFetchesOnlyWhatItLists) {
  const std::string d = std::string("{\"uri\":\"") + kDevice + "\"}";
  struct Case {
    const char* filter;
    bool fetchesTimescales;
    Uris timescales;
    std::string expected;
  } cases[] = {
      {"", true, {"T1", "T2"}, "{\"version\":1,\"resources\":[" + d + ",{\"uri\":\"T1\"},{\"uri\":\"T2\"}]}"},
      {"syncableDevices", false, {}, "{\"version\":1,\"resources\":[" + d + "]}"},
      {"SyncableDevices", false, {}, "{\"version\":1,\"resources\":[]}"},
      // URIs go out as they are, quotes and backslashes included.
      {"timescales", true, {"/a\"b", "c\\d"},
       "{\"version\":1,\"resources\":[{\"uri\":\"/a\"b\"},{\"uri\":\"c\\d\"}]}"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::string("filter '") + c.filter + "'");
    Fixture f;
    const bool device = c.filter == std::string() || c.filter == std::string("syncableDevices");
    ON_CALL(*f.device, getUri).WillByDefault(Return(kDevice));
    ON_CALL(*f.helpers, getTimescaleUris).WillByDefault(Return(c.timescales));
    EXPECT_CALL(*f.device, getUri).Times(device ? 1 : 0);
    EXPECT_CALL(*f.helpers, getTimescaleUris).Times(c.fetchesTimescales ? 1 : 0);
    EXPECT_EQ(f.manager.getResources(c.filter), c.expected);
  }
}

// The timescales are still fetched so that their errors would still leave.
TEST(ResourceListing, DeviceWithoutUriCutsTheDocument) {
  for (const char* filter : {"", "syncableDevices"}) {
    SCOPED_TRACE(filter);
    Fixture f;
    EXPECT_CALL(*f.device, getUri).WillOnce(Return(nullptr));
    ON_CALL(*f.helpers, getTimescaleUris).WillByDefault(Return(Uris{"T"}));
    EXPECT_CALL(*f.helpers, getTimescaleUris).Times(*filter ? 0 : 1);
    EXPECT_EQ(f.manager.getResources(filter), "{\"version\":1,\"resources\":[{\"uri\":\"");
  }
}

// The found device's reads and writes are checked over HTTP; any other URI,
// however close, is not found on either path.
TEST(DeviceResource, OnlyTheExactUriIsFoundForGetAndPut) {
  const std::string exact = kDevice;
  for (const std::string& wrong : {exact.substr(0, exact.size() - 1), std::string(),
                                   std::string("/QUILLON") + exact.substr(8)}) {
    SCOPED_TRACE(wrong);
    for (int line : {75, 127}) {
      Fixture f;
      EXPECT_CALL(*f.device, getUri).WillRepeatedly(Return(kDevice));
      const Raised raised = raisedBy([&] {
        if (line == 75) {
          (void)f.manager.getSyncableDevice(wrong);
        } else {
          f.manager.putSyncableDevice(wrong, "{}");
        }
      });
      EXPECT_EQ(raised.code, -52006);
      EXPECT_EQ(raised.record,
                notFound(line, "\"message\":\"Requested syncableDeviceUri does not exist on this "
                               "host.\",\"localDeviceUri\":\"" + wrong + "\",\"onlyDeviceUri\":\"" +
                                   exact + "\""));
    }
  }
}

TEST(TimescaleResource, FoundUriYieldsGrandmasterFromItsLastSegment) {
  struct Case {
    std::string uri;
    std::string grandmaster;
  } cases[] = {
      {"No-Slash-AB", "no:slash:ab"},
      {"/quillon/timescales/pendulo/tr0/", ""},
      {"/a/Aa:Bb-c\xC3\x84", "aa:bb:c\xC3\x84"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.uri);
    Fixture f;
    EXPECT_CALL(*f.helpers, getTimescaleUris).WillOnce(Return(Uris{"/first", c.uri, "/third"}));
    EXPECT_EQ(f.manager.getTimescale(c.uri), "{\"version\":1,\"uri\":\"" + c.uri +
                                                 "\",\"data\":{\"grandmasterId\":\"" +
                                                 c.grandmaster + "\"}}");
  }
}

TEST(TimescaleResource, UnknownUriListsTheCurrentOnesRaw) {
  struct Case {
    std::string requested;
    Uris current;
    std::string list;
  } cases[] = {
      {"/quillon/timescales/pendulo/TR0/gm", {"/quillon/timescales/pendulo/tr0/gm", "/x"},
       "[\"/quillon/timescales/pendulo/tr0/gm\",\"/x\"]"},
      {"/x", {}, "[]"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.requested);
    Fixture f;
    EXPECT_CALL(*f.helpers, getTimescaleUris).WillOnce(Return(c.current));
    const Raised raised = raisedBy([&] { (void)f.manager.getTimescale(c.requested); });
    EXPECT_EQ(raised.code, -52006);
    EXPECT_EQ(raised.record,
              notFound(98, "\"message\":\"Requested timescaleUri does not match any timescaleUri on "
                           "the system\",\"localTimescaleUri\":\"" + c.requested +
                               "\",\"currentTimescaleUris\":" + c.list));
  }
}

}  // namespace
