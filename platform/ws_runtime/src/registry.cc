#include "registry.h"

namespace ws::runtime {

RequestInfo::~RequestInfo() = default;

void ExchangeRequest::addVariable(std::u32string name, std::u32string value) {
  variables.emplace_back(std::move(name), std::move(value));
}

void ExchangeRequest::setContentType(std::string_view value) {
  hasContentType = true;
  detail::copyInto(contentType, value);
}

void ExchangeRequest::setAccept(std::string_view value) {
  hasAccept = true;
  detail::copyInto(accept, value);
}

namespace detail {

bool Slot::lookupVariable(const std::u32string& key, std::u32string& value) const {
  for (const auto& [name, text] : request.variables) {
    if (name == key) {
      value = text;
      return true;
    }
  }
  return false;
}

// Back to a fresh ExchangeRequest and ExchangeResponse, keeping the strings'
// storage so that a reused slot does not allocate.
void Slot::clear() noexcept {
  if (request.method != "GET") request.method.assign("GET");
  request.hasContentType = false;
  request.contentType.clear();
  request.hasAccept = false;
  request.accept.clear();
  request.path.clear();
  request.clientAddress.clear();
  request.command.clear();
  request.variables.clear();
  request.body.clear();
  response.code = ExchangeResponse::kDefaultCode;
  response.hasMimeType = false;
  response.mimeType.clear();
  response.body.clear();
  response.flushes = 0;
}

Registry& Registry::instance() {
  // Never destroyed: plug-ins may still call in while the process exits.
  static Registry* registry = new Registry();
  return *registry;
}

Registry::Registry() : slots_(new Slot[Exchange::kMaxInFlight]) {
  free_.reserve(Exchange::kMaxInFlight);
  // Lowest index on top, so that a quiet host keeps reusing the same slots.
  for (uint32_t i = Exchange::kMaxInFlight; i-- > 0;) free_.push_back(i);
}

Slot* Registry::acquire() {
  uint32_t index;
  {
    std::lock_guard<std::mutex> lock(freeLock_);
    if (free_.empty()) return nullptr;
    index = free_.back();
    free_.pop_back();
  }
  Slot& slot = slots_[index];
  slot.clear();
  renew(slot);
  return &slot;
}

void Registry::renew(Slot& slot) noexcept {
  const uint32_t index = static_cast<uint32_t>(&slot - slots_.get());
  // The generation makes a stale identifier unknown instead of naming the
  // slot's next request; it skips 0 so that no identifier is ever 0.
  slot.generation_ = (slot.generation_ + 1) & (~0u >> kIndexBits);
  if (slot.generation_ == 0) slot.generation_ = 1;
  slot.id_.store((slot.generation_ << kIndexBits) | index, std::memory_order_release);
}

void Registry::release(Slot& slot) noexcept {
  slot.id_.store(0, std::memory_order_release);
  const uint32_t index = static_cast<uint32_t>(&slot - slots_.get());
  std::lock_guard<std::mutex> lock(freeLock_);
  free_.push_back(index);
}

Slot* Registry::find(uint32_t id) noexcept {
  if (id == 0) return nullptr;
  Slot& slot = slots_[id & kIndexMask];
  return slot.id_.load(std::memory_order_acquire) == id ? &slot : nullptr;
}

}  // namespace detail
}  // namespace ws::runtime
