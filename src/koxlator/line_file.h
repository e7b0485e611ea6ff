// The explanations reader's narrow view of one file: its lines, read through
// a fixed 1024-byte buffer, so that a longer line arrives as several
// consecutive pieces and reading never allocates.
//
// Thread-safety: one LineFile per thread.
#ifndef QUILLON_KOXLATOR_LINE_FILE_H_
#define QUILLON_KOXLATOR_LINE_FILE_H_

#include <cstdio>
#include <string>

namespace koxlator {

class LineFile {
 public:
  static constexpr int kLineBufferSize = 1024;

  LineFile() = default;
  ~LineFile();
  LineFile(const LineFile&) = delete;
  LineFile& operator=(const LineFile&) = delete;

  // Opens `path` for reading; false when it cannot, with errno set.
  [[nodiscard]] bool open(const std::string& path);
  // The next line with its line end (or the next piece of a long line); null
  // at the end of the file or on a read error. Valid until the next call.
  const char* readLine();

 private:
  std::FILE* file_ = nullptr;
  char buffer_[kLineBufferSize];
};

}  // namespace koxlator

#endif  // QUILLON_KOXLATOR_LINE_FILE_H_
