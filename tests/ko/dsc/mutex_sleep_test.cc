#include <gtest/gtest.h>

#include <cerrno>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "ko/dsc/osdep/realtime_kernel.h"
#include "ko/dsc/osdep/recursive_mutex.h"
#include "ko/dsc/osdep/sleep.h"
#include "support/scratch.h"

namespace ko::dsc::osdep {
namespace {

// A flag file in a fresh temporary directory; `content` null means no file.
struct FlagFile {
  explicit FlagFile(const char* content) {
    if (content != nullptr) write(content);
  }
  void write(const std::string& content) const { dir.write("realtime", content); }
  const answers_test::ScratchDir dir;
  const std::string path = dir.file("realtime");
};

TEST(RealtimeKernel, OnlyALeadingOneMeansRealtimeAndTheAnswerIsReadOnce) {
  const struct {
    const char* content;
    bool realtime;
  } cases[] = {{nullptr, false}, {"", false}, {"x", false}, {"1", true}, {"10", true}};
  for (const auto& c : cases) {
    SCOPED_TRACE(c.content == nullptr ? "<no file>" : c.content);
    const FlagFile flag(c.content);
    const RealtimeKernel kernel(flag.path);
    EXPECT_EQ(kernel.isRealtime(), c.realtime);
    // The protocol follows the kernel.
    EXPECT_EQ(RecursiveMutex(kernel).inheritsPriority(), c.realtime);
    flag.write(c.realtime ? "0" : "1");
    EXPECT_EQ(kernel.isRealtime(), c.realtime) << "answer must be cached";
  }
}

TEST(RecursiveMutex, NestsForItsOwnerAndIgnoresUnlockFromOtherThreads) {
  const FlagFile flag(nullptr);
  const RealtimeKernel kernel(flag.path);
  RecursiveMutex mutex(kernel);
  // "<count> <owner>", the owner being this thread, nobody or another one.
  const auto state = [&] {
    const pthread_t owner = mutex.owner();
    return std::to_string(mutex.count()) + (pthread_equal(owner, pthread_self()) ? " mine"
                                            : owner == pthread_t{0}              ? " free"
                                                                                 : " other");
  };
  EXPECT_EQ(state(), "0 free");
  mutex.lock();
  mutex.lock();
  EXPECT_EQ(state(), "2 mine");
  std::thread([&] { mutex.unlock(); }).join();
  EXPECT_EQ(state(), "2 mine");
  mutex.unlock();
  EXPECT_EQ(state(), "1 mine");
  mutex.unlock();
  EXPECT_EQ(state(), "0 free");
  // A second release by the former owner finds no owner and does nothing.
  mutex.unlock();
  EXPECT_EQ(state(), "0 free");
}

TEST(RecursiveMutex, ExcludesOtherThreads) {
  RecursiveMutex mutex;
  long counter = 0;
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&] {
      for (int i = 0; i < 5000; ++i) {
        std::lock_guard<RecursiveMutex> outer(mutex);
        std::lock_guard<RecursiveMutex> inner(mutex);
        const long seen = counter;
        counter = seen + 1;
      }
    });
  }
  for (auto& t : threads) {
    t.join();
  }
  EXPECT_EQ(counter, 20000);
  EXPECT_EQ(mutex.count(), 0);
}

// Staged clock_nanosleep: records each request and plays back the answers.
struct StagedSleep {
  struct Answer {
    int rc;
    timespec remaining;
  };
  static inline std::vector<Answer> answers;
  static inline size_t calls;
  static inline std::string requests;  // "seconds.nanoseconds " each

  static int call(clockid_t clock, int flags, const timespec* request, timespec* remaining) {
    EXPECT_EQ(clock, CLOCK_MONOTONIC);
    EXPECT_EQ(flags, 0) << "must be a relative sleep";
    requests += std::to_string(request->tv_sec) + "." + std::to_string(request->tv_nsec) + " ";
    const Answer answer = answers.at(calls++);
    if (answer.rc == EINTR) *remaining = answer.remaining;
    return answer.rc;
  }
};

TEST(Sleep, ResumesWithTheRemainderAfterSignalsAndStopsOnOtherErrors) {
  const struct {
    const char* name;
    uint32_t milliseconds;
    std::vector<StagedSleep::Answer> answers;
    const char* requests;
  } cases[] = {
      {"uninterrupted", 1500, {{0, {}}}, "1.500000000 "},
      {"largest", 4294967295U, {{0, {}}}, "4294967.295000000 "},
      {"two signals", 1500, {{EINTR, {0, 700000000}}, {EINTR, {0, 100}}, {0, {}}},
       "1.500000000 0.700000000 0.100 "},
      {"other error", 1500, {{EINVAL, {}}}, "1.500000000 "},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    StagedSleep::answers = c.answers;
    StagedSleep::requests.clear();
    StagedSleep::calls = 0;
    sleepMilliseconds(c.milliseconds, &StagedSleep::call);
    EXPECT_EQ(StagedSleep::requests, c.requests);
  }
}

}  // namespace
}  // namespace ko::dsc::osdep
