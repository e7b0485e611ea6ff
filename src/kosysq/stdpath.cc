#include "kosysq/stdpath.h"

#include <cstring>
#include <memory>
#include <new>

#include "error_record/constants.h"
#include "error_record/error.h"
#include "kodynlib/dynload.h"

namespace kosysq {
namespace {

struct LibraryCloser {
  void operator()(void* handle) const { kodynlib_unload(handle); }
};
using Library = std::unique_ptr<void, LibraryCloser>;

}  // namespace

const std::vector<std::pair<std::string, std::string>>& standardDirectoryDefaults() {
  static const std::vector<std::pair<std::string, std::string>> defaults = {
      {"prefixdir", "/usr"},
      {"execprefixdir", "/usr"},
      {"bindir", "/usr/bin"},
      {"sbindir", "/usr/sbin"},
      {"libdir", "/usr/lib"},
      {"lib32dir", "/usr/lib"},
      {"lib64dir", "/usr/lib64"},
      {"nativelibdir", "/usr/lib"},
      {"multiarchlibdir", "/usr/lib/arm-linux-gnueabi"},
      {"libexecdir", "/usr/libexec"},
      {"sharedstatedir", "/var/lib"},
      {"datarootdir", "/usr/share"},
      {"datadir", "/usr/share"},
      {"sysconfdir", "/etc"},
      {"localstatedir", "/var"},
      {"runstatedir", "/var/run"},
      {"includedir", "/usr/include"},
      {"docdir", "/usr/share/doc"},
      {"initddir", "/etc/init.d"},
  };
  return defaults;
}

StandardDirectories::StandardDirectories(const char* relocationLibrary)
    : directories_(standardDirectoryDefaults().begin(), standardDirectoryDefaults().end()) {
  // A missing relocation library is the normal case, so its failures are
  // dropped with this private record.
  koerr::Status loadStatus;
  Library library(kodynlib_load(relocationLibrary, kRelocationLoadFlags, &loadStatus));
  void* function = kodynlib_symbol(library.get(), kRelocationFunction, &loadStatus);
  koerr::releaseText(loadStatus);
  if (function != nullptr) {
    relocate(reinterpret_cast<GetRelocatedDirFn>(function));
  }
}

StandardDirectories::~StandardDirectories() { koerr::releaseText(status_); }

void StandardDirectories::relocate(GetRelocatedDirFn relocatedDir) {
  for (const auto& [name, unused] : standardDirectoryDefaults()) {
    if (status_.code < 0) {
      return;
    }
    std::unique_ptr<char[]> buffer(new (std::nothrow) char[kRelocationBufferSize]());
    if (!buffer) {
      koerr::Report(status_, koerr::koapalerr_memoryFull.code)
          .location("koapal/protons/cppNewDelete/memoryAllocation", 346);
      return;
    }
    const int answer = relocatedDir(name.c_str(), buffer.get(), kRelocationBufferSize);
    if (answer > 0) {
      // A library that fills the buffer to the brim gets no terminator from
      // us to rely on, so the text is bounded by the buffer.
      directories_[name] = std::string(buffer.get(), strnlen(buffer.get(), kRelocationBufferSize));
    } else if (answer < 0) {
      koerr::Report(status_, koerr::koapalerr_resourceNotFound.code);
    }
  }
}

const std::map<std::string, std::string>& StandardDirectories::directories(
    koerr::Status& status) const {
  koerr::copyStatusKeepSource(status, status_);
  return directories_;
}

std::string StandardDirectories::lookup(const std::string& name, koerr::Status& status) const {
  const auto& table = directories(status);
  const auto entry = table.find(name);
  return entry != table.end() ? entry->second : std::string();
}

const StandardDirectories& standardDirectories() {
  static const StandardDirectories table;
  return table;
}

}  // namespace kosysq
