// A shared library opened at run time by component and name, and the lookup
// of its symbols.
//
// Where a library is found: its file is "lib<name>.so.<major>". Each directory
// of the search path is tried in order, first as "<dir>/<component>/<file>"
// then as "<dir>/<file>"; the first that exists is the one opened (a file
// that exists but does not load is a failure, not a reason to look further).
// When none exists, the bare file name goes to the system loader, which
// searches LD_LIBRARY_PATH, the caller's run path and the loader cache. The
// search path of a process comes from the environment variable
// KO_DSC_LIBRARY_PATH (directories separated by ':'; empty entries skipped).
//
// Thread-safety: a SharedLibrary is immutable after construction; symbol()
// may be called from several threads.
#ifndef QUILLON_KO_DSC_OSDEP_SHARED_LIBRARY_H_
#define QUILLON_KO_DSC_OSDEP_SHARED_LIBRARY_H_

#include <string>
#include <vector>

#include "ko/dsc/osdep/iconv.h"

namespace ko::dsc::osdep {

class LibrarySearchPath {
 public:
  static constexpr const char* kVariable = "KO_DSC_LIBRARY_PATH";

  explicit LibrarySearchPath(std::vector<std::string> directories = {})
      : directories_(std::move(directories)) {}
  // Splits the value of kVariable; no variable gives an empty path.
  static LibrarySearchPath fromEnvironment();

  // The path to hand to the loader for `file` of `component`.
  std::string locate(const std::string& component, const std::string& file) const;

 private:
  std::vector<std::string> directories_;
};

class SharedLibrary {
 public:
  // Opens the library at once (all symbols bound now, kept local to it).
  // Opening does not raise: isLoaded() tells, and loaderError() keeps the
  // loader's text. Component and name are converted with `iconv`; raises
  // exception::InvalidSequence when they are not representable.
  SharedLibrary(const std::wstring& component, const std::wstring& name, int major,
                const LibrarySearchPath& searchPath, const IConv& iconv = IConv());
  SharedLibrary(const SharedLibrary&) = delete;
  SharedLibrary& operator=(const SharedLibrary&) = delete;
  ~SharedLibrary();

  bool isLoaded() const noexcept { return handle_ != nullptr; }
  // The path given to the loader.
  const std::string& path() const noexcept { return path_; }
  // "dlopen(<path>): <loader text>" when the open failed, else "".
  const std::string& loaderError() const noexcept { return loaderError_; }

  // The address of `symbol`. Raises OSException naming the symbol, the
  // library and the loader's text when the library is not loaded or does
  // not define it (a symbol whose value is null counts as not defined).
  void* symbol(const std::string& symbol) const;

 private:
  std::string component_;
  std::string path_;
  std::string loaderError_;
  void* handle_ = nullptr;
};

}  // namespace ko::dsc::osdep

#endif  // QUILLON_KO_DSC_OSDEP_SHARED_LIBRARY_H_
