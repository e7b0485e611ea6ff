// A device of the syncable-device library held by its handle, which this
// object owns and deletes exactly once.
//
// Thread-safety: see SyncableDeviceInterface.
#ifndef QUILLON_SYNCABLE_DEVICE_SYNCABLE_DEVICE_BASE_H_
#define QUILLON_SYNCABLE_DEVICE_SYNCABLE_DEVICE_BASE_H_

#include "syncable_device/syncable_device_interface.h"

namespace kosdlib {
namespace wrapper {

class SyncableDeviceBase : public SyncableDeviceInterface {
 public:
  SyncableDeviceBase(const SyncableDeviceBase&) = delete;
  SyncableDeviceBase& operator=(const SyncableDeviceBase&) = delete;
  ~SyncableDeviceBase() override;

  void setCoherencyRequirements(const std::string& first, const std::string& second) override;
  void clearCoherencyRequirements(const std::string& text) override;
  int32_t isCoherent(int32_t argument) override;
  const char* getUri() override;
  std::string toJson() override;
  SyncableDeviceHandle getHandle() override;
  SyncableDeviceHandle getNativeHandle() override;

 protected:
  SyncableDeviceBase() = default;
  // Subclasses create the handle in their constructor and store it here.
  SyncableDeviceHandle handle_ = nullptr;
};

}  // namespace wrapper
}  // namespace kosdlib

#endif  // QUILLON_SYNCABLE_DEVICE_SYNCABLE_DEVICE_BASE_H_
