// A host that unloads the plug-in and loads it again, as hosts do on a
// reconfiguration, while its request threads live on: each unload must take
// the plug-in out of the process, with its memory and descriptors.
#include <dirent.h>
#include <dlfcn.h>
#include <malloc.h>
#include <unistd.h>
#if defined(__SANITIZE_ADDRESS__)
// The sanitizer's own count (its header ships with Clang, not with GCC).
extern "C" size_t __sanitizer_get_current_allocated_bytes();
#endif

#include <climits>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <functional>
#include <mutex>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "support/host_process.h"
#include "support/scratch.h"
#include "ws_runtime/exchange.h"

namespace {

using RunFn = void (*)(ws::runtime::RequestInfo*, uint32_t);
using VoidFn = void (*)();

// Threads that outlive every load of the plug-in, as a host's pool does.
class LivingPool {
 public:
  explicit LivingPool(int size) {
    for (int i = 0; i < size; ++i) threads_.emplace_back([this] { work(); });
  }
  ~LivingPool() {
    {
      std::lock_guard<std::mutex> hold(lock_);
      stop_ = true;
    }
    wake_.notify_all();
    for (auto& thread : threads_) thread.join();
  }
  // Runs `task` once on every thread and returns when all have.
  void onEach(const std::function<void()>& task) {
    std::unique_lock<std::mutex> hold(lock_);
    task_ = &task;
    pending_ = static_cast<int>(threads_.size());
    ++round_;
    wake_.notify_all();
    done_.wait(hold, [&] { return pending_ == 0; });
    task_ = nullptr;
  }

 private:
  void work() {
    uint64_t seen = 0;
    std::unique_lock<std::mutex> hold(lock_);
    for (;;) {
      wake_.wait(hold, [&] { return stop_ || round_ != seen; });
      if (stop_) return;
      seen = round_;
      const std::function<void()>* task = task_;
      hold.unlock();
      (*task)();
      hold.lock();
      if (--pending_ == 0) done_.notify_all();
    }
  }

  std::mutex lock_;
  std::condition_variable wake_, done_;
  const std::function<void()>* task_ = nullptr;
  uint64_t round_ = 0;
  int pending_ = 0;
  bool stop_ = false;
  std::vector<std::thread> threads_;
};

std::string realPath(const char* path) {
  char resolved[PATH_MAX];
  return realpath(path, resolved) != nullptr ? resolved : path;
}

bool mapped(const std::string& file) {
  std::ifstream maps("/proc/self/maps");
  std::string line;
  while (std::getline(maps, line)) {
    if (line.find(file) != std::string::npos) return true;
  }
  return false;
}

long residentKiB() {
  std::ifstream status("/proc/self/status");
  std::string line;
  while (std::getline(status, line)) {
    if (line.rfind("VmRSS:", 0) == 0) return std::strtol(line.c_str() + 6, nullptr, 10);
  }
  return -1;
}

// Bytes the program holds on the heap. Under AddressSanitizer the resident
// size also grows by the shadow of every new mapping of the library, which
// the sanitizer keeps, so the heap is what shows memory a load left behind.
size_t heapInUse() {
#if defined(__SANITIZE_ADDRESS__)
  return __sanitizer_get_current_allocated_bytes();
#else
  return mallinfo2().uordblks;
#endif
}

int openDescriptors() {
  int count = 0;
  DIR* dir = opendir("/proc/self/fd");
  while (dir != nullptr && readdir(dir) != nullptr) ++count;
  if (dir != nullptr) closedir(dir);
  return count;
}

// The requests that touch every per-request path: the listing reads each
// TR's attributes, a timescale and the device, and a PUT.
void serveRequests(RunFn run) {
  struct Request {
    const char* method;
    const char32_t* command;
    std::vector<std::pair<std::u32string, std::u32string>> variables;
    const char* body;
  } requests[] = {
      {"GET", U"resources", {}, ""},
      {"GET", U"timescales", {{U"plugin", U"pendulo"}, {U"type", U"tr0"}, {U"name", U"00-80-2F-FF-FE-12-34-56"}}, ""},
      {"GET", U"timescales", {{U"plugin", U"pendulo"}, {U"type", U"tr9"}, {U"name", U"x"}}, ""},
      {"GET", U"syncableDevices", {{U"plugin", U"pendulo"}, {U"type", U"timekeeper"}, {U"name", U"genericTk"}}, ""},
      {"PUT", U"syncableDevices", {{U"plugin", U"pendulo"}, {U"type", U"timekeeper"}, {U"name", U"genericTk"}}, "{\"maxOffsetNanos\":1000}"},
  };
  ws::runtime::Exchange exchange;
  for (const Request& r : requests) {
    exchange.request().method = r.method;
    exchange.request().command = r.command;
    for (const auto& [name, value] : r.variables) exchange.request().addVariable(name, value);
    exchange.request().body = r.body;
    run(exchange.info(), exchange.id());
    EXPECT_FALSE(exchange.response().body.empty());
    exchange.reset();
  }
}

TEST(Unload, HundredCyclesOnLivingThreadsLeaveNothingBehind) {
  answers_test::ScratchDir scratch;
  // A scenario file, so that every load also starts and stops its watch.
  std::ifstream example(QUILLON_SCENARIO_EXAMPLE);
  std::stringstream text;
  text << example.rdbuf();
  ASSERT_FALSE(text.str().empty());
  setenv("KOPDM_SIM_SCENARIO", scratch.write("scenario.json", text.str()).c_str(), 1);
  const std::string plugin = realPath(quillon::test_support::kQuillonPluginPath);
  LivingPool pool(4);
  constexpr int kCycles = 100;
  constexpr int kSettled = 10;  // allocators and caches warm up first
  struct Growth {
    long residentKiB;
    long long heapBytes;
    int descriptors;
  };
  // What the loader itself (and the sanitizer's records of each mapping)
  // keeps of a load that ran nothing, to tell it from what the plug-in keeps.
  const auto cycles = [&](bool serve) {
    Growth settled{};
    for (int cycle = 0; cycle < kCycles; ++cycle) {
      SCOPED_TRACE(cycle);
      void* handle = dlopen(plugin.c_str(), RTLD_NOW | RTLD_LOCAL);
      EXPECT_NE(handle, nullptr) << dlerror();
      if (handle == nullptr) return settled;
      if (serve) {
        const auto init = reinterpret_cast<VoidFn>(dlsym(handle, "quillonInit"));
        const auto run = reinterpret_cast<RunFn>(dlsym(handle, "quillonRun"));
        const auto finalize = reinterpret_cast<VoidFn>(dlsym(handle, "quillonFinalize"));
        init();
        pool.onEach([run] { serveRequests(run); });
        finalize();
      }
      EXPECT_EQ(dlclose(handle), 0);
      EXPECT_FALSE(mapped(plugin)) << "still mapped after dlclose";
      EXPECT_FALSE(mapped("/libkopdm_clientapi.so")) << "the time service stayed";
      if (cycle == kSettled) {
        settled = {residentKiB(), static_cast<long long>(heapInUse()), openDescriptors()};
      }
    }
    return Growth{residentKiB() - settled.residentKiB,
                  static_cast<long long>(heapInUse()) - settled.heapBytes,
                  openDescriptors() - settled.descriptors};
  };
  const Growth bare = cycles(false);
  const Growth served = cycles(true);
  std::printf("over %d cycles: resident %+ld KiB (bare loads %+ld), heap %+lld bytes (bare %+lld), "
              "descriptors %+d\n",
              kCycles - kSettled, served.residentKiB, bare.residentKiB, served.heapBytes,
              bare.heapBytes, served.descriptors);
  EXPECT_EQ(served.descriptors, 0);
  // A load that kept its per-thread state or its service would leave at
  // least a snapshot of the scenario (kilobytes) behind each time. What is
  // allowed is the C library's list of exit handlers: a served load
  // registers more of them (statics made on first use), and the list grows
  // by a block now and then, about 130 bytes a load on average.
  EXPECT_LE(served.heapBytes - bare.heapBytes, 512LL * (kCycles - kSettled));
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
  // Either sanitizer keeps the shadow of every address range the library was
  // mapped at, more of it the more of the library ran: its resident size
  // grows by itself, so only the heap and descriptors are judged here.
#else
  EXPECT_LE(served.residentKiB, bare.residentKiB + 1024);
#endif
  unsetenv("KOPDM_SIM_SCENARIO");
}

}  // namespace
