// The resources of this host: the one local syncable device, which this
// object creates and owns, and the timescales, asked of the timescale helpers
// afresh on every call.
//
// Thread-safety: fields are fixed after construction; calls only read them,
// so any number of request threads may share one manager.
#ifndef QUILLON_QUILLON_RESOURCE_MANAGER_H_
#define QUILLON_QUILLON_RESOURCE_MANAGER_H_

#include <memory>
#include <string>

#include "kosdtools_timescales/timescale_helpers_interface.h"
#include "quillon/resource_manager_interface.h"
#include "syncable_device/syncable_device_interface.h"

namespace quillon {

// The URI of the local time keeper, the only syncable device on a host.
inline constexpr const char* kLocalDeviceUri =
    "/quillon/syncableDevices/pendulo/timekeeper/genericTk";

class ResourceManager : public ResourceManagerInterface {
 public:
  // Creates the local device; its creation error leaves the constructor.
  explicit ResourceManager(
      const std::shared_ptr<kosdtools::pendulo::TimescaleHelpersInterface>& helpers);
  // For tests and other hosts: a given device instead of the local time keeper.
  ResourceManager(const std::shared_ptr<kosdtools::pendulo::TimescaleHelpersInterface>& helpers,
                  std::shared_ptr<kosdlib::wrapper::SyncableDeviceInterface> device);
  ~ResourceManager() override;

  std::string getResources(const std::string& resourceType) override;
  std::string getSyncableDevice(const std::string& uri) override;
  std::string getTimescale(const std::string& uri) override;
  void putSyncableDevice(const std::string& uri, const std::string& body) override;

 private:
  // The device's URI; throws the not-found record (at `line`) unless `uri`
  // names it exactly.
  void requireLocalDevice(const std::string& uri, int32_t line);

  std::shared_ptr<kosdtools::pendulo::TimescaleHelpersInterface> timescaleHelpers_;
  std::shared_ptr<kosdlib::wrapper::SyncableDeviceInterface> localDevice_;
};

}  // namespace quillon

#endif  // QUILLON_QUILLON_RESOURCE_MANAGER_H_
