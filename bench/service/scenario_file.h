// A scenario of time references written to a temporary file and named to the
// simulated time service through its environment variable, for the
// in-process benchmarks of the answer path.
//
// Thread-safety: construct before the first call into the time service; it
// reads its scenario path once per process.
#ifndef BENCH_SERVICE_SCENARIO_FILE_H_
#define BENCH_SERVICE_SCENARIO_FILE_H_

#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <string>

namespace bench {

// Masters only: every TR is published, so each listing asks the time service
// for the TR list and three attributes of every TR.
inline std::string scenarioWithMasters(int count) {
  std::string trs;
  for (int i = 0; i < count; ++i) {
    if (i) trs += ',';
    trs += "\"tr" + std::to_string(i) + "\":{\"attrs\":{\"type\":\"IEEE 1588-2008\","
           "\"gmClockId\":\"00-80-2F-FF-FE-12-34-5" + std::to_string(i) + "\","
           "\"portState\":\"PTP_MASTER\"}}";
  }
  return "{\"apiVersion\":1,\"selectedTrId\":null,\"trs\":{" + trs + "}}";
}

class ScenarioFile {
 public:
  explicit ScenarioFile(const std::string& text) {
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
  ~ScenarioFile() {
    unsetenv("KOPDM_SIM_SCENARIO");
    unlink(path_.c_str());
  }
  ScenarioFile(const ScenarioFile&) = delete;
  ScenarioFile& operator=(const ScenarioFile&) = delete;

 private:
  std::string path_;
};

}  // namespace bench

#endif  // BENCH_SERVICE_SCENARIO_FILE_H_
