// The strictness comes from jansson, whose decoder refuses invalid UTF-8, raw
// control bytes and (on request) duplicate names; only what it cannot know,
// a byte-order mark and the meaning of "maxOffsetNanos", is checked here.
#include "requirements.h"

#include <cJSON.h>
#include <jansson.h>

#include <cstring>
#include <memory>

namespace kosdlib {
namespace {

constexpr const char* kBoundName = "maxOffsetNanos";
constexpr int kStrict = JSON_REJECT_DUPLICATES | JSON_ALLOW_NUL | JSON_DECODE_ANY;

struct JsonRelease {
  void operator()(json_t* value) const { json_decref(value); }
};
using JsonHandle = std::unique_ptr<json_t, JsonRelease>;

bool fail(RequirementsProblem* problem, std::string message, size_t offset) {
  problem->message = std::move(message);
  problem->offset = offset;
  return false;
}

size_t skipSpace(const std::string& text, size_t at) {
  while (at < text.size() && std::strchr(" \t\r\n", text[at]) != nullptr && text[at] != '\0') ++at;
  return at;
}

// jansson's texts end in " near '<token>'", which may quote the offending
// raw bytes; the offset already says where, and the record stays UTF-8.
std::string withoutQuotedToken(const char* text) {
  std::string out(text);
  const size_t near = out.find(" near ");
  if (near != std::string::npos) out.resize(near);
  return out;
}

bool isName(const std::string& token, const char* name) {
  json_error_t error;
  JsonHandle decoded(json_loadb(token.data(), token.size(), JSON_DECODE_ANY | JSON_ALLOW_NUL,
                                &error));
  return json_is_string(decoded.get()) &&
         json_string_length(decoded.get()) == std::strlen(name) &&
         std::memcmp(json_string_value(decoded.get()), name, std::strlen(name)) == 0;
}

// Where the value of the top-level member `name` starts in `text`, which
// jansson has already accepted; a name may be spelt with escapes, so each
// top-level name is decoded before it is compared.
size_t memberValueOffset(const std::string& text, const char* name) {
  int depth = 0;
  bool expectName = false;
  std::string lastName;  // the latest top-level name, quotes included
  for (size_t at = 0; at < text.size(); ++at) {
    const char c = text[at];
    if (c == '"') {
      const size_t start = at;
      for (++at; text[at] != '"'; ++at) {
        if (text[at] == '\\') ++at;
      }
      if (depth == 1 && expectName) lastName = text.substr(start, at + 1 - start);
      expectName = false;
    } else if (c == '{' || c == '[') {
      expectName = ++depth == 1;
    } else if (c == '}' || c == ']') {
      --depth;
    } else if (c == ',' && depth == 1) {
      expectName = true;
    } else if (c == ':' && depth == 1 && isName(lastName, name)) {
      return skipSpace(text, at + 1);
    }
  }
  return 0;
}

bool readBound(const std::string& text, json_t* root, Requirements* out,
               RequirementsProblem* problem) {
  json_t* bound = json_object_get(root, kBoundName);
  if (bound == nullptr) return true;
  if (!json_is_integer(bound) || json_integer_value(bound) < 0) {
    return fail(problem,
                "The coherency requirements' \"maxOffsetNanos\" must be an integer from 0 to "
                "9223372036854775807.",
                memberValueOffset(text, kBoundName));
  }
  out->bounded = true;
  out->maxOffsetNanos = json_integer_value(bound);
  return true;
}

}  // namespace

bool parseRequirements(const std::string& text, Requirements* out,
                       RequirementsProblem* problem) {
  if (text.compare(0, 3, "\xEF\xBB\xBF") == 0) {
    return fail(problem, "The coherency requirements begin with a byte-order mark.", 0);
  }
  json_error_t error;
  JsonHandle root(json_loadb(text.data(), text.size(), kStrict, &error));
  if (!root) {
    // A number past what the decoder holds is still JSON: saying otherwise
    // would send the client looking for a syntax error that is not there.
    const char* what = json_error_code(&error) == json_error_numeric_overflow
                           ? "The coherency requirements hold a number too large to read: "
                           : "The coherency requirements are not valid JSON: ";
    return fail(problem, what + withoutQuotedToken(error.text) + ".",
                error.position < 0 ? 0 : static_cast<size_t>(error.position));
  }
  if (!json_is_object(root.get())) {
    return fail(problem, "The coherency requirements must be a JSON object.",
                skipSpace(text, 0));
  }
  Requirements parsed;
  if (!readBound(text, root.get(), &parsed, problem)) return false;
  // Minified from the client's own text, so numbers and escapes keep their
  // spelling. Accepted text has no comments and no raw NUL for cJSON to
  // trip on.
  parsed.text = text;
  cJSON_Minify(&parsed.text[0]);
  parsed.text.resize(std::strlen(parsed.text.c_str()));
  *out = std::move(parsed);
  return true;
}

}  // namespace kosdlib
