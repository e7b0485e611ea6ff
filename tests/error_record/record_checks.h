// Shared checks of error-record texts: every record a test builds must parse.
#ifndef QUILLON_TESTS_ERROR_RECORD_RECORD_CHECKS_H_
#define QUILLON_TESTS_ERROR_RECORD_RECORD_CHECKS_H_

#include <cjson/cJSON.h>
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "error_record/status.h"

namespace koerr_test {

// The buffer invariant: text, then zeros up to the guard in the last byte.
inline ::testing::AssertionResult holdsInvariant(const koerr::Status& status) {
  if (status.json == nullptr) {
    return status.capacity == 0 ? ::testing::AssertionSuccess()
                                : ::testing::AssertionFailure() << "capacity without buffer";
  }
  const size_t length = std::strlen(status.json);
  if (length + 2 > status.capacity) return ::testing::AssertionFailure() << "text reaches guard";
  for (size_t i = length; i + 1 < status.capacity; ++i) {
    if (status.json[i] != '\0') return ::testing::AssertionFailure() << "non-zero at " << i;
  }
  if (status.json[status.capacity - 1] != koerr::kGuard) {
    return ::testing::AssertionFailure() << "guard missing";
  }
  cJSON* root = cJSON_Parse(status.json);
  const bool object = cJSON_IsObject(root);
  cJSON_Delete(root);
  return object ? ::testing::AssertionSuccess()
                : ::testing::AssertionFailure() << "not a JSON object: " << status.json;
}

}  // namespace koerr_test

#endif  // QUILLON_TESTS_ERROR_RECORD_RECORD_CHECKS_H_
