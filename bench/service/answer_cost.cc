// Runs a fixed number of requests in-process through the plug-in's Run entry
// point and prints the allocations each one makes, malloc included. Its
// instruction count under callgrind, taken for two request counts, gives the
// instructions per request without start-up and shut-down (answer_cost.sh).
//
// usage: answer_cost resources|timescale|error REQUESTS
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

#include "count_malloc.h"
#include "quillon/quillon.h"
#include "scenario_file.h"
#include "ws_runtime/exchange.h"

namespace {

constexpr int kWarmUp = 100;

struct Kind {
  const char* name;
  const char32_t* command;
  const char32_t* nameVariable;  // null: no resource variables
  int32_t code;                  // the status the answer must carry
};

constexpr Kind kKinds[] = {
    {"resources", U"resources", nullptr, 200},
    {"timescale", U"timescales", U"00-80-2F-FF-FE-12-34-52", 200},
    {"error", U"syncableDevices", U"nope", -52006},
};

void run(const Kind& kind, ws::runtime::Exchange& exchange) {
  exchange.reset();
  ws::runtime::ExchangeRequest& request = exchange.request();
  request.method = "GET";
  request.command = kind.command;
  if (kind.nameVariable != nullptr) {
    const bool timescale = std::strcmp(kind.name, "timescale") == 0;
    request.addVariable(U"plugin", U"pendulo");
    request.addVariable(U"type", timescale ? U"tr2" : U"timekeeper");
    request.addVariable(U"name", kind.nameVariable);
  }
  quillonRun(exchange.info(), exchange.id());
}

}  // namespace

int main(int argc, char** argv) {
  const Kind* kind = nullptr;
  for (const Kind& candidate : kKinds) {
    if (argc == 3 && std::strcmp(argv[1], candidate.name) == 0) kind = &candidate;
  }
  const long requests = argc == 3 ? std::atol(argv[2]) : 0;
  if (kind == nullptr || requests <= 0) {
    std::fprintf(stderr, "usage: answer_cost resources|timescale|error REQUESTS\n");
    return 2;
  }
  const bench::ScenarioFile scenario(bench::scenarioWithMasters(4));
  quillonInit();
  ws::runtime::Exchange exchange;
  for (int i = 0; i < kWarmUp; ++i) run(*kind, exchange);
  if (exchange.response().code != kind->code) {
    std::fprintf(stderr, "answer_cost: unexpected answer %d: %s\n", exchange.response().code,
                 exchange.response().body.c_str());
    quillonFinalize();
    return 1;
  }
  const uint64_t before = bench::allocationCount();
  for (long i = 0; i < requests; ++i) run(*kind, exchange);
  const uint64_t allocations = bench::allocationCount() - before;
  std::printf("%s: %.2f allocations per request, %zu bytes answered\n", kind->name,
              static_cast<double>(allocations) / static_cast<double>(requests),
              exchange.response().body.size());
  quillonFinalize();
  return 0;
}
