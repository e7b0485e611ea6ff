// Shared checks of error-record texts: every record a test builds must parse.
#ifndef QUILLON_TESTS_ERROR_RECORD_RECORD_CHECKS_H_
#define QUILLON_TESTS_ERROR_RECORD_RECORD_CHECKS_H_

#include <cjson/cJSON.h>
#include <gtest/gtest.h>

#include <cstring>
#include <memory>
#include <string>

#include "error_record/status.h"

namespace koerr_test {

using JsonPtr = std::unique_ptr<cJSON, decltype(&cJSON_Delete)>;

inline JsonPtr parse(const char* text) {
  return JsonPtr(text != nullptr ? cJSON_Parse(text) : nullptr, &cJSON_Delete);
}

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
  JsonPtr root = parse(status.json);
  if (!root || !cJSON_IsObject(root.get())) {
    return ::testing::AssertionFailure() << "not a JSON object: " << status.json;
  }
  return ::testing::AssertionSuccess();
}

}  // namespace koerr_test

#endif  // QUILLON_TESTS_ERROR_RECORD_RECORD_CHECKS_H_
