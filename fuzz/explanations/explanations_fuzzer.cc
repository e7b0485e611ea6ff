// Feeds arbitrary explanation files to the reader: the first four bytes pick
// the code looked up, the rest is the file. Whatever the file holds, the
// reader must give either a clean text or an empty one with a record that
// parses, and never more text than the file had.
#include <cjson/cJSON.h>
#include <stdlib.h>
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>

#include "koxlator/errors_parser.h"

namespace {

const std::string& scratchFile() {
  static const std::string path = [] {
    char pattern[] = "/tmp/explanations-fuzz-XXXXXX";
    const int fd = mkstemp(pattern);
    if (fd < 0) {
      std::perror("mkstemp");
      std::abort();
    }
    close(fd);
    return std::string(pattern);
  }();
  return path;
}

void removeScratchFile() { std::remove(scratchFile().c_str()); }

// The path exists before the handler is registered, so it outlives it.
const bool kCleanUpAtExit = !scratchFile().empty() && std::atexit(removeScratchFile) == 0;

void check(bool condition, const char* what) {
  if (!condition) {
    std::fprintf(stderr, "broken: %s\n", what);
    std::abort();
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  (void)kCleanUpAtExit;
  if (size < 4) {
    return 0;
  }
  int32_t code;
  std::memcpy(&code, data, sizeof code);
  std::FILE* file = std::fopen(scratchFile().c_str(), "wb");
  if (file == nullptr) {
    return 0;
  }
  std::fwrite(data + 4, 1, size - 4, file);
  std::fclose(file);

  koerr::Status status;
  std::string text = "stale";
  koxlator::readExplanationFile(scratchFile(), code, text, status);
  check(text.size() <= size - 4, "text longer than the file");
  if (status.code < 0) {
    check(text.empty(), "text kept after an error");
    cJSON* record = cJSON_Parse(status.json);
    check(record != nullptr, "record does not parse");
    cJSON_Delete(record);
  } else {
    check(status.code == 0 && status.json == nullptr, "record without an error");
    check(text.empty() || (text.back() != '\n' && text.back() != '\r'), "line end kept");
  }
  koerr::releaseText(status);
  return 0;
}
