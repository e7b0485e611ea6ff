#include "http_server.h"

#include <arpa/inet.h>
#include <sys/resource.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <string_view>
#include <vector>

#include "guarded_sockets.h"
#include "head_rules.h"
#include "request_head.h"
#include "url_mapping.h"
#include "ws_runtime/exchange.h"

namespace ws::host {

namespace {

using Clock = std::chrono::steady_clock;

constexpr int kListenBacklog = 1024;
constexpr unsigned kIdleTimeoutSeconds = 60;
// Per-connection memory for what the daemon sees of a head (the request line
// without its query, and the fields it needs: the stream guard keeps the
// rest apart), its record of each field and the answer's headers. The daemon
// clears this memory for every request, so a larger pool costs throughput
// on every answer.
constexpr size_t kConnectionMemory = 8 * 1024;
// The largest request head served: request line, query included, and
// headers with their line ends.
constexpr size_t kMaxHeadBytes = 16 * 1024;
// Buffers that grew past this for one large request are given back afterwards.
constexpr size_t kKeptBufferBytes = 64 * 1024;
// The daemon keeps a record of each field in the connection's memory, and
// needs room beside the head for the answer's status line and headers; a
// head that would leave less is answered 431 by the host, never left without
// an answer by the daemon.
constexpr size_t kFieldRecordBytes = 64;
constexpr size_t kAnswerRoom = 2048;
constexpr HeadLimits kHeadLimits{kMaxHeadBytes, kConnectionMemory - kAnswerRoom, kFieldRecordBytes};
// When crowded, a connection that moves slower than this over its current
// head or body, once it has had the grace period, may be shut to make room.
constexpr Pace kMinimumPace{1024, 100, kIdleTimeoutSeconds * 1000};
// A connection the host closes while its client may still send: at most
// this long, and this much, is read and dropped after the answer.
// (How many may linger at once comes from the descriptors left: Options.)
constexpr LingerLimits kLinger{std::chrono::milliseconds(2000), 64 * 1024, 0};
constexpr std::chrono::milliseconds kEvictionCheck{100};

constexpr std::string_view kNotFound = "Not Found\n";
constexpr std::string_view kBadRequest = "Bad Request: malformed escape or invalid UTF-8 in URL\n";
constexpr std::string_view kTooLarge = "Payload Too Large\n";
constexpr std::string_view kUnavailable = "Service Unavailable\n";
constexpr std::string_view kConflictingContentType =
    "Bad Request: conflicting Content-Type headers\n";

// Dotted decimal by hand: every connection needs its client's address, and
// inet_ntop formats IPv4 through sprintf, at ten times the cost.
std::string dottedQuad(const in_addr& address) {
  const auto* bytes = reinterpret_cast<const unsigned char*>(&address.s_addr);
  char text[16];
  char* at = text;
  for (int i = 0; i < 4; ++i) {
    const unsigned value = bytes[i];
    if (value >= 100) *at++ = static_cast<char>('0' + value / 100);
    if (value >= 10) *at++ = static_cast<char>('0' + value / 10 % 10);
    *at++ = static_cast<char>('0' + value % 10);
    *at++ = '.';
  }
  return std::string(text, static_cast<size_t>(at - text - 1));
}

std::string numericAddress(const sockaddr* address) {
  char text[INET6_ADDRSTRLEN] = "";
  if (address == nullptr) return text;
  if (address->sa_family == AF_INET) {
    return dottedQuad(reinterpret_cast<const sockaddr_in*>(address)->sin_addr);
  } else if (address->sa_family == AF_INET6) {
    inet_ntop(AF_INET6, &reinterpret_cast<const sockaddr_in6*>(address)->sin6_addr, text,
              sizeof text);
  }
  return text;
}

// Leaves URL and query escapes in place, so that the path is split before it
// is decoded and "%2F" can stand inside a variable.
size_t keepEscapes(void*, MHD_Connection*, char* text) { return std::strlen(text); }

// One walk over the headers the daemon parsed, in the order received, with
// the sizes it already knows.
MHD_Result collectHeader(void* into, MHD_ValueKind, const char* key, size_t keySize,
                         const char* value, size_t valueSize) {
  static_cast<RequestHead*>(into)->add(std::string_view(key, keySize),
                                       value != nullptr ? std::string_view(value, valueSize)
                                                        : std::string_view());
  return MHD_YES;
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
  int fd = -1;
  StreamGuard guard{kHeadLimits};
  uint64_t requests = 0;  // heads the daemon has passed on
  std::string client;
  ConnectionTable::Entry entry;
  // The request in progress: its query as the stream guard kept it, what
  // the host reads of its headers, and its answer.
  std::string query;
  StreamGuard::HeadNotes notes;
  std::vector<RawParameter> parameters;
  RequestHead head;
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
  }

  void finish() {
    notes = {};
    query.clear();
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

HttpServer::HttpServer(const Options& options, const Plugin& plugin, const AccessLog& log)
    : options_(options),
      plugin_(plugin),
      log_(log),
      connections_(highMark(options.maxConnections), lowMark(options.maxConnections),
                   kMinimumPace),
      lingering_(LingerLimits{kLinger.time, kLinger.bytes, options.lingeringSockets},
                 [this] { connections_.check(); }, kEvictionCheck) {}

HttpServer::~HttpServer() {
  beginStop();
  finishStop(std::chrono::milliseconds(0));
}

bool HttpServer::start(std::string& error) {
  rlimit descriptors{};
  getrlimit(RLIMIT_NOFILE, &descriptors);
  guarded_sockets::reserve(descriptors.rlim_cur == RLIM_INFINITY ? 1u << 20 : descriptors.rlim_cur);
  if (!lingering_.start()) {
    error = "cannot start the lingering-close thread";
    return false;
  }
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
      {MHD_OPTION_CONNECTION_LIMIT, options_.maxConnections, nullptr},
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
  lingering_.stop();
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

void HttpServer::onConnection(void* self, MHD_Connection* connection, void** socketContext,
                              MHD_ConnectionNotificationCode event) {
  auto& server = *static_cast<HttpServer*>(self);
  if (event == MHD_CONNECTION_NOTIFY_CLOSED) {
    auto* state = static_cast<Connection*>(*socketContext);
    *socketContext = nullptr;
    if (state == nullptr) return;
    server.connections_.remove(state->entry);
    guarded_sockets::detach(state->fd);
    // The daemon closes its descriptor next; a copy keeps the connection
    // open for an orderly close while the client may still be sending.
    if (state->fd >= 0 && !state->guard.peerClosed()) {
      const int copy = ::fcntl(state->fd, F_DUPFD_CLOEXEC, 0);
      if (copy >= 0) server.lingering_.adopt(copy);
    }
    delete state;
    return;
  }
  // Only the allocation happens here, inside the daemon's accept loop; the
  // address is written out when the connection's first request needs it.
  auto* state = new (std::nothrow) Connection();
  *socketContext = state;
  const MHD_ConnectionInfo* info =
      MHD_get_connection_info(connection, MHD_CONNECTION_INFO_CONNECTION_FD);
  if (info == nullptr) return;
  // A connection that cannot be guarded or recorded is not served.
  if (state == nullptr || !guarded_sockets::attach(info->connect_fd, state->guard)) {
    ::shutdown(info->connect_fd, SHUT_RDWR);
    return;
  }
  state->fd = info->connect_fd;
  server.connections_.add(state->entry, state->fd, &state->guard.receivedCounter());
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
    state->entry.reading();
    ++state->requests;
    state->notes = state->guard.takeNotes(state->requests, state->query);
    const Refusal refusal = state->guard.refusalFor(state->requests);
    if (log_.enabled()) {
      state->started = Clock::now();
      const bool standIn = refusal != Refusal::kNone && refusal != Refusal::kMalformedChunk;
      state->method = standIn ? state->guard.refusedMethod() : method;
      state->path = standIn ? state->guard.refusedTarget() : url;
    }
    inFlight_.enter();
    *requestContext = state;
    if (refusal != Refusal::kNone) return refuse(connection, *state, refusal);
    return checkHead(connection, *state);
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
  state->entry.busy();
  const Refusal refusal = state->guard.refusalFor(state->requests);
  if (refusal != Refusal::kNone) return refuse(connection, *state, refusal);
  return respond(connection, *state, url, method);
}

MHD_Result HttpServer::refuse(MHD_Connection* connection, Connection& state, Refusal refusal) {
  return sendText(connection, state, refusalStatus(refusal), refusalText(refusal), true);
}

MHD_Result HttpServer::checkHead(MHD_Connection* connection, Connection& state) {
  // A request whose head was complete before a stop began is served; one
  // completed after it is not.
  if (stopping_) return sendText(connection, state, MHD_HTTP_SERVICE_UNAVAILABLE, kUnavailable, true);
  state.head.clear();
  if (state.notes.hostReads) {
    MHD_get_connection_values_n(connection, MHD_HEADER_KIND, &collectHeader, &state.head);
  }
  switch (state.head.verdict()) {
    case HeadVerdict::kAccepted:
      break;
    case HeadVerdict::kConflictingContentType:
      return sendText(connection, state, MHD_HTTP_BAD_REQUEST, kConflictingContentType, true);
  }
  // Answered before the daemon says "100 Continue", so the body is never
  // sent. Without the expectation the body is read off instead (below), so
  // that the connection stays usable.
  uint64_t declared = 0;
  if (state.head.expectsContinue() && state.head.declaredLength(declared) &&
      declared > options_.maxBody) {
    return sendText(connection, state, MHD_HTTP_CONTENT_TOO_LARGE, kTooLarge, true);
  }
  return MHD_YES;
}

MHD_Result HttpServer::respond(MHD_Connection* connection, Connection& state, const char* url,
                               const char* method) {
  if (state.bodyTooLarge) return sendText(connection, state, MHD_HTTP_CONTENT_TOO_LARGE, kTooLarge);

  if (state.notes.hasQuery) {
    splitQuery(state.query, state.parameters);
  } else {
    state.parameters.clear();
  }
  ws::runtime::Exchange& exchange = threadExchange();
  // A fresh identifier and empty buffers on every way out, so an identifier
  // kept by a plug-in past its Run is refused from then on.
  struct Renew {
    ws::runtime::Exchange& exchange;
    ~Renew() { exchange.reset(); }
  } renew{exchange};
  ws::runtime::ExchangeRequest& request = exchange.request();
  switch (mapUrl(options_.service, url, state.parameters, request)) {
    case Mapping::kNotFound:
      return sendText(connection, state, MHD_HTTP_NOT_FOUND, kNotFound);
    case Mapping::kBadRequest:
      return sendText(connection, state, MHD_HTTP_BAD_REQUEST, kBadRequest);
    case Mapping::kMapped:
      break;
  }
  if (const std::string_view* type = state.head.contentType()) request.setContentType(*type);
  if (const std::string_view* accept = state.head.accept()) request.setAccept(*accept);
  return runPlugin(connection, state, method, exchange);
}

MHD_Result HttpServer::runPlugin(MHD_Connection* connection, Connection& state,
                                 const char* method, ws::runtime::Exchange& exchange) {
  ws::runtime::ExchangeRequest& request = exchange.request();
  // HEAD is answered as GET would be; the daemon leaves the body out. The
  // exchange starts out as a GET, so the usual request writes nothing here.
  const std::string_view asked =
      std::strcmp(method, MHD_HTTP_METHOD_HEAD) == 0 ? MHD_HTTP_METHOD_GET : method;
  if (asked != request.method) request.method.assign(asked);
  // Widened into the exchange's own storage, kept from request to request.
  request.clientAddress.resize(state.client.size());
  std::copy(state.client.begin(), state.client.end(), request.clientAddress.begin());
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
  state.entry.waiting();
  inFlight_.leave();
}

}  // namespace ws::host
