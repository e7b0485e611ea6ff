// One request handed to a plug-in in-process, without HTTP: the caller fills
// in what a client would have sent, calls the plug-in's Run entry point with
// info() and id(), and reads back what the plug-in answered through the C
// request interface. The HTTP host uses the same object for every request it
// routes, so a plug-in cannot tell the two apart.
//
//   ws::runtime::Exchange exchange;
//   exchange.request().method = "GET";
//   exchange.request().command = U"resources";
//   quillonRun(exchange.info(), exchange.id());
//   exchange.response().code;  // 200 when the plug-in set none
//
// An Exchange keeps its buffers between runs: reset() makes it ready for the
// next request under a new identifier without allocating.
//
// Thread-safety: one Exchange is used by one thread at a time; distinct
// Exchanges may run at once on different threads.
#ifndef WS_RUNTIME_EXCHANGE_H_
#define WS_RUNTIME_EXCHANGE_H_

#include <cstdint>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "ws_runtime/request_info.h"

namespace ws::runtime {

// What the client sent. Headers are bytes as received; the URL parts are
// already percent- and UTF-8-decoded.
struct WS_RUNTIME_API ExchangeRequest {
  std::string method = "GET";
  bool hasContentType = false;
  std::string contentType;
  bool hasAccept = false;
  std::string accept;
  std::u32string path;
  std::u32string clientAddress;
  std::u32string command;
  std::vector<std::pair<std::u32string, std::u32string>> variables;
  std::string body;

  // Defines a variable; an earlier one of the same name keeps precedence.
  void addVariable(std::u32string name, std::u32string value);
  // Both copy into the existing storage, so a reused request does not
  // allocate for headers of the size it has seen before.
  void setContentType(std::string_view value);
  void setAccept(std::string_view value);
};

// What the plug-in answered.
struct ExchangeResponse {
  static constexpr int32_t kDefaultCode = 200;
  int32_t code = kDefaultCode;  // the last code set
  bool hasMimeType = false;     // whether any MIME type was set
  std::string mimeType;         // the last one set
  std::string body;             // every write, in order
  uint32_t flushes = 0;
};

namespace detail {
class Slot;
}

class WS_RUNTIME_API Exchange {
 public:
  // Registers a request with a fresh identifier. Throws std::runtime_error
  // when the host already runs its maximum number of requests at once
  // (kMaxInFlight).
  Exchange();
  ~Exchange();
  Exchange(const Exchange&) = delete;
  Exchange& operator=(const Exchange&) = delete;

  static constexpr uint32_t kMaxInFlight = 1024;

  uint32_t id() const noexcept;
  RequestInfo* info() noexcept;
  ExchangeRequest& request() noexcept;
  ExchangeResponse& response() noexcept;

  // Empties request and response (keeping their storage) and issues a new
  // identifier; the old one stops being valid.
  void reset() noexcept;

 private:
  detail::Slot* slot_;
};

}  // namespace ws::runtime

#endif  // WS_RUNTIME_EXCHANGE_H_
