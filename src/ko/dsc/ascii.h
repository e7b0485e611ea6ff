// Case-insensitive comparison of the system's own words (tags, keys, media
// types) in ASCII only. The C library's strcasecmp and tolower follow the
// process locale, in which "I" need not fold to "i" (Turkish) and a word
// written in capitals would then go unrecognised.
//
// Thread-safety: pure functions.
#ifndef QUILLON_KO_DSC_ASCII_H_
#define QUILLON_KO_DSC_ASCII_H_

#include <cstddef>

namespace ko::dsc::ascii {

constexpr char lower(char c) noexcept {
  return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

// Both NUL-terminated; true when they are equal but for ASCII case.
inline bool equalsIgnoringCase(const char* a, const char* b) noexcept {
  // Keys mostly arrive in the case they are asked for: equal bytes skip the
  // folding, and a NUL facing a letter fails the folded test.
  for (;; ++a, ++b) {
    if (*a == *b) {
      if (*a == '\0') return true;
    } else if (lower(*a) != lower(*b)) {
      return false;
    }
  }
}

// strncasecmp(text, word, length) == 0 in the "C" locale: the first `length`
// bytes agree but for ASCII case, or both end together before that.
inline bool equalsIgnoringCase(const char* text, const char* word, size_t length) noexcept {
  for (size_t i = 0; i < length; ++i) {
    if (lower(text[i]) != lower(word[i])) return false;
    if (text[i] == '\0') return true;
  }
  return true;
}

}  // namespace ko::dsc::ascii

#endif  // QUILLON_KO_DSC_ASCII_H_
