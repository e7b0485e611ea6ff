// Checked integer conversions: a value that the target type cannot hold
// raises instead of wrapping or truncating.
//
// Thread-safety: pure functions.
#ifndef QUILLON_KO_DSC_SAFE_INTEGER_H_
#define QUILLON_KO_DSC_SAFE_INTEGER_H_

#include <limits>
#include <string>
#include <type_traits>

#include "ko/dsc/exception.h"

namespace ko::dsc {

class SafeInteger {
 public:
  // True when `value` is representable in To (any mix of widths and signs).
  template <typename To, typename From>
  static constexpr bool fits(From value) noexcept {
    static_assert(std::is_integral_v<To> && std::is_integral_v<From>, "integers only");
    using FromLimits = std::numeric_limits<From>;
    using ToLimits = std::numeric_limits<To>;
    // Each bound is checked only when it can fail, so that no comparison is
    // between mixed signs or always true.
    if constexpr (FromLimits::is_signed && !ToLimits::is_signed) {
      if (value < 0) {
        return false;
      }
    }
    if constexpr (FromLimits::is_signed && ToLimits::is_signed && FromLimits::digits > ToLimits::digits) {
      if (value < static_cast<From>(ToLimits::min())) {
        return false;
      }
    }
    if constexpr (FromLimits::digits > ToLimits::digits) {
      return value <= static_cast<From>(ToLimits::max());
    }
    return true;
  }

  // `value` as To; raises exception::OutOfRange2 (code -52005, the value and
  // the target's limits in its text) when it does not fit.
  template <typename To, typename From>
  static To convert(From value) {
    if (!fits<To>(value)) {
      throw exception::OutOfRange2(
          "ko/dsc/SafeInteger", __LINE__,
          "Out of range: " + std::to_string(value) + " is not within [" +
              std::to_string(std::numeric_limits<To>::min()) + ", " +
              std::to_string(std::numeric_limits<To>::max()) + "]");
    }
    return static_cast<To>(value);
  }
};

}  // namespace ko::dsc

#endif  // QUILLON_KO_DSC_SAFE_INTEGER_H_
