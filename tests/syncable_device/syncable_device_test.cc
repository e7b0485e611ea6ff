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

// Storing and minifying over HTTP is checked by the end-to-end suite; the
// calls the service never makes are checked here.
TEST(SyncableDevice, RequirementsShapeTheDocumentUntilCleared) {
  SyncableDeviceActual device(kUri);
  device.setCoherencyRequirements(" {\n \"maxOffsetNanos\" : 1000, \"note\": \"a b\"}\t", "");
  EXPECT_EQ(device.toJson(), document("{\"maxOffsetNanos\":1000,\"note\":\"a b\"}", true));
  EXPECT_EQ(device.isCoherent(0), 1);
  EXPECT_EQ(device.isCoherent(100), 0);
  device.clearCoherencyRequirements("");
  EXPECT_EQ(device.toJson(), document("null", true));
}

// One row per refusal of the library; the old requirements stay.
TEST(SyncableDevice, BadRequirementsAndUrisFailWithTheLibraryRecord) {
  SyncableDeviceActual device(kUri);
  device.setCoherencyRequirements("{\"maxOffsetNanos\":100}", "");
  struct Case {
    const char* text;
    const char* message;
  } cases[] = {
      {"{\"a\":1} {}", "The coherency requirements are not valid JSON."},
      {"null", "The coherency requirements must be a JSON object."},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    EXPECT_EQ(failure([&] { device.setCoherencyRequirements(c.text, ""); }),
              std::string("-52005 koapalerr_invalidParameter: ") + c.message);
    EXPECT_EQ(device.toJson(), document("{\"maxOffsetNanos\":100}", false));
  }
  EXPECT_EQ(failure([] { SyncableDeviceActual unnamed(""); }),
            "-52005 koapalerr_invalidParameter: The device URI is missing or empty.");
}

}  // namespace
