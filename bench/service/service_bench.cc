// In-process cost of one GET "resources" through the plug-in's Run entry
// point, the host's request object and the platform stand-ins, without HTTP.
#include <benchmark/benchmark.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <string>

#include "quillon/quillon.h"
#include "ws_runtime/exchange.h"

namespace {

// Four masters: every TR is published, so each listing asks the time service
// for the TR list and three attributes of every TR.
std::string scenarioWithMasters(int count) {
  std::string trs;
  for (int i = 0; i < count; ++i) {
    if (i) trs += ',';
    trs += "\"tr" + std::to_string(i) + "\":{\"attrs\":{\"type\":\"IEEE 1588-2008\","
           "\"gmClockId\":\"00-80-2F-FF-FE-12-34-5" + std::to_string(i) + "\","
           "\"portState\":\"PTP_MASTER\"}}";
  }
  return "{\"apiVersion\":1,\"selectedTrId\":null,\"trs\":{" + trs + "}}";
}

class Scenario {
 public:
  explicit Scenario(const std::string& text) {
    char path[] = "/tmp/quillon-bench-XXXXXX.json";
    const int fd = mkstemps(path, 5);
    if (fd < 0 || write(fd, text.data(), text.size()) != static_cast<ssize_t>(text.size())) {
      std::perror("scenario");
      std::exit(1);
    }
    close(fd);
    path_ = path;
    setenv("KOPDM_SIM_SCENARIO", path_.c_str(), 1);
  }
  ~Scenario() {
    unsetenv("KOPDM_SIM_SCENARIO");
    unlink(path_.c_str());
  }

 private:
  std::string path_;
};

void runResources(ws::runtime::Exchange& exchange) {
  exchange.reset();
  exchange.request().method = "GET";
  exchange.request().command = U"resources";
  quillonRun(exchange.info(), exchange.id());
}

void BM_GetResourcesFourTimeReferences(benchmark::State& state) {
  // The time service reads its scenario path once per process.
  static Scenario scenario(scenarioWithMasters(4));
  quillonInit();
  ws::runtime::Exchange exchange;
  runResources(exchange);
  const std::string& body = exchange.response().body;
  if (exchange.response().code != 200 || body.find("tr3") == std::string::npos) {
    state.SkipWithError(("unexpected answer: " + body).c_str());
    quillonFinalize();
    return;
  }
  for (auto _ : state) {
    runResources(exchange);
    benchmark::DoNotOptimize(exchange.response().body.data());
  }
  state.counters["bytes"] = static_cast<double>(exchange.response().body.size());
  quillonFinalize();
}
BENCHMARK(BM_GetResourcesFourTimeReferences)->Unit(benchmark::kMicrosecond);

}  // namespace

BENCHMARK_MAIN();
