// The device core shared by every device plug-in: a URI fixed at creation and
// a requirements text guarded by a mutex, so concurrent readers always see a
// whole document.
#include <cJSON.h>

#include <cstdlib>
#include <cstring>
#include <mutex>
#include <new>
#include <string>

#include "error_record/error.h"
#include "error_record/json_text.h"
#include "kosdlib/kosdlib.h"

namespace {

constexpr const char* kFile = "kosdlib/SyncableDevice";
constexpr const char* kChannel = "kosdlib_debug";
// The simulated clock keeps this distance from its timescale.
constexpr int64_t kSimulatedOffsetNanos = 250;

void reportInvalid(kosdlib_Status* status, int32_t line, const char* message) {
  koerr::Report(*status, koerr::koapalerr_invalidParameter, kFile, line)
      .open(kChannel).add("message", message).close();
}

void reportMemoryFull(kosdlib_Status* status, int32_t line, const char* function) {
  koerr::Report(*status, koerr::koapalerr_memoryFull, kFile, line)
      .open(kChannel).add("message", "Out of memory.").add("function", function).close();
}

// The bound that the stored requirements set, or 0 when they set none.
int64_t requiredMaxOffset(const std::string& requirements) {
  if (requirements.empty()) return 0;
  cJSON* root = cJSON_Parse(requirements.c_str());
  const cJSON* bound = cJSON_GetObjectItemCaseSensitive(root, "maxOffsetNanos");
  const int64_t value = cJSON_IsNumber(bound) ? static_cast<int64_t>(bound->valuedouble) : 0;
  cJSON_Delete(root);
  return value;
}

// The device's distance from its timescale, when it is known.
struct Offset {
  bool known;
  int64_t nanos;
};

// A bound of 0 or less sets no limit; an offset nobody knows meets none.
bool withinBound(const Offset& offset, int64_t bound) {
  if (!offset.known) return false;
  if (bound <= 0) return true;
  // The magnitude as unsigned, so that the most negative offset has one too.
  const uint64_t magnitude = offset.nanos < 0 ? 0 - static_cast<uint64_t>(offset.nanos)
                                              : static_cast<uint64_t>(offset.nanos);
  return magnitude <= static_cast<uint64_t>(bound);
}

}  // namespace

struct kosdlib_SyncableDevice {
  std::string uri;
  std::string kind;
  std::mutex mutex;
  std::string requirements;  // minified JSON object, "" when none
  kosdlib_OffsetSource offsetSource = nullptr;  // null: the simulated clock
  void* offsetContext = nullptr;
};

namespace {

// Asked outside the device's mutex: a source may take its time to answer.
Offset currentOffset(kosdlib_SyncableDeviceHandle device) {
  kosdlib_OffsetSource source;
  void* context;
  {
    std::lock_guard<std::mutex> lock(device->mutex);
    source = device->offsetSource;
    context = device->offsetContext;
  }
  if (source == nullptr) return {true, kSimulatedOffsetNanos};
  int64_t nanos = 0;
  return source(context, &nanos) == 1 ? Offset{true, nanos} : Offset{false, 0};
}

}  // namespace

kosdlib_SyncableDeviceHandle kosdlib_SyncableDevice_create(const char* uri, const char* kind,
                                                           kosdlib_Status* status) {
  if (status == nullptr) return nullptr;
  if (uri == nullptr || *uri == '\0') {
    reportInvalid(status, __LINE__, "The device URI is missing or empty.");
    return nullptr;
  }
  if (kind == nullptr) {
    reportInvalid(status, __LINE__, "The device plug-in name is missing.");
    return nullptr;
  }
  try {
    auto* device = new kosdlib_SyncableDevice;
    device->uri = uri;
    device->kind = kind;
    return device;
  } catch (const std::bad_alloc&) {
    reportMemoryFull(status, __LINE__, "kosdlib_SyncableDevice_create");
    return nullptr;
  }
}

void kosdlib_SyncableDevice_delete(kosdlib_SyncableDeviceHandle device) {
  delete device;
}

void kosdlib_SyncableDevice_setCoherencyRequirements(kosdlib_SyncableDeviceHandle device,
                                                     const char* requirements,
                                                     const char* /*scope*/,
                                                     kosdlib_Status* status) {
  if (status == nullptr) return;
  if (device == nullptr) return reportInvalid(status, __LINE__, "The device handle is null.");
  if (requirements == nullptr) {
    return reportInvalid(status, __LINE__, "The coherency requirements are missing.");
  }
  // Trailing text after the object counts as malformed, not as ignorable.
  const char* end = nullptr;
  cJSON* root = cJSON_ParseWithOpts(requirements, &end, 1);
  const bool parsed = root != nullptr;
  const bool isObject = cJSON_IsObject(root);
  cJSON_Delete(root);
  if (!parsed) {
    koerr::Report(*status, koerr::koapalerr_invalidParameter, kFile, __LINE__)
        .open(kChannel)
        .add("message", "The coherency requirements are not valid JSON.")
        .addUInt("errorOffset", end ? static_cast<uint32_t>(end - requirements) : 0u)
        .close();
    return;
  }
  if (!isObject) {
    return reportInvalid(status, __LINE__, "The coherency requirements must be a JSON object.");
  }
  try {
    std::string minified(requirements);
    cJSON_Minify(&minified[0]);
    minified.resize(std::strlen(minified.c_str()));
    std::lock_guard<std::mutex> lock(device->mutex);
    device->requirements.swap(minified);
  } catch (const std::bad_alloc&) {
    reportMemoryFull(status, __LINE__, "kosdlib_SyncableDevice_setCoherencyRequirements");
  }
}

void kosdlib_SyncableDevice_clearCoherencyRequirements(kosdlib_SyncableDeviceHandle device,
                                                       const char* /*scope*/,
                                                       kosdlib_Status* status) {
  if (status == nullptr) return;
  if (device == nullptr) return reportInvalid(status, __LINE__, "The device handle is null.");
  std::string dropped;
  std::lock_guard<std::mutex> lock(device->mutex);
  device->requirements.swap(dropped);
}

int32_t kosdlib_SyncableDevice_isCoherent(kosdlib_SyncableDeviceHandle device,
                                          int32_t maxOffsetNanos, kosdlib_Status* status) {
  if (status == nullptr) return -1;
  if (device == nullptr) {
    reportInvalid(status, __LINE__, "The device handle is null.");
    return -1;
  }
  const Offset offset = currentOffset(device);
  if (maxOffsetNanos > 0) return withinBound(offset, maxOffsetNanos) ? 1 : 0;
  std::lock_guard<std::mutex> lock(device->mutex);
  return withinBound(offset, requiredMaxOffset(device->requirements)) ? 1 : 0;
}

void kosdlib_SyncableDevice_setOffsetSource(kosdlib_SyncableDeviceHandle device,
                                            kosdlib_OffsetSource source, void* context,
                                            kosdlib_Status* status) {
  if (status == nullptr) return;
  if (device == nullptr) return reportInvalid(status, __LINE__, "The device handle is null.");
  std::lock_guard<std::mutex> lock(device->mutex);
  device->offsetSource = source;
  device->offsetContext = context;
}

const char* kosdlib_SyncableDevice_getUri(kosdlib_SyncableDeviceHandle device,
                                          kosdlib_Status* status) {
  if (status == nullptr) return nullptr;
  if (device == nullptr) {
    reportInvalid(status, __LINE__, "The device handle is null.");
    return nullptr;
  }
  return device->uri.c_str();
}

char* kosdlib_SyncableDevice_toJson(kosdlib_SyncableDeviceHandle device, kosdlib_Status* status) {
  if (status == nullptr) return nullptr;
  if (device == nullptr) {
    reportInvalid(status, __LINE__, "The device handle is null.");
    return nullptr;
  }
  const Offset offset = currentOffset(device);
  try {
    std::string text;
    text.reserve(160 + device->uri.size());
    text += "{\"uri\":\"";
    koerr::appendJsonEscaped(text, device->uri);
    text += "\",\"coherencyRequirements\":";
    bool coherent;
    {
      std::lock_guard<std::mutex> lock(device->mutex);
      text += device->requirements.empty() ? "null" : device->requirements;
      coherent = withinBound(offset, requiredMaxOffset(device->requirements));
    }
    text += ",\"plugin\":\"";
    koerr::appendJsonEscaped(text, device->kind);
    text += "\",\"coherent\":";
    text += coherent ? "true" : "false";
    text += ",\"offsetNanos\":";
    text += offset.known ? std::to_string(offset.nanos) : "null";
    text += '}';
    char* out = static_cast<char*>(std::malloc(text.size() + 1));
    if (out == nullptr) throw std::bad_alloc();
    std::memcpy(out, text.c_str(), text.size() + 1);
    return out;
  } catch (const std::bad_alloc&) {
    reportMemoryFull(status, __LINE__, "kosdlib_SyncableDevice_toJson");
    return nullptr;
  }
}
