// One line per answered request on stderr:
//   <client> <method> <path> <status> <bytes> <microseconds>us
//
// Thread-safety: record() may be called from several threads at once; each
// line leaves in one write so lines never interleave.
#ifndef WS_RUNTIME_HOST_ACCESS_LOG_H_
#define WS_RUNTIME_HOST_ACCESS_LOG_H_

#include <cstdint>
#include <string_view>

namespace ws::host {

class AccessLog {
 public:
  explicit AccessLog(bool enabled) : enabled_(enabled) {}

  bool enabled() const { return enabled_; }
  void record(std::string_view client, std::string_view method, std::string_view path,
              unsigned status, uint64_t bytes, uint64_t micros) const;

 private:
  bool enabled_;
};

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_ACCESS_LOG_H_
