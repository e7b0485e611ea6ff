// The requests being run, by identifier. One process-wide table that the HTTP
// host, in-process callers and the C request interface share, which is why it
// lives in the runtime library rather than in the host executable.
//
// Thread-safety: acquire() and release() may be called from any thread; find()
// takes no lock, so the C functions cost a table index and a compare.
#ifndef WS_RUNTIME_SRC_REGISTRY_H_
#define WS_RUNTIME_SRC_REGISTRY_H_

#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "ws_runtime/exchange.h"
#include "ws_runtime/request_info.h"

namespace ws::runtime::detail {

// Into the string's existing storage: cheaper than assign() for the short
// values written on every request, which never alias the target.
inline void copyInto(std::string& to, std::string_view from) {
  to.clear();
  to.append(from);
}

// Each on cache lines of its own: the pool threads each run requests in a
// slot of their own, side by side in one array, and write to it on every
// request.
class alignas(64) Slot final : public RequestInfo {
 public:
  bool lookupVariable(const std::u32string& key, std::u32string& value) const override;
  const std::u32string& path() const override { return request.path; }
  const std::u32string& clientAddress() const override { return request.clientAddress; }
  const std::u32string& command() const override { return request.command; }

  uint32_t id() const noexcept { return id_.load(std::memory_order_relaxed); }
  void clear() noexcept;

  ExchangeRequest request;
  ExchangeResponse response;

 private:
  friend class Registry;
  std::atomic<uint32_t> id_{0};  // 0 while free
  uint32_t generation_ = 0;
};

class Registry {
 public:
  static Registry& instance();

  // A cleared slot under a new identifier, or null when all are in use.
  Slot* acquire();
  // Gives `slot` a new identifier in place (the old one becomes unknown).
  void renew(Slot& slot) noexcept;
  // Invalidates the slot's identifier and returns it to the free list.
  void release(Slot& slot) noexcept;
  // The slot running `id`, or null.
  Slot* find(uint32_t id) noexcept;

 private:
  Registry();

  static constexpr uint32_t kIndexBits = 10;
  static_assert((1u << kIndexBits) == Exchange::kMaxInFlight);
  static constexpr uint32_t kIndexMask = (1u << kIndexBits) - 1;

  std::unique_ptr<Slot[]> slots_;
  std::mutex freeLock_;
  std::vector<uint32_t> free_;
};

}  // namespace ws::runtime::detail

#endif  // WS_RUNTIME_SRC_REGISTRY_H_
