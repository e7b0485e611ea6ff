#include "ko/dsc/osdep/sleep.h"

#include <cerrno>

namespace ko::dsc::osdep {

void sleepMilliseconds(uint32_t milliseconds, ClockNanosleep call) noexcept {
  struct timespec request;
  request.tv_sec = static_cast<time_t>(milliseconds / 1000U);
  request.tv_nsec = static_cast<long>(milliseconds % 1000U) * 1000000L;
  struct timespec remaining{};
  // Relative sleeps report what was left when a signal arrived, so resuming
  // with that keeps the total; the monotonic clock ignores wall-clock steps.
  while (call(CLOCK_MONOTONIC, 0, &request, &remaining) == EINTR) {
    request = remaining;
  }
}

}  // namespace ko::dsc::osdep
