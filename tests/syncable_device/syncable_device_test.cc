// The wrapper over the real device library: documents, requirements and the
// library's own failure records.
#include <cJSON.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <cstdlib>
#include <functional>
#include <string>

#include "error_record/exception.h"
#include "support/raised.h"
#include "kosdlib/kosdlib.h"
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

// What a live time service tells the time keeper: an offset, or nothing.
struct SourceAnswer {
  bool known;
  int64_t nanos;
};

int answer(void* context, int64_t* offsetNanos) {
  const auto* source = static_cast<const SourceAnswer*>(context);
  *offsetNanos = source->nanos;
  return source->known ? 1 : 0;
}

TEST(SyncableDevice, AnOffsetSourceDecidesOffsetAndCoherence) {
  koerr::Status status;
  kosdlib_SyncableDeviceHandle device = kosdlib_SyncableDevice_create(kUri, "pendulo", &status);
  ASSERT_NE(device, nullptr);
  kosdlib_SyncableDevice_setCoherencyRequirements(device, "{\"maxOffsetNanos\":1000}", "",
                                                  &status);
  const struct {
    SourceAnswer source;
    const char* tail;  // the document after the requirements
    int32_t coherentWithin10;
  } cases[] = {
      {{true, -1000}, "\"coherent\":true,\"offsetNanos\":-1000}", 0},
      {{true, 1001}, "\"coherent\":false,\"offsetNanos\":1001}", 0},
      {{true, -7}, "\"coherent\":true,\"offsetNanos\":-7}", 1},
      {{true, INT64_MIN}, "\"coherent\":false,\"offsetNanos\":-9223372036854775808}", 0},
      {{false, 0}, "\"coherent\":false,\"offsetNanos\":null}", 0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.tail);
    SourceAnswer source = c.source;
    kosdlib_SyncableDevice_setOffsetSource(device, answer, &source, &status);
    char* text = kosdlib_SyncableDevice_toJson(device, &status);
    ASSERT_NE(text, nullptr);
    EXPECT_EQ(std::string(text), std::string("{\"uri\":\"") + kUri +
                                     "\",\"coherencyRequirements\":{\"maxOffsetNanos\":1000},"
                                     "\"plugin\":\"pendulo\"," + c.tail);
    std::free(text);
    EXPECT_EQ(kosdlib_SyncableDevice_isCoherent(device, 10, &status), c.coherentWithin10);
    // Without a stored bound any known offset is coherent, an unknown one not.
    kosdlib_SyncableDevice_clearCoherencyRequirements(device, "", &status);
    EXPECT_EQ(kosdlib_SyncableDevice_isCoherent(device, 0, &status), c.source.known ? 1 : 0);
    kosdlib_SyncableDevice_setCoherencyRequirements(device, "{\"maxOffsetNanos\":1000}", "",
                                                    &status);
  }
  // Taking the source away brings the simulated clock back.
  kosdlib_SyncableDevice_setOffsetSource(device, nullptr, nullptr, &status);
  EXPECT_EQ(kosdlib_SyncableDevice_isCoherent(device, 250, &status), 1);
  EXPECT_EQ(status.code, 0);
  kosdlib_SyncableDevice_delete(device);
}

}  // namespace
