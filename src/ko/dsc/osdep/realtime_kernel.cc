#include "ko/dsc/osdep/realtime_kernel.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

namespace ko::dsc::osdep {
namespace {

bool readFlag(const std::string& path) {
  const int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) {
    return false;  // no flag file: an ordinary kernel
  }
  char byte = 0;
  ssize_t got;
  do {
    got = ::read(fd, &byte, 1);
  } while (got < 0 && errno == EINTR);
  ::close(fd);
  return got == 1 && byte == '1';
}

}  // namespace

RealtimeKernel::RealtimeKernel(std::string flagPath) : flagPath_(std::move(flagPath)) {}

const RealtimeKernel& RealtimeKernel::system() {
  static const RealtimeKernel kernel("/sys/kernel/realtime");
  return kernel;
}

bool RealtimeKernel::isRealtime() const {
  std::call_once(once_, [this] { realtime_ = readFlag(flagPath_); });
  return realtime_;
}

}  // namespace ko::dsc::osdep
