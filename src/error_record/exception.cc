#include "error_record/exception.h"

#include <utility>

namespace koerr {
namespace {

// Leaves `from` without a buffer; its code stays readable.
Status takeBuffer(Status& from) {
  Status taken = from;
  from.json = nullptr;
  from.capacity = 0;
  return taken;
}

}  // namespace

ExceptionBase::ExceptionBase(Status&& status) noexcept : status_(takeBuffer(status)) {
  status.code = 0;
}

ExceptionBase::ExceptionBase(const ExceptionBase& other) noexcept
    : status_(takeBuffer(other.status_)) {}

ExceptionBase::~ExceptionBase() { releaseText(status_); }

const char* ExceptionBase::what() const noexcept {
  return status_.json != nullptr ? status_.json : "";
}

Exception Exception::fromStatus(Status& status) {
  Exception exception;
  copyStatus(exception.status(), status);
  return exception;
}

StatusGuard::~StatusGuard() noexcept(false) {
  if (code < 0 && std::uncaught_exceptions() == 0) {
    Exception exception(std::move(static_cast<Status&>(*this)));
    throw exception;
  }
  releaseText(*this);
}

}  // namespace koerr
