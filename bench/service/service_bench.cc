// In-process cost of one GET "resources" through the plug-in's Run entry
// point, the host's request object and the platform stand-ins, without HTTP.
#include <benchmark/benchmark.h>

#include <string>

#include "quillon/quillon.h"
#include "scenario_file.h"
#include "ws_runtime/exchange.h"

namespace {

void runResources(ws::runtime::Exchange& exchange) {
  exchange.reset();
  exchange.request().method = "GET";
  exchange.request().command = U"resources";
  quillonRun(exchange.info(), exchange.id());
}

void BM_GetResourcesFourTimeReferences(benchmark::State& state) {
  // The time service reads its scenario path once per process.
  static bench::ScenarioFile scenario(bench::scenarioWithMasters(4));
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
