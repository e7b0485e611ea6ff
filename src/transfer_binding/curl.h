// The transfer library's programming interface, bound at run time instead of
// linked: the first load() opens the TLS initialisation library
// "libkosslinit.so.13" (component "kossl"), brings TLS up through its
// KOSSLINIT_Init, and only then opens the transfer library
// "libcurlimpl.so.13" (component "kocurl") and binds the function table.
// Where the libraries are searched: see ko/dsc/osdep/shared_library.h
// (KO_DSC_LIBRARY_PATH, then the system loader).
//
// Thread-safety: the loaded state is process-wide; load() may be called from
// any number of threads at once and loads at most once. functions() and
// lastFailure() wait for a load in progress, so they never see a table that
// is still being bound.
#ifndef QUILLON_TRANSFER_BINDING_CURL_H_
#define QUILLON_TRANSFER_BINDING_CURL_H_

#include <string>

#include "transfer_binding/curl_functions.h"

namespace ko::chronos::shared {

class iCURL {
 public:
  virtual ~iCURL() = default;

  // Loads the libraries and binds the table unless a table already exists.
  // True when every entry is bound. False when a library did not open, an
  // entry point was missing, TLS initialisation answered 0, or a name did
  // not resolve; in the last case the table is published anyway with the
  // entries before the failing name bound and the rest null, and later calls
  // do not try again. Failures to allocate and other unexpected exceptions
  // pass through.
  [[nodiscard]] virtual bool load() = 0;

  // The process's table, or null while none is published.
  virtual const CurlFunctions* functions() const = 0;

  // Why the last load() answered false ("" when it did not): the library,
  // call and loader text of the failure.
  virtual std::string lastFailure() const = 0;
};

// Every tCURL shares the one process-wide binding.
class tCURL : public iCURL {
 public:
  bool load() override;
  const CurlFunctions* functions() const override;
  std::string lastFailure() const override;
};

}  // namespace ko::chronos::shared

#endif  // QUILLON_TRANSFER_BINDING_CURL_H_
