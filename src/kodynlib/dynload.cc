#include "kodynlib/dynload.h"

#include <dlfcn.h>

#include "error_record/constants.h"
#include "error_record/error.h"

namespace {

constexpr const char* kFile = "kodynlib/dynload";
constexpr int kLoadLine = 64;
constexpr int kSymbolLine = 139;

bool holdsError(const koerr::Status* status) { return status != nullptr && status->code < 0; }

// `loaderText` must be the text fetched right after the failing call: any
// later loader call would replace it.
void reportFailure(koerr::Status* status, int line, const char* debug, const char* subjectKey,
                   const char* subject, const char* loaderText) {
  if (status == nullptr) {
    return;
  }
  koerr::Report report(*status, koerr::koapalerr_invalidParameter, kFile, line);
  report.open("kodynlib_debug")
      .add("debug", debug)
      .add(subjectKey, subject != nullptr ? subject : "")
      .close();
  report.open("internal_error").add("api", "dlerror");
  // The loader may have nothing to say (a null handle to dlsym, say); an
  // absent member tells that more honestly than an empty text.
  if (loaderText != nullptr) {
    report.add("string", loaderText);
  }
  report.close();
}

}  // namespace

void* kodynlib_load(const char* file, int flags, koerr::Status* status) {
  if (holdsError(status)) {
    return nullptr;
  }
  dlerror();  // drop any stale text so the one read below is ours
  void* handle = dlopen(file, flags);
  if (handle == nullptr) {
    const char* loaderText = dlerror();
    reportFailure(status, kLoadLine, "failed to kodynlib_load library", "path", file, loaderText);
  }
  return handle;
}

void* kodynlib_symbol(void* handle, const char* name, koerr::Status* status) {
  if (holdsError(status)) {
    return nullptr;
  }
  dlerror();
  void* address = nullptr;
  const char* loaderText = nullptr;
  // A null handle would mean the global scope to dlsym, which is never what
  // a caller holding a failed load wants.
  if (handle != nullptr && name != nullptr) {
    address = dlsym(handle, name);
    loaderText = dlerror();
  }
  if (address == nullptr) {
    reportFailure(status, kSymbolLine, "failed to get symbol", "kodynlib_symbol", name, loaderText);
  }
  return address;
}

void kodynlib_unload(void* handle) {
  if (handle != nullptr) {
    dlclose(handle);
  }
}
