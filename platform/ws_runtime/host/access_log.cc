#include "access_log.h"

#include <unistd.h>

#include <cinttypes>
#include <cstdio>

namespace ws::host {

namespace {

// Paths are logged up to this many bytes so that a line stays one write.
constexpr int kMaxField = 1024;

int clip(std::string_view text) {
  return text.size() > kMaxField ? kMaxField : static_cast<int>(text.size());
}

}  // namespace

void AccessLog::record(std::string_view client, std::string_view method, std::string_view path,
                       unsigned status, uint64_t bytes, uint64_t micros) const {
  if (!enabled_) return;
  char line[3 * kMaxField + 96];
  const int length = std::snprintf(line, sizeof line, "%.*s %.*s %.*s %u %" PRIu64 " %" PRIu64 "us\n",
                                   clip(client), client.data(), clip(method), method.data(),
                                   clip(path), path.data(), status, bytes, micros);
  if (length <= 0) return;
  const size_t size = static_cast<size_t>(length) < sizeof line ? length : sizeof line - 1;
  // A failed log write must not disturb serving.
  [[maybe_unused]] const ssize_t written = ::write(STDERR_FILENO, line, size);
}

}  // namespace ws::host
