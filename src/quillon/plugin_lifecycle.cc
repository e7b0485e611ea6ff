#include "quillon/plugin_lifecycle.h"

#include <exception>

#include "error_record/error.h"
#include "quillon/request.h"
#include "ws_runtime/ws_runtime.h"

namespace quillon {

namespace {

// Init and Run report under the service's name; the lines are part of the
// published records.
constexpr const char* kFile = "quillon/Service";
constexpr int32_t kLineInit = 45;
constexpr int32_t kLineRun = 80;
constexpr int32_t kServiceUnavailable = 503;

// The record is built and released: nobody reads it, but a debugger stopped
// here sees the same record as every other failure.
void discardInternalError(int32_t line, const char* what) noexcept {
  try {
    koerr::Exception discarded =
        koerr::Error(koerr::kQuillonInternalSoftwareError, kFile, line, "kosyncdomain_debug")
            .add("message", what)
            .take();
  } catch (const std::exception&) {
    // Out of memory while recording: there is nothing left to tell.
  }
}

}  // namespace

std::shared_ptr<kopendulo::ApiWrapperInterface> PluginLifecycle::sharedWrapper() {
  // Held until the lock below, or the new wrapper would die before use.
  std::shared_ptr<kopendulo::ApiWrapperInterface> created;
  if (wrapper_.expired()) {
    created = factories_.wrapper();
    wrapper_ = created;
  }
  try {
    return std::shared_ptr<kopendulo::ApiWrapperInterface>(wrapper_);
  } catch (const std::bad_weak_ptr&) {
    return nullptr;
  }
}

void PluginLifecycle::init() {
  try {
    std::shared_ptr<kopendulo::ApiWrapperInterface> wrapper = sharedWrapper();
    std::shared_ptr<kosdtools::pendulo::TimescaleHelpersInterface> helpers =
        factories_.helpers(std::move(wrapper));
    std::shared_ptr<ResourceManagerInterface> resourceManager =
        factories_.resourceManager(std::move(helpers));
    slot_.reset(new Service(resourceManager));
  } catch (const std::exception& error) {
    discardInternalError(kLineInit, error.what());
  }
}

void PluginLifecycle::run(ws::runtime::RequestInfo* info, uint32_t requestID) {
  Service* service = slot_.get();
  if (service == nullptr) {
    SetHTTPResponseCode_KO_GXWS_(requestID, kServiceUnavailable);
    return;
  }
  try {
    std::unique_ptr<RequestInterface> request(new Request(info, requestID));
    koerr::StatusGuard status;
    service->handleRequest(request, status);
  } catch (const std::exception& error) {
    discardInternalError(kLineRun, error.what());
  }
}

void PluginLifecycle::finalize() noexcept { slot_.reset(); }

}  // namespace quillon
