// The five exports over the process-wide lifecycle, built from the concrete
// classes of the plug-in.
#include <iostream>
#include <memory>

#include "kopdm_clientapi/api_wrapper.h"
#include "kosdtools_timescales/timescale_helpers.h"
#include "quillon/plugin_lifecycle.h"
#include "quillon/quillon.h"
#include "quillon/resource_manager.h"

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
