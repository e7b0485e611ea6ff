// One line per answered request, on stderr or in a file:
//   <client> <method> <path> <status> <bytes> <microseconds>us
// Bytes of the client's fields that could forge a line or drive a terminal
// (control bytes, DEL, the backslash itself, and bytes that are not part of
// valid UTF-8) are written as \xHH.
//
// Thread-safety: record() and reopen() may be called from several threads
// at once; each line leaves in one write so lines never interleave.
#ifndef WS_RUNTIME_HOST_ACCESS_LOG_H_
#define WS_RUNTIME_HOST_ACCESS_LOG_H_

#include <cstdint>
#include <string>
#include <string_view>

namespace ws::host {

class AccessLog {
 public:
  // Logs to stderr.
  explicit AccessLog(bool enabled) : enabled_(enabled) {}
  // Logs to `path`, appending. False with `error` set when it cannot be
  // opened.
  [[nodiscard]] bool openFile(const std::string& path, std::string& error);
  ~AccessLog();
  AccessLog(const AccessLog&) = delete;
  AccessLog& operator=(const AccessLog&) = delete;

  bool enabled() const { return enabled_; }
  void record(std::string_view client, std::string_view method, std::string_view path,
              unsigned status, uint64_t bytes, uint64_t micros) const;
  // Opens the file's path again (after a rotation renamed it), lines in
  // flight going to one or the other; false with `error` set when it cannot
  // be opened, logging then goes on into the old file. Nothing to do on
  // stderr.
  [[nodiscard]] bool reopen(std::string& error);

 private:
  bool enabled_;
  std::string path_;
  int fd_ = 2;
};

// `text` with the bytes named above escaped; at most `limit` bytes of the
// input are taken. escapeInto() writes into `out`, which has room for
// 4 * limit bytes, and returns the bytes written.
size_t escapeInto(std::string_view text, size_t limit, char* out);
std::string escapeForLog(std::string_view text, size_t limit);

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_ACCESS_LOG_H_
