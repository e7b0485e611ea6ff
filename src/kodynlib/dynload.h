// Run-time loading of optional shared libraries: the plug-in's only door to
// the dynamic loader. Failures come back as error records, never as
// exceptions, and each record names the call, the library or symbol, and the
// loader's own text for that failure.
//
// Thread-safety: safe to call from several threads; the loader's error text is
// per thread, and each failure reads it right after the failing call.
#ifndef QUILLON_KODYNLIB_DYNLOAD_H_
#define QUILLON_KODYNLIB_DYNLOAD_H_

#include "error_record/status.h"

// Opens `file` with the loader `flags` passed through unchanged. Returns the
// handle, or null when `status` already holds an error or the loader refuses
// (then `status` takes -52005 "koapalerr_invalidParameter" with the path and
// the loader's text, if it takes the code at all).
[[nodiscard]] void* kodynlib_load(const char* file, int flags, koerr::Status* status);

// The address of `name` in the library `handle`, or null when `status`
// already holds an error or the symbol is missing (then -52005 as above,
// naming the symbol).
[[nodiscard]] void* kodynlib_symbol(void* handle, const char* name, koerr::Status* status);

// Releases a handle from kodynlib_load; null is allowed.
void kodynlib_unload(void* handle);

#endif  // QUILLON_KODYNLIB_DYNLOAD_H_
