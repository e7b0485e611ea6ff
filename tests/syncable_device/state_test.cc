// The device's state on disk: a replacement cut short at any system call
// leaves the old state or the new one, never a torn file, and a device
// restores, refuses to lose, or sets aside what it finds there.
#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "error_record/exception.h"
#include "src/state_file.h"
#include "support/raised.h"
#include "support/scratch.h"
#include "syncable_device/syncable_device_actual.h"

namespace {

using answers_test::ScopedEnv;
using answers_test::ScratchDir;
using kosdplugins::pendulo::wrapper::SyncableDeviceActual;

constexpr const char* kUri = "/quillon/syncableDevices/pendulo/timekeeper/genericTk";
constexpr const char* kStateName =
    "device.quillon.syncableDevices.pendulo.timekeeper.genericTk.json";

// The machine's calls, with call number `failAt` (from 1) failing with EIO.
class FailingFiles : public kosdlib::PosixFileSystem {
 public:
  explicit FailingFiles(int failAt) : failAt_(failAt) {}
  std::vector<std::string> calls;

  int open(const char* path, int flags, mode_t mode) override {
    return fails("open") ? -1 : PosixFileSystem::open(path, flags, mode);
  }
  ssize_t write(int fd, const void* data, size_t size) override {
    return fails("write") ? -1 : PosixFileSystem::write(fd, data, size);
  }
  int fsync(int fd) override { return fails("fsync") ? -1 : PosixFileSystem::fsync(fd); }
  // A close that fails has still released the descriptor.
  int close(int fd) override {
    PosixFileSystem::close(fd);
    return fails("close") ? -1 : 0;
  }
  int rename(const char* from, const char* to) override {
    return fails("rename") ? -1 : PosixFileSystem::rename(from, to);
  }

 private:
  bool fails(const char* call) {
    calls.push_back(call);
    if (static_cast<int>(calls.size()) != failAt_) return false;
    errno = EIO;
    return true;
  }
  int failAt_;
};

TEST(DeviceState, AReplacementCutShortLeavesTheOldStateOrTheNew) {
  for (const bool hadState : {true, false}) {
    for (int failAt = 1;; ++failAt) {
      SCOPED_TRACE(std::string(hadState ? "over old state" : "first state") + ", failing call " +
                   std::to_string(failAt));
      ScratchDir scratch;
      if (hadState) scratch.write("state", "old");
      auto files = std::make_shared<FailingFiles>(0);
      kosdlib::StateFile state(files, scratch.file("state"));
      std::string content;
      kosdlib::FileFailure failure;
      using Found = kosdlib::StateFile::Found;
      ASSERT_EQ(state.read(&content, &failure), hadState ? Found::kContent : Found::kNothing);
      *files = FailingFiles(failAt);
      const bool replaced = state.replace("new", &failure);
      const bool failedMidway = failAt <= static_cast<int>(files->calls.size());
      if (replaced) {
        EXPECT_EQ(scratch.read("state"), "new");
      } else {
        EXPECT_EQ(failure.call, files->calls[failAt - 1]);
        EXPECT_EQ(failure.error, EIO);
        EXPECT_EQ(std::filesystem::exists(scratch.file("state")), hadState);
        if (hadState) {
          EXPECT_EQ(scratch.read("state"), "old");
        }
      }
      EXPECT_FALSE(std::filesystem::exists(scratch.file("state.new")));
      if (!failedMidway) break;
    }
  }
}

class StatefulDevice : public ::testing::Test {
 protected:
  ScratchDir scratch_;
  ScopedEnv directory_{"KOSDLIB_STATE_DIRECTORY", scratch_.str()};
};

TEST_F(StatefulDevice, AcceptedRequirementsOutliveTheDevice) {
  {
    SyncableDeviceActual device(kUri);
    device.setCoherencyRequirements("{ \"maxOffsetNanos\": 0 }", "");
  }
  EXPECT_EQ(scratch_.read(kStateName), "{\"maxOffsetNanos\":0}\n");
  SyncableDeviceActual device(kUri);
  EXPECT_NE(device.toJson().find("\"coherencyRequirements\":{\"maxOffsetNanos\":0},"),
            std::string::npos);
  EXPECT_EQ(device.isCoherent(0), 0);
  device.clearCoherencyRequirements("");
  EXPECT_EQ(scratch_.read(kStateName), "null\n");
}

TEST_F(StatefulDevice, AStateThatCannotBeSavedKeepsThePreviousInForce) {
  SyncableDeviceActual device(kUri);
  device.setCoherencyRequirements("{\"maxOffsetNanos\":7}", "");
  const std::string before = device.toJson();
  std::filesystem::remove_all(scratch_.path());
  const auto raised =
      quillon::test_support::raisedBy([&] { device.setCoherencyRequirements("{}", ""); });
  EXPECT_EQ(raised.code, -52008);
  EXPECT_NE(raised.record.find("\"stateFile\":\"" + scratch_.file(kStateName) +
                               ".new\",\"systemCall\":\"open\","
                               "\"systemError\":\"No such file or directory\""),
            std::string::npos)
      << raised.record;
  EXPECT_EQ(device.toJson(), before);
}

TEST_F(StatefulDevice, AnUnusableStateIsSetAsideAndNamedInTheLog) {
  const std::string bad = "{\"maxOffsetNanos\":-1}";
  for (const std::string& aside : {std::string(".unusable.1"), std::string(".unusable.2")}) {
    SCOPED_TRACE(aside);
    scratch_.write(kStateName, bad);
    testing::internal::CaptureStderr();
    SyncableDeviceActual device(kUri);
    const std::string log = testing::internal::GetCapturedStderr();
    EXPECT_NE(device.toJson().find("\"coherencyRequirements\":null,"), std::string::npos);
    EXPECT_EQ(scratch_.read(kStateName + aside), bad);
    EXPECT_FALSE(std::filesystem::exists(scratch_.file(kStateName)));
    EXPECT_EQ(log, "kosdlib: the state file " + scratch_.file(kStateName) +
                       " cannot be parsed (The coherency requirements' \"maxOffsetNanos\" must "
                       "be an integer from 0 to 9223372036854775807. At byte 18.); moved aside "
                       "to " + scratch_.file(kStateName) + aside +
                       "; the device starts without coherency requirements\n");
  }
}

}  // namespace
