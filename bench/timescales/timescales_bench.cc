// The cost of building the timescale list against the stand-in time service,
// as the plug-in does on each request, for growing numbers of TRs.
#include <benchmark/benchmark.h>
#include <stdlib.h>
#include <unistd.h>

#include <cstdio>
#include <fstream>
#include <memory>
#include <string>

#include "kopdm_clientapi/api_wrapper.h"
#include "kosdtools_timescales/timescale_helpers.h"

namespace {

std::string scenarioPath() {
  static const std::string path = [] {
    char dir[] = "/tmp/timescales_bench_XXXXXX";
    if (mkdtemp(dir) == nullptr) std::abort();
    std::string file = std::string(dir) + "/scenario.json";
    setenv("KOPDM_SIM_SCENARIO", file.c_str(), 1);
    return file;
  }();
  return path;
}
const std::string kPath = scenarioPath();  // before the library's first call

// TR i is a boundary clock, a master, a slave (the selected one for i == 2)
// or a disabled port, in turn, so every path of the ordering is taken.
std::string scenarioWith(int count) {
  static const char* const kKinds[][2] = {{"IEEE 1588-2008 BC", "PTP_MASTER"},
                                          {"IEEE 1588-2008", "PTP_MASTER"},
                                          {"IEEE 802.1AS-2011", "PTP_SLAVE"},
                                          {"IEEE 802.1AS-2011", "PTP_DISABLED"}};
  std::string text = "{\"selectedTrId\":\"tr2\",\"trs\":{";
  for (int i = 0; i < count; ++i) {
    const auto& kind = kKinds[i % 4];
    text += std::string(i ? "," : "") + "\"tr" + std::to_string(i) +
            "\":{\"attrs\":{\"type\":\"" + kind[0] + "\",\"gmClockId\":\"00-80-2F-FF-FE-00-00-" +
            std::to_string(i) + "\",\"portState\":\"" + kind[1] + "\"}}";
  }
  return text + "}}";
}

void serve(int count, kosdtools::pendulo::TimescaleHelpers& helpers) {
  std::ofstream(kPath + ".new") << scenarioWith(count);
  std::rename((kPath + ".new").c_str(), kPath.c_str());
  while (static_cast<int>(helpers.getTrIds().size()) != count) {
  }
}

void BM_GetTimescaleUris(benchmark::State& state) {
  const int count = static_cast<int>(state.range(0));
  kosdtools::pendulo::TimescaleHelpers helpers(std::make_shared<kopendulo::ApiWrapper>());
  serve(count, helpers);
  for (auto _ : state) {
    std::vector<std::string> uris = helpers.getTimescaleUris();
    benchmark::DoNotOptimize(uris.data());
  }
  state.SetComplexityN(count);
}
BENCHMARK(BM_GetTimescaleUris)->Arg(1)->Arg(4)->Arg(8)->Arg(64)->Complexity(benchmark::oN);

// One wrapped library call: the unit the listing is made of.
void BM_GetTrAttrJson(benchmark::State& state) {
  auto wrapper = std::make_shared<kopendulo::ApiWrapper>();
  kosdtools::pendulo::TimescaleHelpers helpers(wrapper);
  serve(8, helpers);
  std::string answer;
  for (auto _ : state) {
    wrapper->getTrAttrJson("tr5", "gmClockId", &answer);
    benchmark::DoNotOptimize(answer.data());
  }
}
BENCHMARK(BM_GetTrAttrJson);

}  // namespace

int main(int argc, char** argv) {
  benchmark::Initialize(&argc, argv);
  benchmark::RunSpecifiedBenchmarks();
  benchmark::Shutdown();
  std::remove(kPath.c_str());
  rmdir(kPath.substr(0, kPath.rfind('/')).c_str());
  return 0;
}
