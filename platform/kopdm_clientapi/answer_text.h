// Text pieces shared by the simulated and the live time service: reading
// their configuration file, the one-member JSON objects that attribute calls
// answer, the copy of an answer into the caller's buffer, and the orders of
// their tables of names.
//
// Thread-safety: pure functions.
#ifndef KOPDM_CLIENTAPI_ANSWER_TEXT_H_
#define KOPDM_CLIENTAPI_ANSWER_TEXT_H_

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace kopdmsim {

// The order of std::less on strings (bytes compared unsigned, then length),
// found by a loop the compiler keeps inline: names of TRs and attributes are
// a few bytes long, and a call into the C library's memcmp for each step of
// a lookup cost more than the comparison itself.
struct ShortTextLess {
  using is_transparent = void;
  bool operator()(std::string_view a, std::string_view b) const noexcept {
    const std::size_t common = a.size() < b.size() ? a.size() : b.size();
    for (std::size_t i = 0; i < common; ++i) {
      const auto x = static_cast<unsigned char>(a[i]);
      const auto y = static_cast<unsigned char>(b[i]);
      if (x != y) return x < y;
    }
    return a.size() < b.size();
  }
};

// An order for tables that are searched but never listed: by length, then
// bytes. Most steps of a lookup among short names decide on the length
// alone.
struct LookupLess {
  using is_transparent = void;
  bool operator()(std::string_view a, std::string_view b) const noexcept {
    if (a.size() != b.size()) return a.size() < b.size();
    return ShortTextLess()(a, b);
  }
};

// Reads a whole configuration file of at most 16 MiB. False, with a
// sentence saying why, when it cannot.
bool readTextFile(const std::string& path, std::string* text, std::string* problem);

// {"<key>":<valueJson>}, the key escaped.
std::string renderMember(std::string_view key, std::string_view valueJson);
// "the text is not valid JSON (syntax error at line L, column C)" for a
// parse of `text` that stopped at `end` (null: at the start).
std::string syntaxProblem(const std::string& text, const char* end);

// Copies `answer` NUL-terminated into `buffer`, cut to `capacity` - 1 bytes
// (`capacity` > 0).
void copyAnswer(std::string_view answer, char* buffer, uint32_t capacity);
// Copies renderMember(key, valueJson) as copyAnswer does, without building
// the member first when the key needs no escaping.
void copyMember(std::string_view key, std::string_view valueJson, char* buffer,
                uint32_t capacity);

}  // namespace kopdmsim

#endif  // KOPDM_CLIENTAPI_ANSWER_TEXT_H_
