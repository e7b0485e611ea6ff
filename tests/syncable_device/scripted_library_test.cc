// The wrapper over a scripted device library: this executable defines the
// library's functions itself, so every answer and failure can be chosen.
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

#include "error_record/error.h"
#include "kosdlib/kosdlib.h"
#include "syncable_device/syncable_device_actual.h"

namespace {

using kosdplugins::pendulo::wrapper::SyncableDeviceActual;

struct Script {
  int32_t code = 0;             // what the next guarded call reports
  const char* text = nullptr;   // what toJson returns (malloc'd copy), or null
  std::vector<kosdlib_SyncableDeviceHandle> deleted;
} script;

int handleStorage;
const auto kHandle = reinterpret_cast<kosdlib_SyncableDeviceHandle>(&handleStorage);

void report(kosdlib_Status* status) {
  if (script.code == 0) return;
  koerr::Report(*status, script.code, "libError", "lib/file", 9)
      .open("lib_debug")
      .add("k", "v")
      .close();
}

// The outcome of toJson: its text, or "code|record" / "logic_error|what".
std::string toJsonOutcome(SyncableDeviceActual& device) {
  try {
    return device.toJson();
  } catch (const koerr::Exception& e) {
    return std::to_string(e.code()) + "|" + e.what();
  } catch (const std::logic_error& e) {
    return std::string("logic_error|") + e.what();
  }
}

struct ToJsonWhileUnwinding {
  ~ToJsonWhileUnwinding() { answer = device.toJson(); }
  SyncableDeviceActual& device;
  std::string& answer;
};

TEST(ScriptedDeviceLibrary, ToJsonFreesTheTextOnEveryPathAndNeverReturnsNoDocument) {
  script = Script{};
  SyncableDeviceActual device("/d");
  const std::string record =
      "{\"error_constant\":\"libError\",\"file\":\"lib/file\",\"line\":9,\"component\":\"quillon\","
      "\"lib_debug\":{\"k\":\"v\"}}";
  struct Case {
    int32_t code;
    const char* text;
    std::string expected;
  } cases[] = {
      {0, "{\"a\":1}", "{\"a\":1}"},
      {5, "{\"a\":1}", "{\"a\":1}"},  // a warning is dropped, its text freed
      {-52000, "{\"a\":1}", "-52000|" + record},  // ASan reports the text if it is not freed
      {-52000, nullptr, "-52000|" + record},
      {0, nullptr, "logic_error|basic_string: construction from null is not valid"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.expected);
    script.code = c.code;
    script.text = c.text;
    EXPECT_EQ(toJsonOutcome(device), c.expected);
  }
  for (const char* text : {"{\"a\":1}", static_cast<const char*>(nullptr)}) {
    SCOPED_TRACE(text ? text : "null");
    script.code = -52000;
    script.text = text;
    std::string answer = "unset";
    try {
      ToJsonWhileUnwinding call{device, answer};
      throw std::runtime_error("first");
    } catch (const std::runtime_error& e) {
      EXPECT_STREQ(e.what(), "first");
    }
    EXPECT_EQ(answer, text ? text : "");
  }
}

TEST(ScriptedDeviceLibrary, TheCreatedHandleIsDeletedExactlyOnceAndAFailedOneNever) {
  script = Script{};
  script.code = 3;  // a warning at creation is no failure
  std::shared_ptr<kosdlib::wrapper::SyncableDeviceInterface> device =
      std::make_shared<SyncableDeviceActual>("/d");
  EXPECT_EQ(device->getHandle(), kHandle);
  device.reset();
  EXPECT_EQ(script.deleted, std::vector<kosdlib_SyncableDeviceHandle>{kHandle});

  script = Script{};
  script.code = -52005;
  EXPECT_THROW(SyncableDeviceActual("/d"), koerr::Exception);
  EXPECT_TRUE(script.deleted.empty());
}

}  // namespace

extern "C" {
kosdlib_SyncableDeviceHandle kosdplugins_pendulo_SyncableDeviceActual_create(
    const char* uri, kosdlib_Status* status) {
  EXPECT_STREQ(uri, "/d");
  report(status);
  return kHandle;
}
void kosdlib_SyncableDevice_delete(kosdlib_SyncableDeviceHandle device) {
  script.deleted.push_back(device);
}
char* kosdlib_SyncableDevice_toJson(kosdlib_SyncableDeviceHandle device, kosdlib_Status* status) {
  EXPECT_EQ(device, kHandle);
  report(status);
  return script.text ? strdup(script.text) : nullptr;
}
}
