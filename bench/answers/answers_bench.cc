// The cost of an error answer (envelope plus explanation lookup from the
// shipped file) against a success answer, and how a lookup grows with the
// size of the explanation file. C++ allocations are counted through a
// replaced operator new, so a lookup that allocated per line would show a
// count growing with the file.
#include <benchmark/benchmark.h>
#include <stdlib.h>

#include <atomic>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <string>

#include "error_record/error.h"
#include "koxlator/errors_parser.h"
#include "quillon/errors.h"

// Counts every C++ allocation of the process (count_new.cc).
extern std::atomic<long> gNews;

namespace {

const char* kDevice =
    "{\"uri\":\"/quillon/syncableDevices/pendulo/timekeeper/genericTk\",\"type\":\"timekeeper\","
    "\"plugin\":\"pendulo\",\"name\":\"genericTk\",\"timescales\":[\"/quillon/timescales/pendulo/"
    "tr0/00-11-22-ff-fe-33-44-55\"],\"coherencyRequirements\":{}}";

// A scratch directory with a marker file pointing the service at it.
class Share {
 public:
  Share() {
    std::string pattern =
        (std::filesystem::temp_directory_path() / "answers-bench-XXXXXX").string();
    if (mkdtemp(pattern.data()) == nullptr) {
      std::perror("mkdtemp");
      std::abort();
    }
    root_ = pattern;
  }
  ~Share() { std::filesystem::remove_all(root_); }
  const std::filesystem::path& root() const { return root_; }
  void pointServiceAt(const std::string& shareDir) const {
    const std::string marker = (root_ / "share.dir").string();
    std::ofstream(marker) << shareDir << "\n";
    setenv("KOSYSQ_SHARE_DIR_FILE", marker.c_str(), 1);
  }

 private:
  std::filesystem::path root_;
};

void setCounters(benchmark::State& state, long news) {
  state.counters["news_per_answer"] =
      benchmark::Counter(static_cast<double>(news), benchmark::Counter::kAvgIterations);
}

void BM_SuccessAnswer(benchmark::State& state) {
  const koerr::Status ok;
  const std::string result = kDevice;
  const long before = gNews;
  for (auto _ : state) {
    benchmark::DoNotOptimize(quillon::buildEnvelope(ok, result));
  }
  setCounters(state, gNews - before);
}
BENCHMARK(BM_SuccessAnswer);

void BM_ErrorAnswer(benchmark::State& state) {
  Share share;
  share.pointServiceAt(QUILLON_SHARE_DIR);
  koerr::Status notFound;
  koerr::Report(notFound, koerr::koapalerr_resourceNotFound, "quillon/ResourceManager", 75)
      .open("kosyncdomain_debug")
      .add("message", "Requested syncableDeviceUri does not exist on this host.")
      .add("localDeviceUri", "/quillon/syncableDevices/pendulo/timekeeper/otherTk");
  const long before = gNews;
  for (auto _ : state) {
    benchmark::DoNotOptimize(quillon::buildEnvelope(notFound, ""));
  }
  setCounters(state, gNews - before);
  koerr::releaseText(notFound);
}
BENCHMARK(BM_ErrorAnswer);

// A file of `entries` entries; the wanted code is the last, so every lookup
// reads the whole file.
void BM_LookupInFileOf(benchmark::State& state) {
  const int entries = static_cast<int>(state.range(0));
  Share share;
  const std::filesystem::path english = share.root() / "errors" / "English";
  std::filesystem::create_directories(english);
  {
    std::ofstream file(english / "codes.txt");
    file << "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<kodocument>\n";
    for (int i = 1; i <= entries; ++i) {
      file << "<koerror code=\"-" << i << "\">\nExplanation number " << i
           << " of this benchmark file, one sentence long.\n</koerror>\n";
    }
    file << "</kodocument>\n";
  }
  const std::string directory = (share.root() / "errors").string();
  std::string text;
  const long before = gNews;
  for (auto _ : state) {
    koerr::Status status;
    koxlator::lookupExplanation(directory, -entries, koxlator::kEnglish, text, status);
    benchmark::DoNotOptimize(text.data());
    if (text.empty() || status.code != 0) {
      state.SkipWithError("lookup found nothing");
      break;
    }
  }
  setCounters(state, gNews - before);
  state.SetComplexityN(entries);
  state.SetItemsProcessed(state.iterations() * entries);
}
BENCHMARK(BM_LookupInFileOf)->Arg(1)->Arg(100)->Arg(10000)->Complexity(benchmark::oN);

}  // namespace
BENCHMARK_MAIN();
