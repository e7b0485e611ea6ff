// The cost of building error records: a typical one, and one grown past 4 KiB.
// Allocations are counted by wrapping malloc for the process.
#include <benchmark/benchmark.h>

#include <atomic>
#include <cstdlib>
#include <string>

#include "error_record/error.h"

namespace {

std::atomic<long> gAllocations{0};

int countingReallocate(koerr::Status* status, uint32_t capacity) {
  if (capacity > status->capacity) gAllocations.fetch_add(1, std::memory_order_relaxed);
  return koerr::defaultReallocate(status, capacity);
}

void BM_TypicalRecord(benchmark::State& state) {
  const std::string uri = "/quillon/syncableDevices/pendulo/timekeeper/genericTk/";
  gAllocations = 0;
  for (auto _ : state) {
    koerr::Status status;
    status.reallocate = &countingReallocate;
    koerr::Report(status, koerr::koapalerr_resourceNotFound, "quillon/ResourceManager", 75)
        .open("kosyncdomain_debug")
        .add("message", "Requested syncableDeviceUri does not exist on this host.")
        .add("localDeviceUri", uri)
        .add("onlyDeviceUri", "/quillon/syncableDevices/pendulo/timekeeper/genericTk");
    benchmark::DoNotOptimize(status.json);
    koerr::releaseText(status);
  }
  state.counters["mallocs_per_record"] =
      benchmark::Counter(static_cast<double>(gAllocations), benchmark::Counter::kAvgIterations);
}
BENCHMARK(BM_TypicalRecord);

void BM_TypicalRecordThrown(benchmark::State& state) {
  for (auto _ : state) {
    try {
      koerr::Error(koerr::koapalerr_resourceNotFound, "quillon/ResourceManager", 75,
                   "kosyncdomain_debug")
          .add("message", "Requested syncableDeviceUri does not exist on this host.")
          .add("localDeviceUri", "/a/b")
          .add("onlyDeviceUri", "/c/d")
          .raise();
    } catch (const koerr::ExceptionBase& e) {
      benchmark::DoNotOptimize(e.what());
    }
  }
}
BENCHMARK(BM_TypicalRecordThrown);

void BM_GrowPast4KiB(benchmark::State& state) {
  const std::string line(100, 'x');
  gAllocations = 0;
  for (auto _ : state) {
    koerr::Status status;
    status.reallocate = &countingReallocate;
    koerr::Report report(status, koerr::koapalerr_osFault, "bench/file", 1);
    report.open("quillon_debug");
    for (int i = 0; i < 48; ++i) report.add("line", line);
    benchmark::DoNotOptimize(status.json);
    koerr::releaseText(status);
  }
  state.counters["mallocs_per_record"] =
      benchmark::Counter(static_cast<double>(gAllocations), benchmark::Counter::kAvgIterations);
}
BENCHMARK(BM_GrowPast4KiB);

}  // namespace

BENCHMARK_MAIN();
