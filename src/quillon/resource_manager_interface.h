// Which resources exist on this host, and their JSON documents: the resource
// listing, the local syncable device and the timescales.
//
// Thread-safety: implementations are read-only after construction and may be
// called from several request threads at once.
#ifndef QUILLON_QUILLON_RESOURCE_MANAGER_INTERFACE_H_
#define QUILLON_QUILLON_RESOURCE_MANAGER_INTERFACE_H_

#include <string>

namespace quillon {

class ResourceManagerInterface {
 public:
  virtual ~ResourceManagerInterface() = default;

  // The listing document; `resourceType` "" (no filter), "syncableDevices" or
  // "timescales". Errors of the timescale helpers pass through.
  virtual std::string getResources(const std::string& resourceType) = 0;
  // The device document for the exact device URI; otherwise throws
  // "koapalerr_resourceNotFound".
  virtual std::string getSyncableDevice(const std::string& uri) = 0;
  // The timescale document for a current timescale URI; otherwise throws
  // "koapalerr_resourceNotFound" listing the current ones.
  virtual std::string getTimescale(const std::string& uri) = 0;
  // Hands `body` to the device as its coherency requirements.
  virtual void putSyncableDevice(const std::string& uri, const std::string& body) = 0;
};

}  // namespace quillon

#endif  // QUILLON_QUILLON_RESOURCE_MANAGER_INTERFACE_H_
