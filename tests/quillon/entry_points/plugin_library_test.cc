// The built libquillon.so.1 as a host loads it: its exports and its lifecycle
// over the platform stand-ins. Served by ws-runtime without flags, it is the
// host's default plug-in (RealTransfer.ExampleClientListsThePluginsResources).
#include <dlfcn.h>

#include <gtest/gtest.h>

#include <string>
#include <thread>

#include "support/host_process.h"
#include "ws_runtime/exchange.h"

namespace {

using quillon::test_support::kQuillonPluginPath;
constexpr const char* kMediaType = "vnd.ko.syncDomain.v0/json; charset=utf-8";

class LoadedPlugin {
 public:
  LoadedPlugin() : handle_(dlopen(kQuillonPluginPath, RTLD_NOW | RTLD_LOCAL)) {
    if (handle_ == nullptr) throw std::runtime_error(dlerror());
    init = symbol<void (*)()>("quillonInit");
    run = symbol<void (*)(ws::runtime::RequestInfo*, uint32_t)>("quillonRun");
    pause = symbol<void (*)()>("quillonPause");
    resume = symbol<void (*)()>("quillonResume");
    finalize = symbol<void (*)()>("quillonFinalize");
  }
  ~LoadedPlugin() { dlclose(handle_); }

  void (*init)();
  void (*run)(ws::runtime::RequestInfo*, uint32_t);
  void (*pause)();
  void (*resume)();
  void (*finalize)();

 private:
  template <typename Fn>
  Fn symbol(const char* name) {
    void* found = dlsym(handle_, name);
    if (found == nullptr) throw std::runtime_error(std::string("missing ") + name);
    return reinterpret_cast<Fn>(found);
  }
  void* handle_;
};

// GET /quillon/resources in-process: "code|mime|body".
std::string getResources(const LoadedPlugin& plugin) {
  ws::runtime::Exchange exchange;
  exchange.request().method = "GET";
  exchange.request().command = U"resources";
  exchange.request().setAccept(kMediaType);
  plugin.run(exchange.info(), exchange.id());
  return std::to_string(exchange.response().code) + "|" + exchange.response().mimeType + "|" +
         exchange.response().body;
}

// The plug-in runs on a thread of its own that ends before the process does,
// as under a host whose pool threads answer the requests. It matters for the
// leak check at exit: GCC 12's LeakSanitizer takes a dynamic TLS block of a
// dlopen'ed library that happens to start 16 bytes into a page for an old
// glibc layout, reads a bogus range from the allocator's header and crashes
// scanning it; it only scans threads that are still alive.
TEST(PluginLibrary, LifecycleOverThePlatformStandIns) {
  LoadedPlugin plugin;
  std::thread([&plugin] {
    EXPECT_EQ(getResources(plugin), "503||") << "before Init";
    plugin.init();
    const std::string answer = getResources(plugin);
    EXPECT_EQ(answer.rfind(std::string("200|") + kMediaType + "|{\"error\":{\"success\":true,", 0),
              0u)
        << answer;
    EXPECT_NE(answer.find("/quillon/syncableDevices/pendulo/timekeeper/genericTk"),
              std::string::npos);
    plugin.pause();
    EXPECT_EQ(getResources(plugin), answer);
    plugin.resume();
    plugin.init();  // replaces the graph
    EXPECT_EQ(getResources(plugin), answer);
    plugin.run(nullptr, 0);
    plugin.finalize();
    plugin.finalize();
    EXPECT_EQ(getResources(plugin), "503||");
  }).join();
}

}  // namespace
