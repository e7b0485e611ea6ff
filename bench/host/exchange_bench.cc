// The host's own share of one request, without sockets: mapping the URL into
// a reused exchange and the C calls a plug-in makes to read the request and
// write a 200-byte answer.
#include <benchmark/benchmark.h>

#include <string>
#include <vector>

#include "url_mapping.h"
#include "ws_runtime/exchange.h"
#include "ws_runtime/ws_runtime.h"

namespace {

const std::string kAnswer(200, 'x');

void answerLikeAService(uint32_t id, const ws::runtime::RequestInfo& info) {
  char method[5];
  uint32_t length = sizeof method;
  ReadRequestVariable_C_REST_KO_GXWS_(id, "REQUEST_METHOD", method, &length);
  char accept[128];
  length = sizeof accept;
  ReadRequestVariable_C_REST_KO_GXWS_(id, "ACCEPT", accept, &length);
  std::u32string value;
  info.lookupVariable(U"name", value);
  WriteOutput_C_REST_KO_GXWS_(id, kAnswer.data(), static_cast<uint32_t>(kAnswer.size()));
  SetHTTPResponseMimeType_C_REST_KO_GXWS_(id, "vnd.ko.syncDomain.v0/json; charset=utf-8");
}

void BM_MapAndAnswer(benchmark::State& state) {
  ws::runtime::Exchange exchange;
  const std::vector<ws::host::RawParameter> query;
  for (auto _ : state) {
    exchange.reset();
    ws::host::mapUrl("quillon", "/quillon/timescales/pendulo/tr0/00-80-2F-FF-FE-12-34-56", query,
                     exchange.request());
    exchange.request().setAccept("vnd.ko.syncDomain.v0/json; charset=utf-8");
    answerLikeAService(exchange.id(), *exchange.info());
    benchmark::DoNotOptimize(exchange.response().body.data());
  }
}
BENCHMARK(BM_MapAndAnswer);

void BM_FreshExchange(benchmark::State& state) {
  for (auto _ : state) {
    ws::runtime::Exchange exchange;
    benchmark::DoNotOptimize(exchange.id());
  }
}
BENCHMARK(BM_FreshExchange);

}  // namespace

BENCHMARK_MAIN();
