/* The syncable-device library: one handle per device that takes part in time
 * synchronisation on this host. A handle remembers its URI and the coherency
 * requirements last handed to it, and renders itself as a JSON document.
 *
 * Every call but kosdlib_SyncableDevice_delete takes an error record as its
 * last argument: on failure the record gets a negative code and a JSON object
 * of details; on success it is left as it was.
 *
 * Thread-safety: every function may be called on one handle from several
 * threads at once, except kosdlib_SyncableDevice_delete, which must be the
 * handle's last call.
 */
#ifndef KOSDLIB_KOSDLIB_H_
#define KOSDLIB_KOSDLIB_H_

#include <stdint.h>

#ifdef __cplusplus
#include "error_record/status.h"
typedef koerr::Status kosdlib_Status;
extern "C" {
#else
/* Same layout as the plug-in's error record. */
typedef struct kosdlib_Status {
  int32_t code;
  uint32_t capacity;
  int (*reallocate)(struct kosdlib_Status* status, uint32_t newCapacity);
  char* json;
} kosdlib_Status;
#endif

#define KOSDLIB_EXPORT __attribute__((visibility("default")))

typedef struct kosdlib_SyncableDevice* kosdlib_SyncableDeviceHandle;

/* A new device for `uri` (non-empty); `kind` names the plug-in that drives it
 * and shows in the document as "plugin". Null, with -52005 in `status`, when
 * an argument is missing; null with -52000 when memory runs out. Device
 * plug-ins call this; applications call the plug-in's own create function.
 * With a state directory (KOSDLIB_STATE_DIRECTORY, else STATE_DIRECTORY) the
 * device starts with the requirements last stored there for its URI; a state
 * file it cannot use is renamed aside and reported on standard error. */
KOSDLIB_EXPORT kosdlib_SyncableDeviceHandle kosdlib_SyncableDevice_create(
    const char* uri, const char* kind, kosdlib_Status* status);

/* Frees the handle and everything it holds. A null handle is ignored. */
KOSDLIB_EXPORT void kosdlib_SyncableDevice_delete(kosdlib_SyncableDeviceHandle device);

/* Stores `requirements`, which must be exactly one strict JSON object (UTF-8,
 * no byte-order mark, no raw control bytes in strings, no duplicate names)
 * whose "maxOffsetNanos", if any, is an integer from 0 to 2^63-1, as the
 * device's coherency requirements (kept without insignificant white space).
 * `scope` is reserved for future use: pass "". Anything else fails with
 * -52005 ("koapalerr_invalidParameter"), naming the problem and its byte
 * offset. With a state directory the requirements are on disk before the
 * call returns; when they cannot be saved it fails with -52008
 * ("koapalerr_osFault"). On failure the stored requirements stay as they
 * were. */
KOSDLIB_EXPORT void kosdlib_SyncableDevice_setCoherencyRequirements(
    kosdlib_SyncableDeviceHandle device, const char* requirements, const char* scope,
    kosdlib_Status* status);

/* Forgets the coherency requirements, on disk too. `scope` and -52008 as
 * above. */
KOSDLIB_EXPORT void kosdlib_SyncableDevice_clearCoherencyRequirements(
    kosdlib_SyncableDeviceHandle device, const char* scope, kosdlib_Status* status);

/* 1 when the device's clock is within `maxOffsetNanos` of its timescale, 0
 * otherwise. A bound of 0 or less means "the stored requirements": their
 * member "maxOffsetNanos" when they have one, otherwise the device counts as
 * coherent. A device whose offset is not known is never coherent. -1 with
 * -52005 for a null handle. */
KOSDLIB_EXPORT int32_t kosdlib_SyncableDevice_isCoherent(
    kosdlib_SyncableDeviceHandle device, int32_t maxOffsetNanos, kosdlib_Status* status);

/* Where a device learns its distance from its timescale: writes the offset
 * in nanoseconds to `*offsetNanos` and returns 1, or returns 0 when it cannot
 * tell. It is called on the thread of the call that needs it, without any
 * lock of the device held. */
typedef int (*kosdlib_OffsetSource)(void* context, int64_t* offsetNanos);

/* Makes `source` (with `context`) the device's offset; null restores the
 * simulated clock, which stays 250 ns away. Device plug-ins call this right
 * after creation. -52005 for a null handle. */
KOSDLIB_EXPORT void kosdlib_SyncableDevice_setOffsetSource(
    kosdlib_SyncableDeviceHandle device, kosdlib_OffsetSource source, void* context,
    kosdlib_Status* status);

/* The device's URI, owned by the handle and valid until it is deleted. */
KOSDLIB_EXPORT const char* kosdlib_SyncableDevice_getUri(
    kosdlib_SyncableDeviceHandle device, kosdlib_Status* status);

/* The device document, allocated with malloc; the caller frees it with free:
 * {"uri":...,"coherencyRequirements":...,"plugin":...,"coherent":...,"offsetNanos":...}
 * with "offsetNanos" null (and "coherent" false) when the offset is not
 * known. Null with -52000 when memory runs out. */
KOSDLIB_EXPORT char* kosdlib_SyncableDevice_toJson(
    kosdlib_SyncableDeviceHandle device, kosdlib_Status* status);

/* libkopenduloSdPlugin: the time keeper driven by the local time service.
 * When the time service serves live ptp4l state (KOPDM_PTP4L_CONFIG set and
 * not empty), its offset is the selected time reference's; otherwise it is
 * the simulated clock's. */
KOSDLIB_EXPORT kosdlib_SyncableDeviceHandle kosdplugins_pendulo_SyncableDeviceActual_create(
    const char* uri, kosdlib_Status* status);

#ifdef __cplusplus
}
#endif

#endif /* KOSDLIB_KOSDLIB_H_ */
