// A millisecond sleep on the monotonic clock that signals do not cut short.
//
// Thread-safety: reentrant.
#ifndef QUILLON_KO_DSC_OSDEP_SLEEP_H_
#define QUILLON_KO_DSC_OSDEP_SLEEP_H_

#include <time.h>

#include <cstdint>

namespace ko::dsc::osdep {

// The shape of clock_nanosleep: 0 on success, else the error number.
using ClockNanosleep = int (*)(clockid_t, int, const struct timespec*, struct timespec*);

// Sleeps `milliseconds` relative to now on CLOCK_MONOTONIC. When a signal
// interrupts it (EINTR) it sleeps again for the time that remained; any other
// error ends the sleep early, and is not reported. `call` is the platform
// call, replaceable so that interruptions can be staged.
void sleepMilliseconds(uint32_t milliseconds, ClockNanosleep call = ::clock_nanosleep) noexcept;

}  // namespace ko::dsc::osdep

#endif  // QUILLON_KO_DSC_OSDEP_SLEEP_H_
