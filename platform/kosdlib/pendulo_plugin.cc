// The time keeper that follows the local time service: a device of the core
// library marked as driven by this plug-in.
#include "kosdlib/kosdlib.h"

kosdlib_SyncableDeviceHandle kosdplugins_pendulo_SyncableDeviceActual_create(
    const char* uri, kosdlib_Status* status) {
  return kosdlib_SyncableDevice_create(uri, "pendulo", status);
}
