// Text pieces shared by the simulated and the live time service: reading
// their configuration file, the one-member JSON objects that attribute calls
// answer, and the copy of an answer into the caller's buffer.
//
// Thread-safety: pure functions.
#ifndef KOPDM_CLIENTAPI_ANSWER_TEXT_H_
#define KOPDM_CLIENTAPI_ANSWER_TEXT_H_

#include <cstdint>
#include <string>
#include <string_view>

namespace kopdmsim {

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

}  // namespace kopdmsim

#endif  // KOPDM_CLIENTAPI_ANSWER_TEXT_H_
