// The wrapper over the real device library: documents, requirements and the
// library's own failure records.
#include <cJSON.h>
#include <gtest/gtest.h>

#include <functional>
#include <string>

#include "error_record/exception.h"
#include "support/raised.h"
#include "syncable_device/syncable_device_actual.h"

namespace {

using kosdplugins::pendulo::wrapper::SyncableDeviceActual;

constexpr const char* kUri = "/quillon/syncableDevices/pendulo/timekeeper/genericTk";

std::string document(const std::string& requirements, bool coherent) {
  return std::string("{\"uri\":\"") + kUri + "\",\"coherencyRequirements\":" + requirements +
         ",\"plugin\":\"pendulo\",\"coherent\":" + (coherent ? "true" : "false") +
         ",\"offsetNanos\":250}";
}

// "code constant: message" of the record `call` raises.
std::string failure(const std::function<void()>& call) {
  const auto raised = quillon::test_support::raisedBy(call);
  cJSON* root = cJSON_Parse(raised.record.c_str());
  const cJSON* debug = cJSON_GetObjectItemCaseSensitive(root, "kosdlib_debug");
  const cJSON* message = cJSON_GetObjectItemCaseSensitive(debug, "message");
  const cJSON* constant = cJSON_GetObjectItemCaseSensitive(root, "error_constant");
  std::string out = std::to_string(raised.code) + " " +
                    (cJSON_IsString(constant) ? constant->valuestring : "?") + ": " +
                    (cJSON_IsString(message) ? message->valuestring : "?");
  cJSON_Delete(root);
  return out;
}

TEST(SyncableDevice, RequirementsAreStoredMinifiedAndShapeTheDocument) {
  SyncableDeviceActual device(kUri);
  EXPECT_EQ(device.toJson(), document("null", true));

  device.setCoherencyRequirements(" {\n \"maxOffsetNanos\" : 1000, \"note\": \"a b\"}\t", "");
  EXPECT_EQ(device.toJson(), document("{\"maxOffsetNanos\":1000,\"note\":\"a b\"}", true));
  EXPECT_EQ(device.isCoherent(0), 1);
  EXPECT_EQ(device.isCoherent(100), 0);

  device.setCoherencyRequirements("{\"maxOffsetNanos\":100}", "");
  EXPECT_EQ(device.toJson(), document("{\"maxOffsetNanos\":100}", false));
  EXPECT_EQ(device.isCoherent(0), 0);
  EXPECT_EQ(device.isCoherent(250), 1);

  device.clearCoherencyRequirements("");
  EXPECT_EQ(device.toJson(), document("null", true));
}

TEST(SyncableDevice, BadRequirementsFailWithTheLibraryRecordAndKeepTheOldOnes) {
  SyncableDeviceActual device(kUri);
  device.setCoherencyRequirements("{\"maxOffsetNanos\":1000}", "");
  struct Case {
    const char* text;
    const char* message;
  } cases[] = {
      {"", "The coherency requirements are not valid JSON."},
      {"maxOffsetNanos=1", "The coherency requirements are not valid JSON."},
      {"{\"a\":1} {}", "The coherency requirements are not valid JSON."},
      {"{\"a\":", "The coherency requirements are not valid JSON."},
      {"[{\"a\":1}]", "The coherency requirements must be a JSON object."},
      {"\"{}\"", "The coherency requirements must be a JSON object."},
      {"null", "The coherency requirements must be a JSON object."},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    EXPECT_EQ(failure([&] { device.setCoherencyRequirements(c.text, ""); }),
              std::string("-52005 koapalerr_invalidParameter: ") + c.message);
    EXPECT_EQ(device.toJson(), document("{\"maxOffsetNanos\":1000}", true));
  }
}

TEST(SyncableDevice, CreationFailureThrowsAndUrisAreEscapedInTheDocument) {
  EXPECT_EQ(failure([] { SyncableDeviceActual device(""); }),
            "-52005 koapalerr_invalidParameter: The device URI is missing or empty.");
  SyncableDeviceActual odd("/a\"b\\c\x01");
  cJSON* root = cJSON_Parse(odd.toJson().c_str());
  ASSERT_NE(root, nullptr);
  EXPECT_STREQ(cJSON_GetObjectItemCaseSensitive(root, "uri")->valuestring, "/a\"b\\c\x01");
  cJSON_Delete(root);
}

}  // namespace
