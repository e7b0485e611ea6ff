#include "support/answer_log.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <stdexcept>
#include <string>

namespace quillon::test_support {

void logAnswer(const HttpRequest& request, const HttpResponse& response) {
  const char* path = std::getenv("QUILLON_ANSWER_LOG");
  if (path == nullptr || *path == '\0') return;
  std::string record = request.method + " " + request.target + "\n" + std::to_string(response.status) + "\n";
  for (const auto& [name, value] : response.headers) record += name + ": " + value + "\n";
  record += "\n" + response.body;
  record = "answer " + std::to_string(record.size()) + "\n" + record;
  // One write to a file opened for appending: concurrent clients' records
  // never interleave.
  const int fd = ::open(path, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0644);
  if (fd < 0) throw std::runtime_error(std::string("open ") + path + ": " + std::strerror(errno));
  const ssize_t written = ::write(fd, record.data(), record.size());
  const int writeError = errno;
  ::close(fd);
  if (written != static_cast<ssize_t>(record.size())) {
    throw std::runtime_error(std::string("write ") + path + ": " + std::strerror(writeError));
  }
}

}  // namespace quillon::test_support
