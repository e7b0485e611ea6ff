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

// "code constant: message @offset" of the record `call` raises.
std::string failure(const std::function<void()>& call) {
  const auto raised = quillon::test_support::raisedBy(call);
  cJSON* root = cJSON_Parse(raised.record.c_str());
  const cJSON* debug = cJSON_GetObjectItemCaseSensitive(root, "kosdlib_debug");
  const cJSON* message = cJSON_GetObjectItemCaseSensitive(debug, "message");
  const cJSON* offset = cJSON_GetObjectItemCaseSensitive(debug, "errorOffset");
  const cJSON* constant = cJSON_GetObjectItemCaseSensitive(root, "error_constant");
  std::string out = std::to_string(raised.code) + " " +
                    (cJSON_IsString(constant) ? constant->valuestring : "?") + ": " +
                    (cJSON_IsString(message) ? message->valuestring : "?");
  if (cJSON_IsNumber(offset)) out += " @" + std::to_string(offset->valueint);
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

// One row per refusal; the old requirements stay in force.
TEST(SyncableDevice, RequirementsAreOneStrictObjectWithAnIntegerBound) {
  SyncableDeviceActual device(kUri);
  device.setCoherencyRequirements("{\"maxOffsetNanos\":100}", "");
  const std::string bound =
      "The coherency requirements' \"maxOffsetNanos\" must be an integer from 0 to "
      "9223372036854775807.";
  const std::string json = "The coherency requirements are not valid JSON: ";
  const std::string large = "The coherency requirements hold a number too large to read: ";
  struct Case {
    const char* text;
    std::string message;
    int offset;
  } cases[] = {
      {"{\"a\":1} {}", json + "end of file expected.", 9},
      {"", json + "unexpected token.", 0},
      {"null", "The coherency requirements must be a JSON object.", 0},
      {" [1]", "The coherency requirements must be a JSON object.", 1},
      {"\xEF\xBB\xBF{}", "The coherency requirements begin with a byte-order mark.", 0},
      {"{\"a\":\"x\x01y\"}", json + "control character 0x1.", 7},
      {"{\"a\":\"\xff\"}", json + "unable to decode byte 0xff.", 6},
      {"{\"b\":[{\"c\":1,\"c\":2}]}", json + "duplicate object key.", 16},
      {"{\"maxOffsetNanos\":9223372036854775808}", large + "too big integer.", 37},
      {"{\"maxOffsetNanos\":1e999}", large + "real number overflow.", 23},
      {"{\"maxOffsetNanos\":-1}", bound, 18},
      {"{\"maxOffsetNanos\":null}", bound, 18},
      {"{\"maxOffsetNanos\":\"1\"}", bound, 18},
      {"{\"maxOffsetNanos\":[1]}", bound, 18},
      {"{\"maxOffsetNanos\":1.5}", bound, 18},
      {"{\"maxOffsetNanos\":1e-999}", bound, 18},
      {"{\"maxOffsetNanos\":1.0}", bound, 18},
      // Nested members and strings do not count; escaped names do.
      {"{\"a\":{\"maxOffsetNanos\":1},\"s\":\"\\\",\\\"maxOffsetNanos\\\":\", "
       "\"max\\u004FffsetNanos\" :\t-5}",
       bound, 80},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    EXPECT_EQ(failure([&] { device.setCoherencyRequirements(c.text, ""); }),
              "-52005 koapalerr_invalidParameter: " + c.message + " @" + std::to_string(c.offset));
    EXPECT_EQ(device.toJson(), document("{\"maxOffsetNanos\":100}", false));
  }
  EXPECT_EQ(failure([] { SyncableDeviceActual unnamed(""); }),
            "-52005 koapalerr_invalidParameter: The device URI is missing or empty.");
}

// The bounds at both ends of the range, and text that is valid however odd.
TEST(SyncableDevice, BoundsAtTheEdgesAreKept) {
  SyncableDeviceActual device(kUri);
  const struct {
    const char* text;
    const char* stored;
    bool coherent;
  } cases[] = {
      {"{\"maxOffsetNanos\":0}", "{\"maxOffsetNanos\":0}", false},
      {"{\"maxOffsetNanos\":250}", "{\"maxOffsetNanos\":250}", true},
      {"{\"maxOffsetNanos\":249}", "{\"maxOffsetNanos\":249}", false},
      {"{\"maxOffsetNanos\":9223372036854775807}", "{\"maxOffsetNanos\":9223372036854775807}",
       true},
      {"{ \"n\" : \"\\u0000 \\u00e9\" , \"maxOffsetNanos\" : 7 }",
       "{\"n\":\"\\u0000 \\u00e9\",\"maxOffsetNanos\":7}", false},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.text);
    device.setCoherencyRequirements(c.text, "");
    EXPECT_EQ(device.toJson(), document(c.stored, c.coherent));
  }
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
