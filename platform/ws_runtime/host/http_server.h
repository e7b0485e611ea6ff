// The HTTP/1.1 front of the host: a libmicrohttpd daemon (epoll, internal
// thread pool, keep-alive) that routes each request for the mounted service
// to the plug-in's Run entry point and sends back what it wrote.
//
// Thread-safety: start() and stop() from one controlling thread; requests are
// answered on the pool's threads.
#ifndef WS_RUNTIME_HOST_HTTP_SERVER_H_
#define WS_RUNTIME_HOST_HTTP_SERVER_H_

#include <atomic>
#include <chrono>
#include <cstdint>
#include <string>

#include <microhttpd.h>

#include "access_log.h"
#include "connection_table.h"
#include "head_rules.h"
#include "in_flight.h"
#include "lingering_close.h"
#include "options.h"
#include "plugin.h"
#include "ws_runtime/exchange.h"

namespace ws::host {

class HttpServer {
 public:
  HttpServer(const Options& options, const Plugin& plugin, const AccessLog& log);
  ~HttpServer();
  HttpServer(const HttpServer&) = delete;
  HttpServer& operator=(const HttpServer&) = delete;

  // Binds and starts serving. False with `error` set when the address cannot
  // be used.
  [[nodiscard]] bool start(std::string& error);
  // The bound port (useful with port 0).
  uint16_t port() const;
  // From now on every new request, on a new connection or a kept-alive one,
  // is answered 503 and its connection closed.
  void beginStop();
  // Lets the requests in progress finish for at most `grace`, then closes
  // every connection and joins the threads. No Run is active afterwards.
  void finishStop(std::chrono::milliseconds grace);

  class Connection;  // per-connection state, reused across keep-alive requests

  // Eviction of connections without progress starts at 15/16 of the limit
  // and makes room down to 7/8, so that the daemon always has room to
  // accept the next client.
  static size_t highMark(unsigned limit) { return limit - limit / 16; }
  static size_t lowMark(unsigned limit) { return limit - limit / 8; }

 private:
  MHD_Result answer(MHD_Connection* connection, const char* url, const char* method,
                    const char* uploadData, size_t* uploadSize, void** requestContext);
  // On the head's completion: refuses what must not reach the plug-in.
  MHD_Result checkHead(MHD_Connection* connection, Connection& state);
  MHD_Result refuse(MHD_Connection* connection, Connection& state, Refusal refusal);
  MHD_Result respond(MHD_Connection* connection, Connection& state, const char* url,
                     const char* method);
  MHD_Result runPlugin(MHD_Connection* connection, Connection& state, const char* method,
                       ws::runtime::Exchange& exchange);
  void requestDone(Connection& state);

  static MHD_Result onRequest(void* self, MHD_Connection* connection, const char* url,
                              const char* method, const char* version, const char* uploadData,
                              size_t* uploadSize, void** requestContext);
  static void onRequestDone(void* self, MHD_Connection* connection, void** requestContext,
                            MHD_RequestTerminationCode reason);
  static void onConnection(void* self, MHD_Connection* connection, void** socketContext,
                           MHD_ConnectionNotificationCode event);

  const Options& options_;
  const Plugin& plugin_;
  const AccessLog& log_;
  MHD_Daemon* daemon_ = nullptr;
  std::atomic<bool> stopping_{false};
  InFlight inFlight_;
  ConnectionTable connections_;
  LingeringClose lingering_;
};

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_HTTP_SERVER_H_
