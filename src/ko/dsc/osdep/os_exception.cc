#include "ko/dsc/osdep/os_exception.h"

#include <cstring>

namespace ko::dsc::osdep {
namespace {

std::string describe(const std::string& call, int error) {
  char buffer[256];
  // The GNU variant may return a static text instead of filling the buffer.
  const char* text = strerror_r(error, buffer, sizeof buffer);
  return call + ": " + text + " (errno " + std::to_string(error) + ")";
}

}  // namespace

PosixError::PosixError(const char* file, int32_t line, const std::string& call, int error)
    : OSException(file, line, describe(call, error)), error_(error) {}

}  // namespace ko::dsc::osdep
