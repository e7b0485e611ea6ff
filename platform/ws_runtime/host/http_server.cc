#include "http_server.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <strings.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string_view>
#include <vector>

#include "url_mapping.h"
#include "ws_runtime/exchange.h"

namespace ws::host {

namespace {

using Clock = std::chrono::steady_clock;

constexpr int kListenBacklog = 1024;
constexpr unsigned kIdleTimeoutSeconds = 60;
// Per-connection memory for the request head and the answer's headers; heads
// of up to about 7 KiB fit. The daemon clears this memory for every request,
// so a larger pool costs throughput on every answer.
constexpr size_t kConnectionMemory = 8 * 1024;
// Buffers that grew past this for one large request are given back afterwards.
constexpr size_t kKeptBufferBytes = 64 * 1024;

constexpr std::string_view kNotFound = "Not Found\n";
constexpr std::string_view kBadRequest = "Bad Request: malformed escape or invalid UTF-8 in URL\n";
constexpr std::string_view kTooLarge = "Payload Too Large\n";
constexpr std::string_view kUnavailable = "Service Unavailable\n";

std::string numericAddress(const sockaddr* address) {
  char text[INET6_ADDRSTRLEN] = "";
  if (address == nullptr) return text;
  if (address->sa_family == AF_INET) {
    inet_ntop(AF_INET, &reinterpret_cast<const sockaddr_in*>(address)->sin_addr, text, sizeof text);
  } else if (address->sa_family == AF_INET6) {
    inet_ntop(AF_INET6, &reinterpret_cast<const sockaddr_in6*>(address)->sin6_addr, text,
              sizeof text);
  }
  return text;
}

// Leaves URL and query escapes in place, so that the path is split before it
// is decoded and "%2F" can stand inside a variable.
size_t keepEscapes(void*, MHD_Connection*, char* text) { return std::strlen(text); }

// What the plug-in may read of a request's head besides its path.
struct RequestHead {
  std::vector<RawParameter> query;
  const char* contentType = nullptr;
  const char* accept = nullptr;

  void clear() {
    query.clear();
    contentType = nullptr;
    accept = nullptr;
  }
};

// One walk over everything the daemon parsed; of two headers with one name
// the first counts, as with the daemon's own look-up.
MHD_Result collectHead(void* into, MHD_ValueKind kind, const char* key, const char* value) {
  auto& head = *static_cast<RequestHead*>(into);
  if (kind == MHD_GET_ARGUMENT_KIND) {
    head.query.push_back(RawParameter{key, value != nullptr ? value : ""});
    return MHD_YES;
  }
  // The first letter settles most headers (Host, User-Agent, ...) without a
  // whole comparison.
  switch (key[0] | 0x20) {
    case 'c':
      if (head.contentType == nullptr && strcasecmp(key, MHD_HTTP_HEADER_CONTENT_TYPE) == 0) {
        head.contentType = value;
      }
      break;
    case 'a':
      if (head.accept == nullptr && strcasecmp(key, MHD_HTTP_HEADER_ACCEPT) == 0) {
        head.accept = value;
      }
      break;
  }
  return MHD_YES;
}

// Keeps the query list's storage for the thread's next request.
const RequestHead& readHead(MHD_Connection* connection) {
  thread_local RequestHead head;
  head.clear();
  MHD_get_connection_values(connection,
                            static_cast<MHD_ValueKind>(MHD_HEADER_KIND | MHD_GET_ARGUMENT_KIND),
                            &collectHead, &head);
  return head;
}

// Each pool thread runs one request at a time, so it keeps one exchange for
// all of them: the registry's lock and the slot's memory are then touched by
// that thread alone instead of passing between cores on every request.
ws::runtime::Exchange& threadExchange() {
  thread_local ws::runtime::Exchange exchange;
  return exchange;
}

void shrinkIfLarge(std::string& buffer) {
  if (buffer.capacity() > kKeptBufferBytes) std::string().swap(buffer);
  buffer.clear();
}

}  // namespace

class HttpServer::Connection {
 public:
  std::string client;
  std::u32string clientWide;
  // The request in progress.
  Clock::time_point started;
  bool bodyTooLarge = false;
  std::string body;
  std::string output;
  std::string method;  // kept for the access log only
  std::string path;
  unsigned status = 0;
  size_t bytes = 0;

  void setClient(MHD_Connection* connection) {
    const MHD_ConnectionInfo* info =
        MHD_get_connection_info(connection, MHD_CONNECTION_INFO_CLIENT_ADDRESS);
    client = numericAddress(info != nullptr ? info->client_addr : nullptr);
    clientWide.assign(client.begin(), client.end());
  }

  void finish() {
    bodyTooLarge = false;
    shrinkIfLarge(body);
    shrinkIfLarge(output);
    status = 0;
    bytes = 0;
  }
};

namespace {

MHD_Result send(MHD_Connection* connection, HttpServer::Connection& state, unsigned status,
                std::string_view body, const char* mimeType, int32_t statusHeader = 0,
                bool close = false) {
  MHD_Response* response = MHD_create_response_from_buffer(
      body.size(), const_cast<char*>(body.data()), MHD_RESPMEM_PERSISTENT);
  if (response == nullptr) return MHD_NO;
  // A MIME type with characters that cannot stand in a header is left out
  // rather than failing the whole answer.
  if (mimeType != nullptr) MHD_add_response_header(response, MHD_HTTP_HEADER_CONTENT_TYPE, mimeType);
  if (statusHeader != 0) {
    MHD_add_response_header(response, "X-Status-Code", std::to_string(statusHeader).c_str());
  }
  if (close) MHD_add_response_header(response, MHD_HTTP_HEADER_CONNECTION, "close");
  const MHD_Result queued = MHD_queue_response(connection, status, response);
  MHD_destroy_response(response);
  state.status = status;
  state.bytes = body.size();
  return queued;
}

MHD_Result sendText(MHD_Connection* connection, HttpServer::Connection& state, unsigned status,
                    std::string_view text, bool close = false) {
  return send(connection, state, status, text, "text/plain; charset=utf-8", 0, close);
}

}  // namespace

HttpServer::~HttpServer() {
  beginStop();
  finishStop(std::chrono::milliseconds(0));
}

bool HttpServer::start(std::string& error) {
  const auto* address = reinterpret_cast<const sockaddr*>(&options_.address);
  const socklen_t length =
      address->sa_family == AF_INET6 ? sizeof(sockaddr_in6) : sizeof(sockaddr_in);
  const int fd = ::socket(address->sa_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
  if (fd < 0) {
    error = std::string("socket() failed: ") + std::strerror(errno);
    return false;
  }
  const int on = 1;
  ::setsockopt(fd, SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
  if (::bind(fd, address, length) != 0 || ::listen(fd, kListenBacklog) != 0) {
    error = "cannot listen on " + options_.listen + ": " + std::strerror(errno);
    ::close(fd);
    return false;
  }

  // The pool's threads accept for themselves, so a burst of new connections
  // lands on whichever thread is awake. Dealing them out evenly from a thread
  // of our own was tried and measured: it keeps both pool threads half-idle,
  // each sleeping and waking once every few requests, and on a small machine
  // where the clients share the cores that cost a quarter of the throughput.
  unsigned flags = MHD_USE_EPOLL_INTERNAL_THREAD | MHD_USE_ITC | MHD_USE_TURBO;
  if (!options_.quiet) flags |= MHD_USE_ERROR_LOG;
  std::vector<MHD_OptionItem> items = {
      {MHD_OPTION_LISTEN_SOCKET, fd, nullptr},
      {MHD_OPTION_NOTIFY_COMPLETED, reinterpret_cast<intptr_t>(&onRequestDone), this},
      {MHD_OPTION_NOTIFY_CONNECTION, reinterpret_cast<intptr_t>(&onConnection), this},
      {MHD_OPTION_UNESCAPE_CALLBACK, reinterpret_cast<intptr_t>(&keepEscapes), nullptr},
      {MHD_OPTION_CONNECTION_TIMEOUT, kIdleTimeoutSeconds, nullptr},
      {MHD_OPTION_CONNECTION_MEMORY_LIMIT, kConnectionMemory, nullptr},
  };
  if (options_.threads > 1) items.push_back({MHD_OPTION_THREAD_POOL_SIZE, options_.threads, nullptr});
  items.push_back({MHD_OPTION_END, 0, nullptr});
  daemon_ = MHD_start_daemon(flags, 0, nullptr, nullptr, &onRequest, this, MHD_OPTION_ARRAY,
                             items.data(), MHD_OPTION_END);
  if (daemon_ == nullptr) {
    error = "cannot start the HTTP daemon on " + options_.listen;
    ::close(fd);
    return false;
  }
  return true;
}

uint16_t HttpServer::port() const {
  const MHD_DaemonInfo* info = MHD_get_daemon_info(daemon_, MHD_DAEMON_INFO_BIND_PORT);
  return info != nullptr ? info->port : 0;
}

void HttpServer::beginStop() {
  // The listening socket stays with the daemon until it stops: taking it
  // away (quiescing) while the pool threads still watch it races with their
  // own removal of it, which the library treats as fatal. A client that
  // connects meanwhile gets a prompt 503 instead.
  if (daemon_ != nullptr) stopping_.store(true);
}

void HttpServer::finishStop(std::chrono::milliseconds grace) {
  if (daemon_ == nullptr) return;
  inFlight_.waitForNone(grace);
  MHD_stop_daemon(daemon_);
  daemon_ = nullptr;
}

MHD_Result HttpServer::onRequest(void* self, MHD_Connection* connection, const char* url,
                                 const char* method, const char*, const char* uploadData,
                                 size_t* uploadSize, void** requestContext) {
  // Nothing may unwind into the daemon's C frames: a request that cannot be
  // handled (out of memory, a plug-in throwing through Run, a full request
  // table) closes its connection instead.
  try {
    return static_cast<HttpServer*>(self)->answer(connection, url, method, uploadData, uploadSize,
                                                  requestContext);
  } catch (...) {
    return MHD_NO;
  }
}

void HttpServer::onRequestDone(void* self, MHD_Connection*, void** requestContext,
                               MHD_RequestTerminationCode) {
  if (*requestContext == nullptr) return;
  static_cast<HttpServer*>(self)->requestDone(*static_cast<Connection*>(*requestContext));
  *requestContext = nullptr;
}

void HttpServer::onConnection(void*, MHD_Connection*, void** socketContext,
                              MHD_ConnectionNotificationCode event) {
  if (event == MHD_CONNECTION_NOTIFY_CLOSED) {
    delete static_cast<Connection*>(*socketContext);
    *socketContext = nullptr;
    return;
  }
  // Only the allocation happens here, inside the daemon's accept loop; the
  // address is written out when the connection's first request needs it.
  *socketContext = new (std::nothrow) Connection();
}

MHD_Result HttpServer::answer(MHD_Connection* connection, const char* url, const char* method,
                              const char* uploadData, size_t* uploadSize, void** requestContext) {
  auto* state = static_cast<Connection*>(*requestContext);
  if (state == nullptr) {
    // First call: headers only. Answering here would make the daemon close
    // the connection, so the answer waits for the last call.
    const MHD_ConnectionInfo* info =
        MHD_get_connection_info(connection, MHD_CONNECTION_INFO_SOCKET_CONTEXT);
    state = info != nullptr ? static_cast<Connection*>(info->socket_context) : nullptr;
    if (state == nullptr) return MHD_NO;
    if (state->client.empty()) state->setClient(connection);
    if (log_.enabled()) {
      state->started = Clock::now();
      state->method = method;
      state->path = url;
    }
    inFlight_.enter();
    *requestContext = state;
    return MHD_YES;
  }
  if (*uploadSize != 0) {
    // The body is read off to its end even when it is too large, so the 413
    // reaches a client that is still sending and the connection stays usable.
    if (!state->bodyTooLarge) {
      if (state->body.size() + *uploadSize > options_.maxBody) {
        state->bodyTooLarge = true;
        state->body.clear();
      } else {
        state->body.append(uploadData, *uploadSize);
      }
    }
    *uploadSize = 0;
    return MHD_YES;
  }
  return respond(connection, *state, url, method);
}

MHD_Result HttpServer::respond(MHD_Connection* connection, Connection& state, const char* url,
                               const char* method) {
  if (stopping_) return sendText(connection, state, MHD_HTTP_SERVICE_UNAVAILABLE, kUnavailable, true);
  if (state.bodyTooLarge) return sendText(connection, state, MHD_HTTP_CONTENT_TOO_LARGE, kTooLarge);

  const RequestHead& head = readHead(connection);
  ws::runtime::Exchange& exchange = threadExchange();
  // A fresh identifier and empty buffers on every way out, so an identifier
  // kept by a plug-in past its Run is refused from then on.
  struct Renew {
    ws::runtime::Exchange& exchange;
    ~Renew() { exchange.reset(); }
  } renew{exchange};
  ws::runtime::ExchangeRequest& request = exchange.request();
  switch (mapUrl(options_.service, url, head.query, request)) {
    case Mapping::kNotFound:
      return sendText(connection, state, MHD_HTTP_NOT_FOUND, kNotFound);
    case Mapping::kBadRequest:
      return sendText(connection, state, MHD_HTTP_BAD_REQUEST, kBadRequest);
    case Mapping::kMapped:
      break;
  }
  if (head.contentType != nullptr) request.setContentType(head.contentType);
  if (head.accept != nullptr) request.setAccept(head.accept);
  return runPlugin(connection, state, method, exchange);
}

MHD_Result HttpServer::runPlugin(MHD_Connection* connection, Connection& state,
                                 const char* method, ws::runtime::Exchange& exchange) {
  ws::runtime::ExchangeRequest& request = exchange.request();
  request.method = method;
  request.clientAddress = state.clientWide;
  // Swapping keeps both buffers' storage for the connection's next request.
  request.body.swap(state.body);
  plugin_.run(exchange.info(), exchange.id());
  request.body.swap(state.body);

  ws::runtime::ExchangeResponse& response = exchange.response();
  state.output.swap(response.body);
  const char* mimeType = response.hasMimeType ? response.mimeType.c_str() : nullptr;
  const int32_t code = response.code;
  if (code >= 100 && code <= 599) {
    return send(connection, state, static_cast<unsigned>(code), state.output, mimeType);
  }
  return send(connection, state, MHD_HTTP_INTERNAL_SERVER_ERROR, state.output, mimeType, code);
}

void HttpServer::requestDone(Connection& state) {
  if (log_.enabled()) {
    log_.record(state.client, state.method, state.path, state.status, state.bytes,
                std::chrono::duration_cast<std::chrono::microseconds>(Clock::now() - state.started)
                    .count());
  }
  state.finish();
  inFlight_.leave();
}

}  // namespace ws::host
