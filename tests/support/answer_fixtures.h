// Test helpers shared by the suites of the answer path: records that free
// themselves, expected envelopes (envelopes.h), scratch directories on disk, and scoped
// environment variables.
#ifndef QUILLON_TESTS_ANSWERS_COMMON_FIXTURES_H_
#define QUILLON_TESTS_ANSWERS_COMMON_FIXTURES_H_

#include <cjson/cJSON.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <optional>
#include <string>

#include "error_record/status.h"
#include "support/envelopes.h"

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

// A fresh directory under the system's temporary directory, removed with
// everything in it at the end of the scope.
class ScratchDir {
 public:
  ScratchDir() {
    std::string pattern = (std::filesystem::temp_directory_path() / "answers-XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) {
      ADD_FAILURE() << "mkdtemp failed";
    }
    path_ = pattern;
  }
  ~ScratchDir() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
  }
  ScratchDir(const ScratchDir&) = delete;
  ScratchDir& operator=(const ScratchDir&) = delete;

  const std::filesystem::path& path() const { return path_; }
  std::string str() const { return path_.string(); }

  // Writes `content` byte for byte to `relative`, creating its directories.
  std::string write(const std::string& relative, const std::string& content) const {
    const std::filesystem::path file = path_ / relative;
    std::filesystem::create_directories(file.parent_path());
    std::ofstream(file, std::ios::binary) << content;
    return file.string();
  }

 private:
  std::filesystem::path path_;
};

// Sets (or, with nullopt, unsets) a variable and restores it afterwards.
class ScopedEnv {
 public:
  ScopedEnv(const char* name, std::optional<std::string> value) : name_(name) {
    if (const char* old = getenv(name)) {
      old_ = old;
    }
    value ? setenv(name, value->c_str(), 1) : unsetenv(name);
  }
  ~ScopedEnv() { old_ ? setenv(name_, old_->c_str(), 1) : unsetenv(name_); }
  ScopedEnv(const ScopedEnv&) = delete;
  ScopedEnv& operator=(const ScopedEnv&) = delete;

 private:
  const char* name_;
  std::optional<std::string> old_;
};

}  // namespace answers_test

#endif  // QUILLON_TESTS_ANSWERS_COMMON_FIXTURES_H_
