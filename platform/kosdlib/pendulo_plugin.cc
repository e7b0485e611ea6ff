// The time keeper that follows the local time service: a device of the core
// library marked as driven by this plug-in. Served live, the time service
// knows how far the machine's clock is from the selected time reference, and
// that is the time keeper's offset; simulated, it keeps the core's clock.
#include <cstdlib>

#include "kopdm_clientapi.h"
#include "kosdlib/kosdlib.h"

namespace {

bool timeServiceIsLive() {
  const char* config = std::getenv("KOPDM_PTP4L_CONFIG");
  return config != nullptr && config[0] != '\0';
}

// Any failure (no selected reference, a daemon that does not answer) means
// the offset is not known; the reason is the time service's to report.
int selectedTrOffset(void*, int64_t* offsetNanos) {
  koerr::Status status;
  const int32_t result = kopdmclientapi_getSelectedTrOffsetNanos(offsetNanos, &status);
  const bool known = result >= 0 && status.code >= 0;
  status.reallocate(&status, 0);
  return known ? 1 : 0;
}

}  // namespace

kosdlib_SyncableDeviceHandle kosdplugins_pendulo_SyncableDeviceActual_create(
    const char* uri, kosdlib_Status* status) {
  kosdlib_SyncableDeviceHandle device = kosdlib_SyncableDevice_create(uri, "pendulo", status);
  if (device != nullptr && timeServiceIsLive()) {
    kosdlib_SyncableDevice_setOffsetSource(device, selectedTrOffset, nullptr, status);
  }
  return device;
}
