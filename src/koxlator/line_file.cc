#include "koxlator/line_file.h"

namespace koxlator {

LineFile::~LineFile() {
  if (file_ != nullptr) {
    std::fclose(file_);
  }
}

bool LineFile::open(const std::string& path) {
  if (file_ != nullptr) {
    std::fclose(file_);
  }
  file_ = std::fopen(path.c_str(), "r");
  return file_ != nullptr;
}

const char* LineFile::readLine() {
  if (file_ == nullptr) {
    return nullptr;
  }
  return std::fgets(buffer_, kLineBufferSize, file_);
}

}  // namespace koxlator
