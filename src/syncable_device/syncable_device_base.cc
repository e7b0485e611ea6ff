#include "syncable_device/syncable_device_base.h"

#include <cstdlib>
#include <exception>
#include <memory>
#include <stdexcept>

#include "kosdlib/kosdlib.h"
#include "syncable_device/call_guard.h"

namespace kosdlib {
namespace wrapper {

SyncableDeviceBase::~SyncableDeviceBase() {
  if (handle_ != nullptr) kosdlib_SyncableDevice_delete(handle_);
}

void SyncableDeviceBase::setCoherencyRequirements(const std::string& first,
                                                  const std::string& second) {
  CallGuard guard;
  kosdlib_SyncableDevice_setCoherencyRequirements(handle_, first.c_str(), second.c_str(),
                                                  guard.record());
  guard.check();
}

void SyncableDeviceBase::clearCoherencyRequirements(const std::string& text) {
  CallGuard guard;
  kosdlib_SyncableDevice_clearCoherencyRequirements(handle_, text.c_str(), guard.record());
  guard.check();
}

int32_t SyncableDeviceBase::isCoherent(int32_t argument) {
  CallGuard guard;
  const int32_t answer = kosdlib_SyncableDevice_isCoherent(handle_, argument, guard.record());
  guard.check();
  return answer;
}

const char* SyncableDeviceBase::getUri() {
  CallGuard guard;
  const char* uri = kosdlib_SyncableDevice_getUri(handle_, guard.record());
  guard.check();
  return uri;
}

std::string SyncableDeviceBase::toJson() {
  CallGuard guard;
  // Owned before the check so that the library's text is freed on every path.
  std::unique_ptr<char, decltype(&std::free)> text(
      kosdlib_SyncableDevice_toJson(handle_, guard.record()), &std::free);
  guard.check();
  if (text == nullptr) {
    // No document and no reason: the string library's own refusal turns it
    // into an internal error instead of a success without a document. While
    // another exception unwinds nothing may be thrown, so it is empty then.
    if (std::uncaught_exceptions() == 0) {
      throw std::logic_error("basic_string: construction from null is not valid");
    }
    return std::string();
  }
  return std::string(text.get());
}

SyncableDeviceHandle SyncableDeviceBase::getHandle() { return handle_; }

SyncableDeviceHandle SyncableDeviceBase::getNativeHandle() { return handle_; }

}  // namespace wrapper
}  // namespace kosdlib
