#include "requirements_store.h"

#include <cctype>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <utility>

namespace kosdlib {
namespace {

constexpr const char* kCleared = "null";
constexpr size_t kLongestName = 255;

// One name per URI, and no two URIs with the same one: '/' becomes '.',
// every byte outside [A-Za-z0-9_-] (the '.' included) becomes %XX.
std::string fileNameFor(const std::string& uri) {
  static const char kHex[] = "0123456789ABCDEF";
  std::string name = "device";
  for (const unsigned char c : uri) {
    if (c == '/') {
      name += '.';
    } else if (std::isalnum(c) || c == '_' || c == '-') {
      name += static_cast<char>(c);
    } else {
      name += '%';
      name += kHex[c >> 4];
      name += kHex[c & 0xF];
    }
  }
  return name + ".json";
}

std::string describe(const FileFailure& failure) {
  return std::string(failure.call) + " " + failure.file + ": " + std::strerror(failure.error);
}

}  // namespace

std::string stateDirectoryFromEnvironment() {
  if (const char* own = std::getenv("KOSDLIB_STATE_DIRECTORY")) return own;
  // The service manager lists one directory per StateDirectory= entry.
  const char* managed = std::getenv("STATE_DIRECTORY");
  if (managed == nullptr) return "";
  const char* colon = std::strchr(managed, ':');
  return colon ? std::string(managed, colon) : std::string(managed);
}

RequirementsStore::RequirementsStore(std::shared_ptr<FileSystemInterface> files,
                                     std::string path)
    : file_(std::move(files), std::move(path)) {}

std::unique_ptr<RequirementsStore> RequirementsStore::open(
    std::shared_ptr<FileSystemInterface> files, const std::string& directory,
    const std::string& uri, std::string* problem) {
  const std::string name = fileNameFor(uri);
  // Room for the temporary and set-aside names beside it.
  if (name.size() + 20 > kLongestName) {
    *problem = "The device URI is too long to name the device's state file.";
    return nullptr;
  }
  return std::unique_ptr<RequirementsStore>(
      new RequirementsStore(std::move(files), directory + "/" + name));
}

std::optional<Requirements> RequirementsStore::load(const Log& log) {
  std::string text;
  FileFailure failure;
  std::string reason;
  switch (file_.read(&text, &failure)) {
    case StateFile::Found::kNothing:
      return std::nullopt;
    case StateFile::Found::kUnreadable:
      reason = "cannot be read (" + describe(failure) + ")";
      break;
    case StateFile::Found::kContent: {
      while (!text.empty() && text.back() == '\n') text.pop_back();
      if (text == kCleared) return std::nullopt;
      Requirements stored;
      RequirementsProblem problem;
      if (parseRequirements(text, &stored, &problem)) return stored;
      reason = "cannot be parsed (" + problem.message + " At byte " +
               std::to_string(problem.offset) + ".)";
      break;
    }
  }
  std::string aside;
  if (file_.moveAside(&aside, &failure)) {
    log("kosdlib: the state file " + path() + " " + reason + "; moved aside to " + aside +
        "; the device starts without coherency requirements");
  } else {
    log("kosdlib: the state file " + path() + " " + reason + " and cannot be moved aside (" +
        describe(failure) + "); the device starts without coherency requirements and refuses "
        "new ones until the file is moved away");
    blocked_ = failure;
  }
  return std::nullopt;
}

bool RequirementsStore::save(const Requirements* requirements, FileFailure* failure) {
  if (blocked_) {
    *failure = *blocked_;
    return false;
  }
  return file_.replace((requirements ? requirements->text : std::string(kCleared)) + "\n",
                       failure);
}

}  // namespace kosdlib
