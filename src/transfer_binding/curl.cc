#include "transfer_binding/curl.h"

#include <memory>
#include <mutex>

#include "ko/dsc/osdep/os_exception.h"
#include "ko/dsc/osdep/recursive_mutex.h"
#include "ko/dsc/osdep/shared_library.h"

namespace ko::chronos::shared {
namespace {

using ko::dsc::osdep::LibrarySearchPath;
using ko::dsc::osdep::OSException;
using ko::dsc::osdep::RecursiveMutex;
using ko::dsc::osdep::SharedLibrary;

constexpr int kMajor = 13;

// The process-wide binding. Libraries and table are never released: other
// code may hold entries of the table until the process ends, static
// destructors included, and the TLS library releases itself at exit.
struct Binding {
  RecursiveMutex mutex;
  std::unique_ptr<SharedLibrary> tlsLibrary;
  int (*tlsInit)() = nullptr;
  void (*tlsUninit)() = nullptr;
  bool tlsReady = false;  // KOSSLINIT_Init answered non-zero
  std::unique_ptr<SharedLibrary> transferLibrary;
  std::unique_ptr<CurlFunctions> table;
  bool complete = false;
  std::string failure;
};

Binding& binding() {
  static Binding* const state = new Binding;  // deliberately never destroyed
  return *state;
}

template <typename Function>
Function bind(const SharedLibrary& library, const char* symbol) {
  return reinterpret_cast<Function>(library.symbol(symbol));
}

std::unique_ptr<SharedLibrary> open(const wchar_t* component, const wchar_t* name,
                                    std::string& failure) {
  auto library = std::make_unique<SharedLibrary>(component, name, kMajor,
                                                 LibrarySearchPath::fromEnvironment());
  if (!library->isLoaded()) {
    failure = library->loaderError();
    library.reset();
  }
  return library;
}

// Opens the TLS initialisation library and binds both of its entry points;
// what succeeded is kept, so a later attempt resumes where this one stopped.
bool prepareTls(Binding& state) {
  if (!state.tlsLibrary) {
    state.tlsLibrary = open(L"kossl", L"kosslinit", state.failure);
    if (!state.tlsLibrary) {
      return false;
    }
  }
  try {
    if (state.tlsInit == nullptr) {
      state.tlsInit = bind<int (*)()>(*state.tlsLibrary, "KOSSLINIT_Init");
    }
    if (state.tlsUninit == nullptr) {
      state.tlsUninit = bind<void (*)()>(*state.tlsLibrary, "KOSSLINIT_Uninit");
    }
  } catch (const OSException& e) {
    state.failure = e.what();
    return false;
  }
  return true;
}

// Binds in table order and stops at the first name that does not resolve.
bool bindTable(const SharedLibrary& library, CurlFunctions& table, std::string& failure) {
  try {
#define KO_CURL_BIND(member, symbol) \
  table.member = bind<decltype(table.member)>(library, #symbol);
    KO_CURL_FUNCTION_TABLE(KO_CURL_BIND)
#undef KO_CURL_BIND
  } catch (const OSException& e) {
    failure = e.what();
    return false;
  }
  return true;
}

}  // namespace

bool tCURL::load() {
  Binding& state = binding();
  std::lock_guard<RecursiveMutex> hold(state.mutex);
  if (state.table) {
    return state.complete;
  }
  state.failure.clear();
  if (!prepareTls(state)) {
    return false;
  }
  if (!state.tlsReady) {
    state.tlsReady = state.tlsInit() != 0;
    if (!state.tlsReady) {
      state.failure = "KOSSLINIT_Init answered 0: TLS initialisation failed";
      return false;
    }
  }
  state.transferLibrary = open(L"kocurl", L"curlimpl", state.failure);
  if (!state.transferLibrary) {
    return false;
  }
  // Published before binding and kept when binding stops part-way: what was
  // bound stays usable, and a broken library is not reopened on every call.
  state.table = std::make_unique<CurlFunctions>();
  state.complete = bindTable(*state.transferLibrary, *state.table, state.failure);
  return state.complete;
}

const CurlFunctions* tCURL::functions() const {
  Binding& state = binding();
  std::lock_guard<RecursiveMutex> hold(state.mutex);
  return state.table.get();
}

std::string tCURL::lastFailure() const {
  Binding& state = binding();
  std::lock_guard<RecursiveMutex> hold(state.mutex);
  return state.failure;
}

}  // namespace ko::chronos::shared
