#include "korelocations/korelocations.h"

#include <cstdlib>
#include <cstring>
#include <string_view>

namespace {

constexpr const char* kAnswersVariable = "KORELOCATIONS_ANSWERS";

// The value given to `name` in the answers list; false when not listed.
bool findAnswer(std::string_view answers, std::string_view name, std::string_view& value) {
  while (!answers.empty()) {
    const size_t end = answers.find(';');
    const std::string_view entry = answers.substr(0, end);
    answers = end == std::string_view::npos ? std::string_view() : answers.substr(end + 1);
    const size_t equals = entry.find('=');
    if (equals != std::string_view::npos && entry.substr(0, equals) == name) {
      value = entry.substr(equals + 1);
      return true;
    }
  }
  return false;
}

}  // namespace

extern "C" int get_relocated_dir(const char* name, char* buffer, size_t size) {
  if (name == nullptr || buffer == nullptr || size == 0) {
    return -1;
  }
  const char* answers = std::getenv(kAnswersVariable);
  std::string_view value;
  if (answers == nullptr || !findAnswer(answers, name, value)) {
    return 0;
  }
  if (value == "!" || value.empty() || value.size() >= size) {
    return -1;
  }
  std::memcpy(buffer, value.data(), value.size());
  buffer[value.size()] = '\0';
  return static_cast<int>(value.size());
}
