#include "ko/dsc/osdep/shared_library.h"

#include <dlfcn.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>

#include "ko/dsc/osdep/os_exception.h"

namespace ko::dsc::osdep {
namespace {

constexpr const char* kFile = "ko/dsc/osdep/SharedLibrary";

std::string loaderText() {
  const char* text = dlerror();
  return text != nullptr ? text : "unknown loader error";
}

}  // namespace

LibrarySearchPath LibrarySearchPath::fromEnvironment() {
  std::vector<std::string> directories;
  const char* value = std::getenv(kVariable);
  if (value != nullptr) {
    std::string rest = value;
    for (size_t start = 0; start <= rest.size();) {
      const size_t end = std::min(rest.find(':', start), rest.size());
      if (end > start) {
        directories.push_back(rest.substr(start, end - start));
      }
      start = end + 1;
    }
  }
  return LibrarySearchPath(std::move(directories));
}

std::string LibrarySearchPath::locate(const std::string& component, const std::string& file) const {
  for (const std::string& directory : directories_) {
    for (const std::string& candidate :
         {directory + "/" + component + "/" + file, directory + "/" + file}) {
      if (::access(candidate.c_str(), F_OK) == 0) {
        return candidate;
      }
    }
  }
  return file;
}

SharedLibrary::SharedLibrary(const std::wstring& component, const std::wstring& name, int major,
                             const LibrarySearchPath& searchPath, const IConv& iconv)
    : component_(iconv.narrow(component)),
      path_(searchPath.locate(component_, "lib" + iconv.narrow(name) + ".so." +
                                              std::to_string(major))) {
  handle_ = dlopen(path_.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (handle_ == nullptr) {
    loaderError_ = "dlopen(" + path_ + "): " + loaderText();
  }
}

SharedLibrary::~SharedLibrary() {
  if (handle_ != nullptr) {
    dlclose(handle_);
  }
}

void* SharedLibrary::symbol(const std::string& symbol) const {
  if (handle_ == nullptr) {
    throw OSException(kFile, __LINE__,
                      "dlsym(" + symbol + "): library " + component_ + " not loaded: " + loaderError_);
  }
  dlerror();  // a null answer is only an error if the loader says so
  void* address = dlsym(handle_, symbol.c_str());
  if (address == nullptr) {
    const char* text = dlerror();
    throw OSException(kFile, __LINE__,
                      "dlsym(" + symbol + ") in " + path_ + ": " +
                          (text != nullptr ? text : "symbol has a null value"));
  }
  return address;
}

}  // namespace ko::dsc::osdep
