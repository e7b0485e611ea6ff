// Owning holder of one parsed cJSON tree, so that every exit path of a reader
// frees the tree exactly once.
//
// Thread-safety: a value owned by one thread; distinct holders are independent.
#ifndef QUILLON_KOJSONLH_CPP_JSON_H_
#define QUILLON_KOJSONLH_CPP_JSON_H_

#include <string>

struct cJSON;

class CppJson {
 public:
  CppJson() = default;
  // Takes ownership of `root` (may be null).
  explicit CppJson(cJSON* root) noexcept : root_(root) {}
  // Parses `text`; raises "jsonErrorsInvalidJSON" (-52005) when it does not
  // parse, owning nothing.
  explicit CppJson(const std::string& text);
  CppJson(const CppJson&) = delete;
  CppJson& operator=(const CppJson&) = delete;
  CppJson(CppJson&& other) noexcept : root_(other.root_) { other.root_ = nullptr; }
  CppJson& operator=(CppJson&& other) noexcept;
  ~CppJson() { reset(); }

  // Deletes the tree held so far and takes `root` (null deletes only).
  void reset(cJSON* root = nullptr) noexcept;
  // The root, ownership kept; null when empty.
  cJSON* get() const noexcept { return root_; }

 private:
  cJSON* root_ = nullptr;
};

#endif  // QUILLON_KOJSONLH_CPP_JSON_H_
