#include "syncable_device/syncable_device_actual.h"

#include "kosdlib/kosdlib.h"
#include "syncable_device/call_guard.h"

namespace kosdplugins {
namespace pendulo {
namespace wrapper {

using kosdlib::wrapper::SyncableDeviceHandle;

SyncableDeviceActual::SyncableDeviceActual(const std::string& uri) {
  kosdlib::wrapper::CallGuard guard;
  SyncableDeviceHandle created =
      kosdplugins_pendulo_SyncableDeviceActual_create(uri.c_str(), guard.record());
  // Stored only once creation succeeded: a failed device never reaches the
  // base destructor's delete (the library returns no handle on failure).
  guard.check();
  handle_ = created;
}

SyncableDeviceActual::~SyncableDeviceActual() = default;

}  // namespace wrapper
}  // namespace pendulo
}  // namespace kosdplugins
