// Test helpers shared by the suites of the answer path: records that free
// themselves, plus expected envelopes (envelopes.h), scratch directories and
// scoped environment variables (scratch.h).
#ifndef QUILLON_TESTS_ANSWERS_COMMON_FIXTURES_H_
#define QUILLON_TESTS_ANSWERS_COMMON_FIXTURES_H_

#include <cjson/cJSON.h>
#include <gtest/gtest.h>

#include <cstring>
#include <string>

#include "error_record/status.h"
#include "support/envelopes.h"
#include "support/scratch.h"

namespace answers_test {

struct OwnedStatus : koerr::Status {
  OwnedStatus() = default;
  explicit OwnedStatus(int32_t initialCode) { code = initialCode; }
  OwnedStatus(const OwnedStatus&) = delete;
  OwnedStatus& operator=(const OwnedStatus&) = delete;
  ~OwnedStatus() { koerr::releaseText(*this); }
  std::string text() const { return json != nullptr ? json : ""; }
};

// Every text the tests compare must also be well-formed JSON.
inline ::testing::AssertionResult parses(const std::string& text) {
  cJSON* root = cJSON_Parse(text.c_str());
  const bool ok = root != nullptr;
  cJSON_Delete(root);
  return ok ? ::testing::AssertionSuccess() : ::testing::AssertionFailure() << "not JSON: " << text;
}

// The "internal_error" member that failed system calls add to a record.
inline std::string errnoMember(int error) {
  return "\"internal_error\":{\"api\":\"errno\",\"code\":" + std::to_string(error) +
         ",\"string\":\"" + std::strerror(error) + "\"}";
}

}  // namespace answers_test

#endif  // QUILLON_TESTS_ANSWERS_COMMON_FIXTURES_H_
