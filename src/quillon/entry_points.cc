// The five exports over the process-wide lifecycle, built from the concrete
// classes of the plug-in.
#include <iostream>
#include <locale>
#include <memory>
#include <string>
#include <vector>

#include "error_record/status.h"
#include "ko/dsc/c_locale.h"
#include "kopdm_clientapi/api_wrapper.h"
#include "kosysq/stdpath.h"
#include "kosdtools_timescales/timescale_helpers.h"
#include "quillon/plugin_lifecycle.h"
#include "quillon/quillon.h"
#include "quillon/resource_manager.h"
#include "transfer_binding/curl.h"

namespace {

quillon::GraphFactories productionGraph() {
  quillon::GraphFactories factories;
  factories.wrapper = [] { return std::make_shared<kopendulo::ApiWrapper>(); };
  factories.helpers = [](std::shared_ptr<kopendulo::ApiWrapperInterface> wrapper) {
    return std::make_shared<kosdtools::pendulo::TimescaleHelpers>(std::move(wrapper));
  };
  factories.resourceManager =
      [](std::shared_ptr<kosdtools::pendulo::TimescaleHelpersInterface> helpers) {
        return std::make_shared<quillon::ResourceManager>(helpers);
      };
  return factories;
}

// The service slot; its destructor empties the slot when the library is
// unloaded, as Finalize does.
quillon::PluginLifecycle lifecycle(productionGraph());

// The rest of the process-wide state is settled while the library loads, in
// this order, so that no request pays for it or races to build it.

// The standard directory table; a relocation failure is reported to the
// table's later users, not here.
bool buildStandardDirectories() {
  koerr::Status ignored;
  kosysq::standardDirectories().directories(ignored);
  koerr::releaseText(ignored);
  return true;
}
[[maybe_unused]] const bool standardDirectoriesBuilt = buildStandardDirectories();

// The names the segments of a timescale URI are bound to, in order.
[[maybe_unused]] const std::vector<std::string> uriKeyNames = {
    "remoteHost", "webService", "resource", "plugin", "type", "name"};

[[maybe_unused]] const std::locale& textLocale = ko::dsc::cLocale();

// Bound on first use only: no request of the plug-in transfers anything.
[[maybe_unused]] ko::chronos::shared::tCURL transferBinding;

}  // namespace

extern "C" {

void quillonInit() { lifecycle.init(); }

void quillonRun(ws::runtime::RequestInfo* _info, uint32_t _requestID) {
  lifecycle.run(_info, _requestID);
}

void quillonPause() {}

void quillonResume() {}

void quillonFinalize() { lifecycle.finalize(); }

}  // extern "C"
