// The time keeper driven by the local time service, created through the
// device plug-in library.
//
// Thread-safety: see SyncableDeviceInterface.
#ifndef QUILLON_SYNCABLE_DEVICE_SYNCABLE_DEVICE_ACTUAL_H_
#define QUILLON_SYNCABLE_DEVICE_SYNCABLE_DEVICE_ACTUAL_H_

#include <string>

#include "syncable_device/syncable_device_base.h"

namespace kosdplugins {
namespace pendulo {
namespace wrapper {

class SyncableDeviceActual : public kosdlib::wrapper::SyncableDeviceBase {
 public:
  // Creates the device for `uri`; throws the library's record when it fails.
  explicit SyncableDeviceActual(const std::string& uri);
  ~SyncableDeviceActual() override;
};

}  // namespace wrapper
}  // namespace pendulo
}  // namespace kosdplugins

#endif  // QUILLON_SYNCABLE_DEVICE_SYNCABLE_DEVICE_ACTUAL_H_
