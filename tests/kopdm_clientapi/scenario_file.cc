#include "kopdm_clientapi/scenario_file.h"

#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <fstream>
#include <thread>

#include "kopdm_clientapi.h"

namespace timesvc_test {
namespace {

std::string makePath() {
  char dir[] = "/tmp/kopdm_sim_test_XXXXXX";
  if (mkdtemp(dir) == nullptr) std::abort();
  std::string path = std::string(dir) + "/scenario.json";
  setenv("KOPDM_SIM_SCENARIO", path.c_str(), 1);
  return path;
}

const std::string kPath = makePath();

class RemoveDirectory : public ::testing::Environment {
 public:
  void TearDown() override {
    std::remove(kPath.c_str());
    rmdir(kPath.substr(0, kPath.rfind('/')).c_str());
  }
};
::testing::Environment* const kCleanup = ::testing::AddGlobalTestEnvironment(new RemoveDirectory);

void write(const std::string& path, const std::string& text) {
  std::ofstream(path, std::ios::binary | std::ios::trunc) << text;
}

std::string metadataAnswer() {
  char buffer[1024] = {};
  koerr::Status status;
  kopdmclientapi_getPdmMetadataJson(buffer, sizeof buffer, &status);
  koerr::releaseText(status);
  return buffer;
}

}  // namespace

const std::string& scenarioPath() { return kPath; }

bool eventually(const std::function<bool()>& condition) {
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
  while (!condition()) {
    if (std::chrono::steady_clock::now() > deadline) return false;
    std::this_thread::yield();
  }
  return true;
}

void install(const std::string& members) {
  static int revision = 0;
  const std::string metadata = "{\"revision\":" + std::to_string(++revision) + "}";
  write(kPath + ".new", "{\"pdmMetadata\":" + metadata + "," + members + "}");
  ASSERT_EQ(std::rename((kPath + ".new").c_str(), kPath.c_str()), 0);
  ASSERT_TRUE(eventually([&] { return metadataAnswer() == metadata; })) << members;
}

void installRaw(const std::string& text, const std::function<bool()>& served) {
  write(kPath, text);
  ASSERT_TRUE(eventually(served)) << text;
}

void removeScenario(const std::function<bool()>& served) {
  ASSERT_EQ(std::remove(kPath.c_str()), 0);
  ASSERT_TRUE(eventually(served));
}

}  // namespace timesvc_test
