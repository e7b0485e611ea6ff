#include "kojsonlh/cpp_json.h"

#include <cjson/cJSON.h>

#include "error_record/error.h"

CppJson::CppJson(const std::string& text) : root_(cJSON_Parse(text.c_str())) {
  if (root_ == nullptr) {
    koerr::Error(koerr::jsonErrorsInvalidJSON, "kojsonlh/CppJson", 34).raise();
  }
}

CppJson& CppJson::operator=(CppJson&& other) noexcept {
  if (this != &other) {
    reset(other.root_);
    other.root_ = nullptr;
  }
  return *this;
}

void CppJson::reset(cJSON* root) noexcept {
  if (root_ != nullptr && root_ != root) cJSON_Delete(root_);
  root_ = root;
}
