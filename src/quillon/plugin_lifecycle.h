// The plug-in's process-wide state behind its five entry points: the service
// slot (one owning pointer to the quillon::Service) and the weak singleton of
// the time-service wrapper, with what Init, Run and Finalize do to them. How
// each object of the graph is made is passed in, so that the lifecycle can be
// watched with substitutes.
//
// Thread-safety: run() may be called from several threads at once; init() and
// finalize() must not overlap each other or any run() (the host keeps them
// apart). No lock is taken.
#ifndef QUILLON_QUILLON_PLUGIN_LIFECYCLE_H_
#define QUILLON_QUILLON_PLUGIN_LIFECYCLE_H_

#include <cstdint>
#include <functional>
#include <memory>

#include "kopdm_clientapi/api_wrapper_interface.h"
#include "kosdtools_timescales/timescale_helpers_interface.h"
#include "quillon/resource_manager_interface.h"
#include "quillon/service.h"
#include "ws_runtime/request_info.h"

namespace quillon {

// Makers of the object graph, bottom-up; each may throw.
struct GraphFactories {
  std::function<std::shared_ptr<kopendulo::ApiWrapperInterface>()> wrapper;
  std::function<std::shared_ptr<kosdtools::pendulo::TimescaleHelpersInterface>(
      std::shared_ptr<kopendulo::ApiWrapperInterface>)>
      helpers;
  std::function<std::shared_ptr<ResourceManagerInterface>(
      std::shared_ptr<kosdtools::pendulo::TimescaleHelpersInterface>)>
      resourceManager;
};

class PluginLifecycle {
 public:
  explicit PluginLifecycle(GraphFactories factories) : factories_(std::move(factories)) {}
  // Empties the slot as finalize() does.
  ~PluginLifecycle() { finalize(); }
  PluginLifecycle(const PluginLifecycle&) = delete;
  PluginLifecycle& operator=(const PluginLifecycle&) = delete;

  // Builds a new graph and puts its service into the slot, deleting the one
  // it held. The wrapper is reused while an earlier graph still holds it.
  // Failures derived from std::exception are recorded and discarded: the slot
  // then keeps what it held.
  void init();
  // Answers one request through the service. Failures derived from
  // std::exception are recorded and discarded (the service has already
  // answered the client); a null `info` answers nothing. With an empty slot
  // the request is answered with 503 and no body.
  void run(ws::runtime::RequestInfo* info, uint32_t requestID);
  // Deletes the service; does nothing when the slot is empty.
  void finalize() noexcept;

  // For observers: the service in the slot and the wrapper singleton (null
  // once no graph holds it).
  const Service* service() const { return slot_.get(); }
  std::shared_ptr<kopendulo::ApiWrapperInterface> wrapper() const { return wrapper_.lock(); }

 private:
  std::shared_ptr<kopendulo::ApiWrapperInterface> sharedWrapper();

  GraphFactories factories_;
  std::weak_ptr<kopendulo::ApiWrapperInterface> wrapper_;
  std::unique_ptr<Service> slot_;
};

}  // namespace quillon

#endif  // QUILLON_QUILLON_PLUGIN_LIFECYCLE_H_
