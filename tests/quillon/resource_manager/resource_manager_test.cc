#include "quillon/resource_manager.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>


namespace {

using ::testing::Return;
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

// Which filters fetch what (the strict mocks refuse any other call); the
// exact listings over the real helpers are checked over HTTP.
TEST(ResourceListing, EveryFilterFetchesOnlyWhatItLists) {
  struct Case {
    const char* filter;
    Uris timescales;  // fetched when not empty
    std::string expected;
  } cases[] = {
      {"syncableDevices", {}, std::string("{\"version\":1,\"resources\":[{\"uri\":\"") + kDevice + "\"}]}"},
      {"SyncableDevices", {}, "{\"version\":1,\"resources\":[]}"},
      // URIs go out as they are, quotes and backslashes included.
      {"timescales", {"/a\"b", "c\\d"}, "{\"version\":1,\"resources\":[{\"uri\":\"/a\"b\"},{\"uri\":\"c\\d\"}]}"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.filter);
    Fixture f;
    if (c.filter == std::string("syncableDevices")) EXPECT_CALL(*f.device, getUri).WillOnce(Return(kDevice));
    if (!c.timescales.empty()) EXPECT_CALL(*f.helpers, getTimescaleUris).WillOnce(Return(c.timescales));
    EXPECT_EQ(f.manager.getResources(c.filter), c.expected);
  }
}

// The timescales are still fetched so that their errors would still leave.
TEST(ResourceListing, DeviceWithoutUriCutsTheDocument) {
  Fixture f;
  EXPECT_CALL(*f.device, getUri).WillOnce(Return(nullptr));
  EXPECT_CALL(*f.helpers, getTimescaleUris).WillOnce(Return(Uris{"T"}));
  EXPECT_EQ(f.manager.getResources(""), "{\"version\":1,\"resources\":[{\"uri\":\"");
}

// Found and unknown device URIs and unknown timescale URIs are checked over
// HTTP; these URIs are ones the helpers never list.
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

}  // namespace
