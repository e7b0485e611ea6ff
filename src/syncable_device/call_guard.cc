#include "syncable_device/call_guard.h"

#include <exception>

#include "error_record/exception.h"

namespace kosdlib {
namespace wrapper {

CallGuard::~CallGuard() { koerr::releaseText(status_); }

void CallGuard::check() {
  if (status_.code < 0 && std::uncaught_exceptions() == 0) {
    throw koerr::Exception::fromStatus(status_);
  }
  status_.code = 0;
  koerr::releaseText(status_);
}

}  // namespace wrapper
}  // namespace kosdlib
