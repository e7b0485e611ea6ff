// The answer envelopes as a client receives them, byte for byte. `record`
// and `text` are quoted the way JSON quotes the texts these tests use
// (quotes and backslashes only).
#ifndef QUILLON_TESTS_SUPPORT_ENVELOPES_H_
#define QUILLON_TESTS_SUPPORT_ENVELOPES_H_

#include <cstdint>
#include <string>

namespace answers_test {

inline std::string quoted(const std::string& text) {
  std::string out = "\"";
  for (char c : text) {
    if (c == '"' || c == '\\') out += '\\';
    out += c;
  }
  return out + "\"";
}

inline std::string successEnvelope(const std::string& result = "") {
  const std::string error = "{\"error\":{\"success\":true,\"errorCode\":0,\"errorText\":\"\"}";
  return error + (result.empty() ? "" : ",\"result\":" + result) + "}";
}

inline std::string errorEnvelope(int32_t code, const std::string& text, const std::string& record) {
  return "{\"error\":{\"success\":" + std::string(code == 0 ? "true" : "false") +
         ",\"errorCode\":" + std::to_string(code) + ",\"errorText\":" + quoted(text) +
         (record.empty() ? "" : ",\"errorInfo\":" + quoted(record)) + "}}";
}

}  // namespace answers_test

#endif  // QUILLON_TESTS_SUPPORT_ENVELOPES_H_
