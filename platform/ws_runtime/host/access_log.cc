#include "access_log.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cinttypes>
#include <cstdio>
#include <cstring>

namespace ws::host {

namespace {

// Fields are logged up to this many input bytes so that a line stays one
// write.
constexpr size_t kMaxField = 1024;
// An escaped byte takes four.
constexpr size_t kMaxEscapedField = 4 * kMaxField;

// The length of the valid UTF-8 sequence of more than one byte at the start
// of `text`, 0 when there is none (overlong forms and surrogates included).
size_t utf8SequenceLength(std::string_view text) {
  const auto byte = [&](size_t i) { return static_cast<unsigned char>(text[i]); };
  const unsigned char lead = byte(0);
  size_t length;
  unsigned char low = 0x80;
  unsigned char high = 0xBF;
  if (lead >= 0xC2 && lead <= 0xDF) {
    length = 2;
  } else if (lead >= 0xE0 && lead <= 0xEF) {
    length = 3;
    if (lead == 0xE0) low = 0xA0;
    if (lead == 0xED) high = 0x9F;
  } else if (lead >= 0xF0 && lead <= 0xF4) {
    length = 4;
    if (lead == 0xF0) low = 0x90;
    if (lead == 0xF4) high = 0x8F;
  } else {
    return 0;
  }
  if (text.size() < length) return 0;
  if (byte(1) < low || byte(1) > high) return 0;
  for (size_t i = 2; i < length; ++i) {
    if (byte(i) < 0x80 || byte(i) > 0xBF) return 0;
  }
  return length;
}

int openForAppend(const std::string& path) {
  return ::open(path.c_str(), O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0644);
}

}  // namespace

size_t escapeInto(std::string_view text, size_t limit, char* out) {
  if (text.size() > limit) text = text.substr(0, limit);
  static constexpr char kHex[] = "0123456789ABCDEF";
  char* const begin = out;
  for (size_t i = 0; i < text.size();) {
    const auto c = static_cast<unsigned char>(text[i]);
    if (c >= 0x20 && c < 0x7F && c != '\\') {
      *out++ = static_cast<char>(c);
      ++i;
      continue;
    }
    const size_t sequence = c >= 0x80 ? utf8SequenceLength(text.substr(i)) : 0;
    if (sequence > 0) {
      std::memcpy(out, text.data() + i, sequence);
      out += sequence;
      i += sequence;
      continue;
    }
    *out++ = '\\';
    *out++ = 'x';
    *out++ = kHex[c >> 4];
    *out++ = kHex[c & 0xF];
    ++i;
  }
  return static_cast<size_t>(out - begin);
}

std::string escapeForLog(std::string_view text, size_t limit) {
  std::string out(4 * (text.size() < limit ? text.size() : limit), '\0');
  out.resize(escapeInto(text, limit, out.data()));
  return out;
}

bool AccessLog::openFile(const std::string& path, std::string& error) {
  const int fd = openForAppend(path);
  if (fd < 0) {
    error = "cannot open the access log " + path + ": " + std::strerror(errno);
    return false;
  }
  if (fd_ != STDERR_FILENO) ::close(fd_);
  fd_ = fd;
  path_ = path;
  return true;
}

AccessLog::~AccessLog() {
  if (fd_ != STDERR_FILENO) ::close(fd_);
}

bool AccessLog::reopen(std::string& error) {
  if (path_.empty()) return true;
  const int fd = openForAppend(path_);
  if (fd < 0) {
    error = "cannot reopen the access log " + path_ + ": " + std::strerror(errno);
    return false;
  }
  // dup2 swaps the file under the same descriptor in one step, so a line
  // being written on another thread goes whole into one file or the other.
  const bool swapped = ::dup2(fd, fd_) >= 0;
  if (!swapped) error = std::string("cannot reopen the access log: ") + std::strerror(errno);
  ::close(fd);
  return swapped;
}

void AccessLog::record(std::string_view client, std::string_view method, std::string_view path,
                       unsigned status, uint64_t bytes, uint64_t micros) const {
  if (!enabled_) return;
  char line[3 * kMaxEscapedField + 96];
  size_t length = 0;
  for (const std::string_view field : {client, method, path}) {
    length += escapeInto(field, kMaxField, line + length);
    line[length++] = ' ';
  }
  const int tail = std::snprintf(line + length, sizeof line - length,
                                 "%u %" PRIu64 " %" PRIu64 "us\n", status, bytes, micros);
  if (tail <= 0) return;
  length += static_cast<size_t>(tail) < sizeof line - length ? tail : sizeof line - length - 1;
  // A failed log write must not disturb serving.
  [[maybe_unused]] const ssize_t written = ::write(fd_, line, length);
}

}  // namespace ws::host
