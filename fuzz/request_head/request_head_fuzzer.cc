// Feeds the host's head handling arbitrary header lines ("name:value", one a
// line) and the access log's escaping arbitrary bytes. Checks that values
// reach the plug-in trimmed, and that a logged field holds neither control
// bytes nor invalid UTF-8.
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "access_log.h"
#include "request_head.h"
#include "url_mapping.h"

namespace {

void check(bool condition) {
  if (!condition) std::abort();
}

void checkTrimmed(const std::string_view* value) {
  if (value == nullptr || value->empty()) return;
  check(value->front() != ' ' && value->front() != '\t');
  check(value->back() != ' ' && value->back() != '\t');
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string_view text(reinterpret_cast<const char*>(data), size);
  ws::host::RequestHead head;
  for (int round = 0; round < 2; ++round) {  // a reused head forgets the last request
    head.clear();
    size_t start = 0;
    while (start < text.size()) {
      const size_t end = std::min(text.find('\n', start), text.size());
      const std::string_view line = text.substr(start, end - start);
      const size_t colon = line.find(':');
      head.add(line.substr(0, colon), colon == std::string_view::npos ? "" : line.substr(colon + 1));
      start = end + 1;
    }
    checkTrimmed(head.contentType());
    if (head.accept() != nullptr && head.accept()->find(", ") == std::string_view::npos) {
      checkTrimmed(head.accept());
    }
    uint64_t length = 0;
    if (head.declaredLength(length)) check(length < 10000000000000000000ULL);
  }

  const std::string escaped = ws::host::escapeForLog(text, 1024);
  check(escaped.size() <= 4 * std::min<size_t>(text.size(), 1024));
  for (const char c : escaped) check(static_cast<unsigned char>(c) >= 0x20 && c != 0x7F);
  std::u32string decoded;
  check(ws::host::utf8Decode(escaped, decoded));
  return 0;
}
