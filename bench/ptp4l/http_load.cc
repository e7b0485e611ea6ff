// Closed-loop HTTP load with exact latencies: groups of keep-alive
// connections, one thread each, asking one path over and over for a given
// time. Every request's latency is kept (wrk's summary weighs its samples,
// and a few slow answers among many fast ones are what matters here).
//
//   http-load PORT SECONDS CONNECTIONS:PATH [CONNECTIONS:PATH ...]
//
// Prints per group "<median ms> <p99 ms> <worst ms> <requests> <failed>";
// a failure is an answer other than 200 or a broken connection.
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

#include "support/http_client.h"

namespace {

using Clock = std::chrono::steady_clock;
using quillon::test_support::HttpClient;
using quillon::test_support::HttpRequest;

struct Group {
  int connections = 0;
  std::string path;
  std::mutex mutex;
  std::vector<double> latencies;  // milliseconds; guarded by mutex
  long failed = 0;                // guarded by mutex
};

void load(uint16_t port, Group& group, Clock::time_point end) {
  std::vector<double> latencies;
  long failed = 0;
  std::unique_ptr<HttpClient> client;
  HttpRequest request;
  request.target = group.path;
  while (Clock::now() < end) {
    const Clock::time_point start = Clock::now();
    try {
      if (!client) client = std::make_unique<HttpClient>(port);
      if (client->send(request).status != 200) ++failed;
      if (client->closedByServer()) client.reset();
    } catch (const std::runtime_error&) {
      ++failed;
      client.reset();
    }
    latencies.push_back(std::chrono::duration<double, std::milli>(Clock::now() - start).count());
  }
  std::lock_guard<std::mutex> lock(group.mutex);
  group.latencies.insert(group.latencies.end(), latencies.begin(), latencies.end());
  group.failed += failed;
}

double percentile(const std::vector<double>& sorted, double share) {
  if (sorted.empty()) return 0;
  return sorted[std::min(sorted.size() - 1, static_cast<size_t>(share * sorted.size()))];
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 4) {
    std::fprintf(stderr, "usage: http-load PORT SECONDS CONNECTIONS:PATH [CONNECTIONS:PATH ...]\n");
    return 2;
  }
  const auto port = static_cast<uint16_t>(std::atoi(argv[1]));
  const Clock::time_point end = Clock::now() + std::chrono::seconds(std::atoi(argv[2]));
  std::vector<std::unique_ptr<Group>> groups;
  for (int i = 3; i < argc; ++i) {
    const std::string spec = argv[i];
    const size_t colon = spec.find(':');
    if (colon == std::string::npos) {
      std::fprintf(stderr, "http-load: '%s' is not CONNECTIONS:PATH\n", argv[i]);
      return 2;
    }
    groups.push_back(std::make_unique<Group>());
    groups.back()->connections = std::atoi(spec.substr(0, colon).c_str());
    groups.back()->path = spec.substr(colon + 1);
  }
  std::vector<std::thread> threads;
  for (auto& group : groups) {
    for (int c = 0; c < group->connections; ++c) {
      threads.emplace_back(load, port, std::ref(*group), end);
    }
  }
  for (std::thread& thread : threads) thread.join();
  for (auto& group : groups) {
    std::vector<double>& sorted = group->latencies;
    std::sort(sorted.begin(), sorted.end());
    std::printf("%.1f %.1f %.1f %zu %ld\n", percentile(sorted, 0.5), percentile(sorted, 0.99),
                sorted.empty() ? 0.0 : sorted.back(), sorted.size(), group->failed);
  }
  return 0;
}
