// Feeds arbitrary bytes to the host's head handling (as "name:value" lines),
// its stream guard and the access log's escaping. Checks that values reach the
// plug-in trimmed, that the guard passes on, however the bytes arrive, a
// stream it would pass unchanged, and that a logged field holds neither
// control bytes nor invalid UTF-8.
#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "access_log.h"
#include "request_head.h"
#include "stream_guard.h"
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

constexpr ws::host::HeadLimits kLimits{4096, 8192, 64};

struct Source {  // its bytes `step` at a time, then the end
  std::string_view bytes;
  size_t step;
  static ssize_t read(void* context, char* buffer, size_t size) {
    auto& self = *static_cast<Source*>(context);
    const size_t n = self.bytes.copy(buffer, std::min(size, self.step));
    self.bytes.remove_prefix(n);
    return static_cast<ssize_t>(n);
  }
};

// Everything the guard passes on, read `room` bytes at a time.
std::string guarded(std::string_view bytes, size_t step, size_t room) {
  ws::host::StreamGuard guard(kLimits);
  Source source{bytes, step};
  std::string out;
  std::string buffer(room, '\0');
  for (size_t left = bytes.size();; left = source.bytes.size()) {
    const ssize_t got = guard.read(buffer.data(), room, &Source::read, &source);
    if (got > 0) {
      check(static_cast<size_t>(got) <= room);
      out.append(buffer.data(), static_cast<size_t>(got));
    } else if (got == 0 || source.bytes.size() == left) {
      return out;  // the end, or a refusal after which nothing is read
    }
  }
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

  const std::string passed = guarded(text, 1 + (size % 7), 1 + (size % 13) * 97);
  check(guarded(passed, 4096, 4096) == passed);
  check(guarded(text, 4096, 4096) == passed);

  const std::string escaped = ws::host::escapeForLog(text, 1024);
  check(escaped.size() <= 4 * std::min<size_t>(text.size(), 1024));
  for (const char c : escaped) check(static_cast<unsigned char>(c) >= 0x20 && c != 0x7F);
  std::u32string decoded;
  check(ws::host::utf8Decode(escaped, decoded));
  return 0;
}
