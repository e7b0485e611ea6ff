// The live time-sync manager: serves the client library's calls from
// running ptp4l daemons, one per configured time reference, through their
// management sockets. It only reads: the calls that would change a daemon
// fail with kReadOnly and change nothing.
//
// The configuration file is watched like a scenario file: an edit is served
// from the next call on, and a missing or invalid file makes every call fail
// with kScenarioUnusable and a record that names the file and the problem.
//
// Thread-safety: every operation may run on several threads at once; a call
// waits at most the configured time-out for each daemon it needs, and never
// for a daemon it does not need.
#ifndef KOPDM_CLIENTAPI_LIVE_LIVE_TIME_SERVICE_H_
#define KOPDM_CLIENTAPI_LIVE_LIVE_TIME_SERVICE_H_

#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "backend.h"
#include "live/daemon_link.h"
#include "live/live_config.h"
#include "scenario.h"
#include "scenario_watch.h"

namespace kopdmlive {

class LiveTimeService : public kopdmsim::Backend {
 public:
  // Serves the configuration file at `configPath`; client sockets are made
  // in `clientDirectory`.
  LiveTimeService(std::string configPath, std::string clientDirectory);
  ~LiveTimeService() override;
  LiveTimeService(const LiveTimeService&) = delete;
  LiveTimeService& operator=(const LiveTimeService&) = delete;

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
  struct State {
    bool usable = false;
    std::string problem;
    LiveConfig config;
    std::vector<std::unique_ptr<DaemonLink>> links;  // in configuration order
  };
  using Call = kopdmsim::Call;

  std::shared_ptr<const State> loadState() const;
  std::shared_ptr<const State> current() const;
  // Reads the configuration again; with `settling`, keeps what it read only
  // when the watch says the file was read whole.
  void reload(const kopdmsim::ScenarioWatch::Settling* settling);

  DaemonLink* findLink(const State& state, std::string_view trId) const;
  // The selected time reference's link, or null when none is selected.
  DaemonLink* selectedLink(const State& state) const;
  // The state or, when no answer can be given, the reported code.
  int32_t usableState(Call call, koerr::Status& status, std::shared_ptr<const State>* out) const;
  int32_t refuseChange(Call call, koerr::Status* status) const;

  int32_t reportUnusable(koerr::Status& status, Call call, const State& state) const;
  int32_t reportInvalidArgument(koerr::Status& status, Call call, const char* problem) const;
  int32_t reportNoTr(koerr::Status& status, Call call, std::string_view trId) const;
  int32_t reportNoAttr(koerr::Status& status, Call call, std::string_view trId,
                       std::string_view key) const;
  int32_t reportFailure(koerr::Status& status, Call call, const DaemonLink& link,
                        const Failure& failure) const;
  int32_t reportNoSelectedTr(koerr::Status& status, Call call) const;

  const std::string path_;
  // One client socket for every daemon, kept across reloads.
  const std::shared_ptr<ptpmgmt::SharedUdsClient> client_;
  mutable std::mutex mutex_;
  std::shared_ptr<const State> state_;  // guarded by mutex_
  std::unique_ptr<kopdmsim::ScenarioWatch> watch_;
};

}  // namespace kopdmlive

#endif  // KOPDM_CLIENTAPI_LIVE_LIVE_TIME_SERVICE_H_
