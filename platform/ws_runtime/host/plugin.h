// A plug-in library loaded at run time, with its five entry points resolved
// by the service prefix ("<service>Init", ...).
//
// Thread-safety: run() may be called from several threads at once; the
// caller keeps init() and finalize() apart from every run().
#ifndef WS_RUNTIME_HOST_PLUGIN_H_
#define WS_RUNTIME_HOST_PLUGIN_H_

#include <cstdint>
#include <memory>
#include <string>

#include "ws_runtime/request_info.h"

namespace ws::host {

class Plugin {
 public:
  using VoidFn = void (*)();
  using RunFn = void (*)(ws::runtime::RequestInfo*, uint32_t);

  // Loads `path` and resolves the entry points. On failure returns null and
  // sets `error` to a line naming the failed call, the path or symbol, and
  // the loader's text.
  static std::unique_ptr<Plugin> load(const std::string& path, const std::string& service,
                                      std::string& error);
  // Unloads the library.
  ~Plugin();
  Plugin(const Plugin&) = delete;
  Plugin& operator=(const Plugin&) = delete;

  void init() const { init_(); }
  void run(ws::runtime::RequestInfo* info, uint32_t id) const { run_(info, id); }
  void pause() const { pause_(); }
  void resume() const { resume_(); }
  void finalize() const { finalize_(); }

 private:
  explicit Plugin(void* handle) : handle_(handle) {}

  void* handle_;
  VoidFn init_ = nullptr;
  RunFn run_ = nullptr;
  VoidFn pause_ = nullptr;
  VoidFn resume_ = nullptr;
  VoidFn finalize_ = nullptr;
};

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_PLUGIN_H_
