// The simulated time-sync manager: serves a scenario (a file, or the built-in
// default) through the client library's calls and applies the state-changing
// calls to it in memory. Answers are rendered when the scenario is read, so a
// call costs a lookup and a copy; the file is watched by a thread, so a call
// never looks at the file system.
//
// Thread-safety: every operation may run on several threads at once. The
// served state is an immutable snapshot; a reading call takes no lock while
// its thread already holds the current one, so request threads do not
// contend. The state-changing calls and reloads publish a new snapshot under
// a mutex. The per-thread snapshots are slots of this object found through a
// thread key, not thread-local objects, so that no thread-exit destructor
// keeps the library mapped after it is unloaded.
#ifndef KOPDM_CLIENTAPI_TIME_SERVICE_H_
#define KOPDM_CLIENTAPI_TIME_SERVICE_H_

#include <pthread.h>
#include <sys/types.h>

#include <atomic>
#include <cstdint>
#include <ctime>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "backend.h"
#include "error_record/status.h"
#include "scenario.h"
#include "scenario_watch.h"

namespace kopdmsim {

class TimeService : public Backend {
 public:
  // An empty `path` serves the built-in default scenario.
  explicit TimeService(std::string path);
  ~TimeService() override;
  TimeService(const TimeService&) = delete;
  TimeService& operator=(const TimeService&) = delete;

  int32_t getApiVersion() override;
  int32_t getSelectedTrId(char* buffer, uint32_t capacity, koerr::Status* status) override;
  int32_t getSelectedTrOffsetNanos(int64_t* offsetOut, koerr::Status* status) override;
  int32_t getPdmAttrJson(const char* key, char* buffer, uint32_t capacity,
                         koerr::Status* status) override;
  int32_t getPdmMetadataJson(char* buffer, uint32_t capacity, koerr::Status* status) override;
  int32_t getTrAttrJson(const char* trId, const char* key, char* buffer, uint32_t capacity,
                        koerr::Status* status) override;
  int32_t getTrMetadataJson(const char* trId, char* buffer, uint32_t capacity,
                            koerr::Status* status) override;
  int32_t setTrAttr(const char* trId, const char* key, const char* value,
                    koerr::Status* status) override;
  int32_t restartService(koerr::Status* status) override;
  int32_t bringDownService(koerr::Status* status) override;
  int32_t bringUpService(koerr::Status* status) override;
  int32_t persistConfig(koerr::Status* status) override;
  int32_t updateTrFromConfig(const char* trId, koerr::Status* status) override;
  int32_t adjustTime(int64_t seconds, int64_t nanoseconds, koerr::Status* status) override;

 private:
  struct FileStamp {
    bool exists = false;
    dev_t device = 0;
    ino_t inode = 0;
    off_t size = 0;
    timespec modified{};
    bool operator==(const FileStamp& other) const;
  };
  struct State {
    bool usable = false;
    std::string problem;   // what is wrong with the scenario when not usable
    Scenario live;         // what the calls answer
    TimeReferences saved;  // the TRs as last persisted (or loaded)
    bool up = true;
    FileStamp stamp;
  };
  // What a text call answers: the text, or null after an error was reported.
  struct Answer;
  struct ThreadSnapshot;

  static FileStamp stampOf(const std::string& path);
  // The state being served, valid until this thread's next call into this
  // object.
  const State& current() const;
  // The calling thread's slot, made on its first read; null when the
  // system has no thread key to give.
  ThreadSnapshot* threadSnapshot() const;
  void publish(std::shared_ptr<const State> state);
  void publishLocked(std::shared_ptr<const State> state);  // mutex_ held
  State loadState() const;
  void reload();
  // Serves the file as it is now, unless it changed while being read.
  void reloadIfSettled(const ScenarioWatch::Settling& settling);
  void reloadIfFileChanged();

  // Reports the scenario problem or the service being down, if any.
  int32_t unavailable(const State& state, Call call, koerr::Status& status) const;
  int32_t serveText(const Answer& answer, const Fault* fault, std::string_view trId,
                    std::string_view key, char* buffer, uint32_t capacity,
                    koerr::Status& status) const;
  template <typename Change>
  int32_t change(Call call, std::string_view trId, std::string_view key, koerr::Status* status,
                 Change&& apply);

  int32_t reportInvalidArgument(koerr::Status& status, Call call, const char* problem) const;
  int32_t reportFault(koerr::Status& status, const Fault& fault, std::string_view trId,
                      std::string_view key) const;
  int32_t reportNoTr(koerr::Status& status, Call call, std::string_view trId) const;
  int32_t reportNoAttr(koerr::Status& status, Call call, std::string_view trId,
                       std::string_view key) const;
  const char* sourceName() const;

  const std::string path_;
  mutable std::mutex mutex_;           // held to replace or to take a snapshot
  std::shared_ptr<const State> state_;  // guarded by mutex_
  std::atomic<uint64_t> generation_{0};  // of state_; unique in the process
  pthread_key_t snapshotKey_{};
  bool hasSnapshotKey_ = false;
  mutable std::vector<std::unique_ptr<ThreadSnapshot>> snapshots_;  // guarded by mutex_
  // Only when a thread has no slot: every state served, kept to the end.
  mutable std::vector<std::shared_ptr<const State>> retained_;  // guarded by mutex_
  std::unique_ptr<ScenarioWatch> watch_;  // null for the built-in scenario
  bool pollFile_ = false;                  // the watch could not be set up
};

}  // namespace kopdmsim

#endif  // KOPDM_CLIENTAPI_TIME_SERVICE_H_
