// One device of the platform's syncable-device library: its URI, its JSON
// document and the coherency requirements a client hands it. Every library
// failure arrives as a thrown koerr::Exception carrying the library's own
// record; library warnings are dropped.
//
// Thread-safety: no state beyond the library handle; as thread-safe as the
// device library (the platform's is safe for concurrent calls).
#ifndef QUILLON_SYNCABLE_DEVICE_SYNCABLE_DEVICE_INTERFACE_H_
#define QUILLON_SYNCABLE_DEVICE_SYNCABLE_DEVICE_INTERFACE_H_

#include <cstdint>
#include <string>

struct kosdlib_SyncableDevice;

namespace kosdlib {
namespace wrapper {

using SyncableDeviceHandle = kosdlib_SyncableDevice*;

class SyncableDeviceInterface {
 public:
  virtual ~SyncableDeviceInterface() = default;

  // Hands both texts to the device unchanged; the library decides their syntax.
  virtual void setCoherencyRequirements(const std::string& first, const std::string& second) = 0;
  virtual void clearCoherencyRequirements(const std::string& text) = 0;
  // The library's answer for `argument`, unchanged.
  virtual int32_t isCoherent(int32_t argument) = 0;
  // The library's own text, valid while the device lives; copy it to keep it.
  virtual const char* getUri() = 0;
  // The device document exactly as the library renders it; throws
  // std::logic_error when the library gives no text and reports no error.
  virtual std::string toJson() = 0;
  virtual SyncableDeviceHandle getHandle() = 0;
  virtual SyncableDeviceHandle getNativeHandle() = 0;
};

}  // namespace wrapper
}  // namespace kosdlib

#endif  // QUILLON_SYNCABLE_DEVICE_SYNCABLE_DEVICE_INTERFACE_H_
