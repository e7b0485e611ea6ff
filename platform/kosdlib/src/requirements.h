// Coherency requirements as a device accepts them: exactly one JSON object
// (RFC 8259, UTF-8, no byte-order mark, no duplicate member names at any
// depth) whose "maxOffsetNanos", when present, is an integer from 0 to
// 2^63-1. A device only ever stores and shows text that passed here, so its
// document stays JSON whatever a client sent.
//
// Thread-safety: pure functions over caller-owned text.
#ifndef KOSDLIB_SRC_REQUIREMENTS_H_
#define KOSDLIB_SRC_REQUIREMENTS_H_

#include <cstddef>
#include <cstdint>
#include <string>

namespace kosdlib {

struct Requirements {
  std::string text;  // the object without insignificant white space
  bool bounded = false;
  int64_t maxOffsetNanos = 0;  // meaningful when bounded
};

struct RequirementsProblem {
  std::string message;  // a sentence naming what is wrong
  size_t offset = 0;    // byte of the text where it was found
};

// Fills `*out`, or `*problem` and returns false.
[[nodiscard]] bool parseRequirements(const std::string& text, Requirements* out,
                                     RequirementsProblem* problem);

}  // namespace kosdlib

#endif  // KOSDLIB_SRC_REQUIREMENTS_H_
