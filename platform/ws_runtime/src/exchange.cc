#include "ws_runtime/exchange.h"

#include <stdexcept>

#include "registry.h"

namespace ws::runtime {

using detail::Registry;

Exchange::Exchange() : slot_(Registry::instance().acquire()) {
  if (slot_ == nullptr) {
    throw std::runtime_error("ws_runtime: too many requests in flight");
  }
}

Exchange::~Exchange() { Registry::instance().release(*slot_); }

uint32_t Exchange::id() const noexcept { return slot_->id(); }
RequestInfo* Exchange::info() noexcept { return slot_; }
ExchangeRequest& Exchange::request() noexcept { return slot_->request; }
ExchangeResponse& Exchange::response() noexcept { return slot_->response; }

void Exchange::reset() noexcept {
  slot_->clear();
  Registry::instance().renew(*slot_);
}

}  // namespace ws::runtime
