// What a call raised, for tests that compare whole error records byte for
// byte. Header-only, so any test can use it without linking test_support.
#ifndef QUILLON_TESTS_SUPPORT_RAISED_H_
#define QUILLON_TESTS_SUPPORT_RAISED_H_

#include <cstdint>
#include <functional>
#include <string>

#include "error_record/exception.h"

namespace quillon::test_support {

struct Raised {
  int32_t code = 0;
  std::string record = "<nothing thrown>";
};

// The code and record of the koerr::Exception that `call` throws; code 0 and
// "<nothing thrown>" when it returns normally.
inline Raised raisedBy(const std::function<void()>& call) {
  try {
    call();
  } catch (const koerr::Exception& e) {
    return {e.code(), e.what()};
  }
  return {};
}

}  // namespace quillon::test_support

#endif  // QUILLON_TESTS_SUPPORT_RAISED_H_
