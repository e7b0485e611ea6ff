#include "answer_text.h"

#include <cerrno>
#include <cstdio>
#include <cstring>

#include "error_record/json_text.h"

namespace kopdmsim {
namespace {

// A configuration is a hand-written file; anything larger is a mistake.
constexpr long kMaxFileBytes = 16L * 1024 * 1024;

// Whether JSON text writes these bytes as they are: no quote, backslash or
// control character.
bool needsNoEscape(std::string_view text) {
  for (const char byte : text) {
    const auto c = static_cast<unsigned char>(byte);
    if (c < 0x20 || c == 0x7f || c == '"' || c == '\\') return false;
  }
  return true;
}

// Writes pieces one after another into a buffer, cutting what does not fit.
class CutWriter {
 public:
  CutWriter(char* out, size_t room) : out_(out), room_(room) {}
  CutWriter& operator<<(std::string_view piece) {
    const size_t length = piece.size() < room_ ? piece.size() : room_;
    std::memcpy(out_, piece.data(), length);
    out_ += length;
    room_ -= length;
    return *this;
  }
  void terminate() { *out_ = '\0'; }

 private:
  char* out_;
  size_t room_;
};

}  // namespace

bool readTextFile(const std::string& path, std::string* text, std::string* problem) {
  FILE* file = std::fopen(path.c_str(), "rb");
  if (file == nullptr) {
    *problem = std::string("the file cannot be opened: ") + std::strerror(errno);
    return false;
  }
  char chunk[8192];
  size_t count;
  while ((count = std::fread(chunk, 1, sizeof chunk, file)) > 0) {
    text->append(chunk, count);
    if (static_cast<long>(text->size()) > kMaxFileBytes) {
      std::fclose(file);
      *problem = "the file is larger than 16 MiB";
      return false;
    }
  }
  const bool failed = std::ferror(file) != 0;
  std::fclose(file);
  if (failed) *problem = "the file cannot be read";
  return !failed;
}

void copyAnswer(std::string_view answer, char* buffer, uint32_t capacity) {
  const size_t length = answer.size() < capacity ? answer.size() : capacity - 1;
  std::memcpy(buffer, answer.data(), length);
  buffer[length] = '\0';
}

void copyMember(std::string_view key, std::string_view valueJson, char* buffer,
                uint32_t capacity) {
  if (!needsNoEscape(key)) {
    copyAnswer(renderMember(key, valueJson), buffer, capacity);
    return;
  }
  CutWriter writer(buffer, capacity - 1);
  writer << "{\"" << key << "\":" << valueJson << "}";
  writer.terminate();
}

std::string renderMember(std::string_view key, std::string_view valueJson) {
  std::string member = "{\"";
  member.reserve(key.size() + valueJson.size() + 6);
  koerr::appendJsonEscaped(member, key);
  member += "\":";
  member += valueJson;
  member += '}';
  return member;
}

std::string syntaxProblem(const std::string& text, const char* end) {
  std::size_t offset = end != nullptr ? static_cast<std::size_t>(end - text.c_str()) : 0;
  if (offset > text.size()) offset = text.size();
  std::size_t line = 1;
  std::size_t column = 1;
  for (std::size_t i = 0; i < offset; ++i) {
    if (text[i] == '\n') {
      ++line;
      column = 1;
    } else {
      ++column;
    }
  }
  return "the text is not valid JSON (syntax error at line " + std::to_string(line) + ", column " +
         std::to_string(column) + ")";
}

}  // namespace kopdmsim
