// The stand-in's scenario file rewritten while calls read it: written in
// place in several pieces, or renamed over. No call may ever see a
// half-written file, and the last version written is the one served,
// whatever other programs hold the file open meanwhile.
#include <fcntl.h>
#include <stdlib.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "kopdm_clientapi.h"
#include "support/scratch.h"

namespace {

constexpr int32_t kScenarioUnusable = -1074100993;

// KOPDM_SIM_SCENARIO is set before main() runs, so the stand-in's first
// call already reads it.
const answers_test::ScratchDir kScenarioDir;
const std::string kScenario = [] {
  const std::string path = kScenarioDir.file("scenario.json");
  setenv("KOPDM_SIM_SCENARIO", path.c_str(), 1);
  return path;
}();

std::string scenarioSelecting(int n) {
  // Padded so that a write in pieces leaves invalid JSON in between.
  return "{\"apiVersion\":1,\"selectedTrId\":\"tr" + std::to_string(n) + "\",\"trs\":{\"tr" +
         std::to_string(n) + "\":{\"type\":\"" + std::string(2000, 'x') + "\"}}}";
}

// Written as an editor that saves in place does: truncate, then the text in
// three pieces.
void writeInPlace(const std::string& path, const std::string& text) {
  const int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
  ASSERT_GE(fd, 0);
  const size_t third = text.size() / 3;
  for (size_t offset = 0; offset < text.size(); offset += third) {
    const size_t size = std::min(third, text.size() - offset);
    ASSERT_EQ(::write(fd, text.data() + offset, size), static_cast<ssize_t>(size));
    std::this_thread::sleep_for(std::chrono::microseconds(50));
  }
  ::close(fd);
}

void replaceByRename(const std::string& path, const std::string& text) {
  const std::string temporary = path + ".new";
  writeInPlace(temporary, text);
  ASSERT_EQ(std::rename(temporary.c_str(), path.c_str()), 0);
}

std::string selected() {
  char buffer[64] = "";
  koerr::Status status;
  const int32_t result = kopdmclientapi_getSelectedTrId(buffer, sizeof buffer, &status);
  std::free(status.json);
  if (result == kScenarioUnusable) return "<unusable>";
  return buffer;
}

TEST(ScenarioRewrite, ReadersNeverSeeAHalfWrittenFile) {
  writeInPlace(kScenario, scenarioSelecting(0));
  ASSERT_EQ(selected(), "tr0");
  struct Case {
    const char* name;
    void (*write)(const std::string&, const std::string&);
  } cases[] = {{"in place", &writeInPlace}, {"renamed over", &replaceByRename}};
  constexpr int kRewrites = 500;
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    std::atomic<bool> writing{true};
    std::atomic<int> reads{0}, unusable{0};
    std::thread reader([&] {
      while (writing) {
        ++reads;
        if (selected() == "<unusable>") ++unusable;
      }
    });
    for (int i = 1; i <= kRewrites; ++i) c.write(kScenario, scenarioSelecting(i));
    writing = false;
    reader.join();
    EXPECT_EQ(unusable.load(), 0) << "of " << reads.load() << " reads";
    // The last version is served once the watch has caught up.
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(10);
    while (selected() != "tr" + std::to_string(kRewrites) &&
           std::chrono::steady_clock::now() < deadline) {
      std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    EXPECT_EQ(selected(), "tr" + std::to_string(kRewrites));
    writeInPlace(kScenario, scenarioSelecting(0));
  }
}

std::string waitForServed(const std::string& expected) {
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(5);
  while (selected() != expected && std::chrono::steady_clock::now() < deadline) {
    std::this_thread::sleep_for(std::chrono::milliseconds(2));
  }
  return selected();
}

// Steps of a reader and a writer on the file, in every order: the writer
// truncates and writes the new text in place, or a complete file is renamed
// over it; the reader opens it before, during or after, and closes it
// before, after or never. Once the writer is done, the new text or its
// unusability is served, within the watch's bounded wait.
TEST(ScenarioRewrite, EveryOrderOfOpensWritesClosesAndRenamesEndsInTheFilesVerdict) {
  const std::string invalid = "{\"apiVersion\":1,\"trs\":";
  const char* const orders[] = {
      "R W w c r", "R W w r c", "W R w c r", "W R w r c", "W w R c r", "W w R r c",
      "W w c R r", "R r W w c", "R W w c",   "R m r",     "m",         "R m",
  };
  int version = 0;
  for (const char* order : orders) {
    for (const bool valid : {true, false}) {
      SCOPED_TRACE(std::string(order) + (valid ? ", valid" : ", invalid"));
      replaceByRename(kScenario, scenarioSelecting(0));
      ASSERT_EQ(waitForServed("tr0"), "tr0");
      const std::string text = valid ? scenarioSelecting(++version) : invalid;
      const std::string staged = kScenario + ".staged";
      if (std::string(order).find('m') != std::string::npos) writeInPlace(staged, text);
      int reader = -1, writer = -1;
      for (const char* step = order; *step != '\0'; ++step) {
        switch (*step) {
          case 'R': reader = ::open(kScenario.c_str(), O_RDONLY | O_CLOEXEC); break;
          case 'r': ::close(reader); reader = -1; break;
          case 'W': writer = ::open(kScenario.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC); break;
          case 'w': ASSERT_EQ(::write(writer, text.data(), text.size()),
                              static_cast<ssize_t>(text.size())); break;
          case 'c': ::close(writer); break;
          case 'm': ASSERT_EQ(std::rename(staged.c_str(), kScenario.c_str()), 0); break;
          default: break;
        }
      }
      const std::string expected = valid ? "tr" + std::to_string(version) : "<unusable>";
      EXPECT_EQ(waitForServed(expected), expected);
      if (reader >= 0) ::close(reader);
    }
  }
  replaceByRename(kScenario, scenarioSelecting(0));
}

}  // namespace
