// The device core shared by every device plug-in: a URI fixed at creation and
// a requirements text guarded by a mutex, so concurrent readers always see a
// whole document. Accepted requirements reach the state file before the call
// returns, so a client told "stored" is never told otherwise after a crash.
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <mutex>
#include <new>
#include <string>

#include "error_record/error.h"
#include "error_record/json_text.h"
#include "kosdlib/kosdlib.h"
#include "src/requirements.h"
#include "src/requirements_store.h"

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

void reportNotSaved(kosdlib_Status* status, int32_t line, const kosdlib::FileFailure& failure) {
  koerr::Report(*status, koerr::koapalerr_osFault, kFile, line)
      .open(kChannel)
      .add("message",
           "The coherency requirements cannot be saved; the previous ones stay in force.")
      .add("stateFile", failure.file)
      .add("systemCall", failure.call)
      .add("systemError", std::strerror(failure.error))
      .close();
}

// The device's distance from its timescale, when it is known.
struct Offset {
  bool known;
  int64_t nanos;
};

// No bound sets no limit; an offset nobody knows meets none.
bool withinBound(const Offset& offset, bool bounded, int64_t bound) {
  if (!offset.known) return false;
  if (!bounded) return true;
  // The magnitude as unsigned, so that the most negative offset has one too.
  const uint64_t magnitude = offset.nanos < 0 ? 0 - static_cast<uint64_t>(offset.nanos)
                                              : static_cast<uint64_t>(offset.nanos);
  return magnitude <= static_cast<uint64_t>(bound);
}

void logToHost(const std::string& line) { std::fprintf(stderr, "%s\n", line.c_str()); }

}  // namespace

struct kosdlib_SyncableDevice {
  std::string uri;
  std::string kind;
  std::mutex mutex;
  kosdlib::Requirements requirements;  // text "" when none
  std::mutex saveMutex;  // held across a save and the swap that follows it
  std::unique_ptr<kosdlib::RequirementsStore> store;  // null: nothing is kept
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
    std::unique_ptr<kosdlib_SyncableDevice> device(new kosdlib_SyncableDevice);
    device->uri = uri;
    device->kind = kind;
    const std::string directory = kosdlib::stateDirectoryFromEnvironment();
    if (!directory.empty()) {
      std::string problem;
      device->store = kosdlib::RequirementsStore::open(
          std::make_shared<kosdlib::PosixFileSystem>(), directory, uri, &problem);
      if (!device->store) {
        reportInvalid(status, __LINE__, problem.c_str());
        return nullptr;
      }
      if (auto stored = device->store->load(logToHost)) device->requirements = std::move(*stored);
    }
    return device.release();
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
  try {
    kosdlib::Requirements accepted;
    kosdlib::RequirementsProblem problem;
    if (!kosdlib::parseRequirements(requirements, &accepted, &problem)) {
      koerr::Report(*status, koerr::koapalerr_invalidParameter, kFile, __LINE__)
          .open(kChannel)
          .add("message", problem.message)
          .addUInt("errorOffset", static_cast<uint32_t>(problem.offset))
          .close();
      return;
    }
    std::lock_guard<std::mutex> saving(device->saveMutex);
    kosdlib::FileFailure failure;
    if (device->store && !device->store->save(&accepted, &failure)) {
      return reportNotSaved(status, __LINE__, failure);
    }
    std::lock_guard<std::mutex> lock(device->mutex);
    std::swap(device->requirements, accepted);
  } catch (const std::bad_alloc&) {
    reportMemoryFull(status, __LINE__, "kosdlib_SyncableDevice_setCoherencyRequirements");
  }
}

void kosdlib_SyncableDevice_clearCoherencyRequirements(kosdlib_SyncableDeviceHandle device,
                                                       const char* /*scope*/,
                                                       kosdlib_Status* status) {
  if (status == nullptr) return;
  if (device == nullptr) return reportInvalid(status, __LINE__, "The device handle is null.");
  try {
    std::lock_guard<std::mutex> saving(device->saveMutex);
    kosdlib::FileFailure failure;
    if (device->store && !device->store->save(nullptr, &failure)) {
      return reportNotSaved(status, __LINE__, failure);
    }
    kosdlib::Requirements dropped;
    std::lock_guard<std::mutex> lock(device->mutex);
    std::swap(device->requirements, dropped);
  } catch (const std::bad_alloc&) {
    reportMemoryFull(status, __LINE__, "kosdlib_SyncableDevice_clearCoherencyRequirements");
  }
}

int32_t kosdlib_SyncableDevice_isCoherent(kosdlib_SyncableDeviceHandle device,
                                          int32_t maxOffsetNanos, kosdlib_Status* status) {
  if (status == nullptr) return -1;
  if (device == nullptr) {
    reportInvalid(status, __LINE__, "The device handle is null.");
    return -1;
  }
  const Offset offset = currentOffset(device);
  if (maxOffsetNanos > 0) return withinBound(offset, true, maxOffsetNanos) ? 1 : 0;
  std::lock_guard<std::mutex> lock(device->mutex);
  const kosdlib::Requirements& stored = device->requirements;
  return withinBound(offset, stored.bounded, stored.maxOffsetNanos) ? 1 : 0;
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
      const kosdlib::Requirements& stored = device->requirements;
      text += stored.text.empty() ? "null" : stored.text;
      coherent = withinBound(offset, stored.bounded, stored.maxOffsetNanos);
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
