// Operating-system failures: OSException for a failed platform call described
// by text (a loader message, a failed conversion set-up), PosixError for one
// that left an errno value. Both are members of the foundation family, so an
// error translation that knows the family reports their code, file and line.
//
// Thread-safety: values, as the family.
#ifndef QUILLON_KO_DSC_OSDEP_OS_EXCEPTION_H_
#define QUILLON_KO_DSC_OSDEP_OS_EXCEPTION_H_

#include <string>

#include "ko/dsc/exception.h"

namespace ko::dsc::osdep {

class OSException : public ko::dsc::exception::Exception {
 public:
  static constexpr int32_t kDefaultCode = ko::dsc::exception::kOsFaultCode;
  OSException(const char* file, int32_t line, std::string text)
      : ko::dsc::exception::Exception(kDefaultCode, file, line, std::move(text)) {}
};

// what() is "<call>: <system text> (errno <n>)".
class PosixError : public OSException {
 public:
  PosixError(const char* file, int32_t line, const std::string& call, int error);
  int error() const noexcept { return error_; }

 private:
  int error_;
};

}  // namespace ko::dsc::osdep

#endif  // QUILLON_KO_DSC_OSDEP_OS_EXCEPTION_H_
