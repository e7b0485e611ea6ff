#include "time_service.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <chrono>
#include <mutex>
#include <thread>

#include "default_scenario.h"
#include "answer_text.h"
#include "error_record/error.h"
#include "service_codes.h"

namespace kopdmsim {
namespace {

constexpr const char* kFile = "kopdm_clientapi/timeService";
constexpr const char* kChannel = "kopdmclientapi_debug";
// Publication numbers are drawn from one counter, so that a number never
// names the snapshots of two services, even one destroyed and another built
// at the same address.
std::atomic<uint64_t> nextGeneration{0};

}  // namespace

// The snapshot one thread last served, and its publication number.
struct TimeService::ThreadSnapshot {
  uint64_t generation = 0;
  std::shared_ptr<const State> state;
};

struct TimeService::Answer {
  const std::string* text;
  int32_t code;  // set when the lookup reported an error
};

bool TimeService::FileStamp::operator==(const FileStamp& other) const {
  return exists == other.exists && device == other.device && inode == other.inode &&
         size == other.size && modified.tv_sec == other.modified.tv_sec &&
         modified.tv_nsec == other.modified.tv_nsec;
}

TimeService::TimeService(std::string path) : path_(std::move(path)) {
  // A key without a destructor: the slots belong to this object, so nothing
  // is left for thread exit to run and the library stays unloadable while
  // its callers' threads live.
  hasSnapshotKey_ = pthread_key_create(&snapshotKey_, nullptr) == 0;
  if (!path_.empty()) {
    watch_ = std::make_unique<ScenarioWatch>(
        path_, [this](const ScenarioWatch::Settling& settling) { reloadIfSettled(settling); });
    pollFile_ = !watch_->active();
  }
  // Loaded after the watch exists, so an edit in between is not missed.
  publish(std::make_shared<const State>(loadState()));
}

TimeService::~TimeService() {
  watch_.reset();
  if (hasSnapshotKey_) pthread_key_delete(snapshotKey_);
}

TimeService::FileStamp TimeService::stampOf(const std::string& path) {
  FileStamp stamp;
  struct stat info;
  if (::stat(path.c_str(), &info) == 0) {
    stamp.exists = true;
    stamp.device = info.st_dev;
    stamp.inode = info.st_ino;
    stamp.size = info.st_size;
    stamp.modified = info.st_mtim;
  }
  return stamp;
}

TimeService::State TimeService::loadState() const {
  State state;
  std::string text;
  if (path_.empty()) {
    text = defaultScenarioText();
  } else {
    state.stamp = stampOf(path_);
    if (!readTextFile(path_, &text, &state.problem)) return state;
  }
  state.usable = parseScenario(text, &state.live, &state.problem);
  state.saved = state.live.trs;
  return state;
}

void TimeService::publish(std::shared_ptr<const State> state) {
  std::lock_guard<std::mutex> lock(mutex_);
  publishLocked(std::move(state));
}

void TimeService::publishLocked(std::shared_ptr<const State> state) {
  // Without per-thread slots a served state must outlive every reader.
  if (!hasSnapshotKey_) retained_.push_back(state);
  state_ = std::move(state);
  generation_.store(nextGeneration.fetch_add(1, std::memory_order_relaxed) + 1,
                    std::memory_order_release);
}

TimeService::ThreadSnapshot* TimeService::threadSnapshot() const {
  if (!hasSnapshotKey_) return nullptr;
  auto* snapshot = static_cast<ThreadSnapshot*>(pthread_getspecific(snapshotKey_));
  if (snapshot != nullptr) return snapshot;
  // A thread's first read: its slot stays with this object (a thread that
  // ends leaves its slot behind until the service goes; pool threads are
  // few and live long).
  std::lock_guard<std::mutex> lock(mutex_);
  snapshots_.push_back(std::make_unique<ThreadSnapshot>());
  snapshot = snapshots_.back().get();
  if (pthread_setspecific(snapshotKey_, snapshot) != 0) {
    snapshots_.pop_back();
    return nullptr;
  }
  return snapshot;
}

const TimeService::State& TimeService::current() const {
  ThreadSnapshot* snapshot = threadSnapshot();
  if (snapshot == nullptr) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (!hasSnapshotKey_) return *state_;  // kept alive by retained_
    // The slot could not be set: keep this state as long as the service.
    retained_.push_back(state_);
    return *state_;
  }
  // The common case reads one shared word and writes nothing shared.
  if (snapshot->generation != generation_.load(std::memory_order_acquire)) {
    std::lock_guard<std::mutex> lock(mutex_);
    snapshot->state = state_;
    snapshot->generation = generation_.load(std::memory_order_relaxed);
  }
  return *snapshot->state;
}

void TimeService::reload() { publish(std::make_shared<const State>(loadState())); }

void TimeService::reloadIfSettled(const ScenarioWatch::Settling& settling) {
  auto state = std::make_shared<const State>(loadState());
  // A writer that began between the two looks at the file may have been
  // read half-way: the watch reports again when it closes the file.
  if (!settling.keep(state->usable, [&] { return stampOf(path_) == state->stamp; })) return;
  publish(std::move(state));
}

void TimeService::reloadIfFileChanged() {
  if (stampOf(path_) == current().stamp) return;
  reload();
}

const char* TimeService::sourceName() const {
  return path_.empty() ? "(built-in default scenario)" : path_.c_str();
}

int32_t TimeService::unavailable(const State& state, Call call, koerr::Status& status) const {
  if (!state.usable) {
    koerr::Report(status, kScenarioUnusable, "kopdmclientapi_scenarioUnusable", kFile, __LINE__)
        .open(kChannel)
        .add("message", "Unusable scenario: " + state.problem + ".")
        .add("scenarioFile", sourceName())
        .add("call", callName(call))
        .close();
    return kScenarioUnusable;
  }
  if (!state.up) {
    koerr::Report(status, kServiceDown, "kopdmclientapi_serviceDown", kFile, __LINE__)
        .open(kChannel)
        .add("message", "The time-sync manager service is down.")
        .add("call", callName(call))
        .close();
    return kServiceDown;
  }
  return 0;
}

int32_t TimeService::reportInvalidArgument(koerr::Status& status, Call call,
                                           const char* problem) const {
  koerr::Report(status, kInvalidArgument, "kopdmclientapi_invalidArgument", kFile, __LINE__)
      .open(kChannel)
      .add("message", problem)
      .add("call", callName(call))
      .close();
  return kInvalidArgument;
}

int32_t TimeService::reportFault(koerr::Status& status, const Fault& fault,
                                 std::string_view trId, std::string_view key) const {
  koerr::Report report(status, fault.code, "kopdmclientapi_injectedFault", kFile, __LINE__);
  report.open(kChannel)
      .add("message", "Fault injected by the scenario.")
      .add("scenarioFile", sourceName())
      .addUInt("fault", static_cast<uint32_t>(fault.index))
      .add("call", callName(fault.call));
  if (fault.matchesTrId) report.add("trId", std::string(trId));
  if (fault.matchesKey) report.add("key", std::string(key));
  report.close();
  return fault.code;
}

int32_t TimeService::reportNoTr(koerr::Status& status, Call call, std::string_view trId) const {
  koerr::Report(status, kTrDoesNotExist, "kopdmclientapi_trDoesNotExist", kFile, __LINE__)
      .open(kChannel)
      .add("message", "The time reference does not exist.")
      .add("call", callName(call))
      .add("trId", std::string(trId))
      .close();
  return kTrDoesNotExist;
}

int32_t TimeService::reportNoAttr(koerr::Status& status, Call call, std::string_view trId,
                                  std::string_view key) const {
  koerr::Report report(status, kAttrNotSet, "kopdmclientapi_attrNotSet", kFile, __LINE__);
  report.open(kChannel).add("message", "The attribute is unknown or not set.").add("call",
                                                                                   callName(call));
  if (!trId.empty()) report.add("trId", std::string(trId));
  report.add("attrKey", std::string(key)).close();
  return kAttrNotSet;
}

int32_t TimeService::serveText(const Answer& answer, const Fault* fault, std::string_view trId,
                               std::string_view key, char* buffer, uint32_t capacity,
                               koerr::Status& status) const {
  const std::string* text = fault != nullptr && fault->replacesAnswer ? &fault->answer : answer.text;
  if (text == nullptr) return answer.code;
  copyAnswer(*text, buffer, capacity);
  // A fault that only replaces the answer is no warning.
  return fault != nullptr && fault->code > 0 ? reportFault(status, *fault, trId, key) : 0;
}

int32_t TimeService::getApiVersion() {
  if (pollFile_) reloadIfFileChanged();
  const State& state = current();
  if (!state.usable) return kScenarioUnusable;
  if (!state.up) return kServiceDown;
  return state.live.apiVersion;
}

int32_t TimeService::getSelectedTrId(char* buffer, uint32_t capacity, koerr::Status* status) {
  constexpr Call kCall = Call::kGetSelectedTrId;
  if (status == nullptr) return kInvalidArgument;
  if (buffer == nullptr || capacity == 0) {
    return reportInvalidArgument(*status, kCall, "No buffer, or a capacity of 0.");
  }
  if (pollFile_) reloadIfFileChanged();
  const State& state = current();
  if (int32_t code = unavailable(state, kCall, *status)) return code;
  const Scenario& live = state.live;
  const Fault* fault = live.findFault(kCall);
  if (fault != nullptr && fault->code < 0) return reportFault(*status, *fault, {}, {});
  const bool selected = live.hasSelectedTr || (fault != nullptr && fault->replacesAnswer);
  // A warning does not change the answer: the result still says whether a TR
  // is selected.
  if (!selected) {
    if (fault != nullptr) reportFault(*status, *fault, {}, {});
    return 0;
  }
  serveText({&live.selectedTrId, 0}, fault, {}, {}, buffer, capacity, *status);
  return 1;
}

int32_t TimeService::getSelectedTrOffsetNanos(int64_t* offsetOut, koerr::Status* status) {
  constexpr Call kCall = Call::kGetSelectedTrOffsetNanos;
  if (status == nullptr) return kInvalidArgument;
  if (offsetOut == nullptr) return reportInvalidArgument(*status, kCall, "No output variable.");
  if (pollFile_) reloadIfFileChanged();
  const State& state = current();
  if (int32_t code = unavailable(state, kCall, *status)) return code;
  const Fault* fault = state.live.findFault(kCall);
  if (fault != nullptr && fault->code < 0) return reportFault(*status, *fault, {}, {});
  *offsetOut = state.live.selectedTrOffsetNanos;
  return fault != nullptr ? reportFault(*status, *fault, {}, {}) : 0;
}

int32_t TimeService::getPdmAttrJson(const char* key, char* buffer, uint32_t capacity,
                                    koerr::Status* status) {
  constexpr Call kCall = Call::kGetPdmAttrJson;
  if (status == nullptr) return kInvalidArgument;
  if (key == nullptr || buffer == nullptr || capacity == 0) {
    return reportInvalidArgument(*status, kCall, "No key or buffer, or a capacity of 0.");
  }
  if (pollFile_) reloadIfFileChanged();
  const std::string_view keyView(key);
  const State& state = current();
  if (int32_t code = unavailable(state, kCall, *status)) return code;
  const Fault* fault = state.live.findFault(kCall, {}, keyView);
  if (fault != nullptr && fault->code < 0) return reportFault(*status, *fault, {}, keyView);
  Answer answer{nullptr, 0};
  if (fault == nullptr || !fault->replacesAnswer) {
    const auto found = state.live.pdmAttrAnswers.find(keyView);
    if (found != state.live.pdmAttrAnswers.end()) {
      answer.text = &found->second;
    } else {
      answer.code = reportNoAttr(*status, kCall, {}, keyView);
    }
  }
  return serveText(answer, fault, {}, keyView, buffer, capacity, *status);
}

int32_t TimeService::getPdmMetadataJson(char* buffer, uint32_t capacity, koerr::Status* status) {
  constexpr Call kCall = Call::kGetPdmMetadataJson;
  if (status == nullptr) return kInvalidArgument;
  if (buffer == nullptr || capacity == 0) {
    return reportInvalidArgument(*status, kCall, "No buffer, or a capacity of 0.");
  }
  if (pollFile_) reloadIfFileChanged();
  const State& state = current();
  if (int32_t code = unavailable(state, kCall, *status)) return code;
  const Fault* fault = state.live.findFault(kCall);
  if (fault != nullptr && fault->code < 0) return reportFault(*status, *fault, {}, {});
  return serveText({&state.live.pdmMetadataAnswer, 0}, fault, {}, {}, buffer, capacity,
                   *status);
}

int32_t TimeService::getTrAttrJson(const char* trId, const char* key, char* buffer,
                                   uint32_t capacity, koerr::Status* status) {
  constexpr Call kCall = Call::kGetTrAttrJson;
  if (status == nullptr) return kInvalidArgument;
  if (trId == nullptr || key == nullptr || buffer == nullptr || capacity == 0) {
    return reportInvalidArgument(*status, kCall, "No TR, key or buffer, or a capacity of 0.");
  }
  if (pollFile_) reloadIfFileChanged();
  // Measured once: the lookups below and any report take them as views.
  const std::string_view trView(trId);
  const std::string_view keyView(key);
  const State& state = current();
  if (int32_t code = unavailable(state, kCall, *status)) return code;
  const Fault* fault = state.live.findFault(kCall, trView, keyView);
  if (fault != nullptr && fault->code < 0) return reportFault(*status, *fault, trView, keyView);
  Answer answer{nullptr, 0};
  if (fault == nullptr || !fault->replacesAnswer) {
    const auto tr = state.live.trs.find(trView);
    if (tr == state.live.trs.end()) {
      answer.code = reportNoTr(*status, kCall, trView);
    } else {
      const auto found = tr->second.attrAnswers.find(keyView);
      if (found != tr->second.attrAnswers.end()) {
        answer.text = &found->second;
      } else {
        answer.code = reportNoAttr(*status, kCall, trView, keyView);
      }
    }
  }
  return serveText(answer, fault, trView, keyView, buffer, capacity, *status);
}

int32_t TimeService::getTrMetadataJson(const char* trId, char* buffer, uint32_t capacity,
                                       koerr::Status* status) {
  constexpr Call kCall = Call::kGetTrMetadataJson;
  if (status == nullptr) return kInvalidArgument;
  if (trId == nullptr || buffer == nullptr || capacity == 0) {
    return reportInvalidArgument(*status, kCall, "No TR or buffer, or a capacity of 0.");
  }
  if (pollFile_) reloadIfFileChanged();
  const State& state = current();
  if (int32_t code = unavailable(state, kCall, *status)) return code;
  const Fault* fault = state.live.findFault(kCall, trId);
  if (fault != nullptr && fault->code < 0) return reportFault(*status, *fault, trId, {});
  Answer answer{nullptr, 0};
  if (fault == nullptr || !fault->replacesAnswer) {
    const auto tr = state.live.trs.find(std::string_view(trId));
    if (tr != state.live.trs.end()) {
      answer.text = &tr->second.metadataAnswer;
    } else {
      answer.code = reportNoTr(*status, kCall, trId);
    }
  }
  return serveText(answer, fault, trId, {}, buffer, capacity, *status);
}

// The common frame of the state-changing calls: checks, the call's fault,
// then `apply(state, status)` on a copy that replaces the served snapshot
// when it succeeds. Readers keep serving the old one until then.
template <typename Change>
int32_t TimeService::change(Call call, std::string_view trId, std::string_view key,
                            koerr::Status* status, Change&& apply) {
  if (pollFile_) reloadIfFileChanged();
  std::lock_guard<std::mutex> lock(mutex_);
  // Held to the end: `fault` points into it.
  const std::shared_ptr<const State> served = state_;
  if (!served->usable) return unavailable(*served, call, *status);
  const bool serviceCall = call == Call::kRestartService || call == Call::kBringDownService ||
                           call == Call::kBringUpService;
  if (!serviceCall) {
    if (int32_t code = unavailable(*served, call, *status)) return code;
  }
  const Fault* fault = served->live.findFault(call, trId, key);
  if (fault != nullptr && fault->code < 0) return reportFault(*status, *fault, trId, key);
  auto next = std::make_shared<State>(*served);
  if (int32_t code = apply(*next, *status)) return code;
  publishLocked(std::move(next));
  return fault != nullptr ? reportFault(*status, *fault, trId, key) : 0;
}

int32_t TimeService::setTrAttr(const char* trId, const char* key, const char* value,
                               koerr::Status* status) {
  constexpr Call kCall = Call::kSetTrAttr;
  if (status == nullptr) return kInvalidArgument;
  if (trId == nullptr || key == nullptr || value == nullptr) {
    return reportInvalidArgument(*status, kCall, "No TR, key or value.");
  }
  // Rendered before taking the lock: parsing the value is the slow part.
  std::string answer = renderMember(key, valueFromText(value));
  return change(kCall, trId, key, status, [&](State& state, koerr::Status& st) {
    const auto tr = state.live.trs.find(std::string_view(trId));
    if (tr == state.live.trs.end()) return reportNoTr(st, kCall, trId);
    tr->second.attrAnswers[key] = std::move(answer);
    return 0;
  });
}

int32_t TimeService::restartService(koerr::Status* status) {
  if (status == nullptr) return kInvalidArgument;
  return change(Call::kRestartService, {}, {}, status, [](State& state, koerr::Status&) {
    state.live.trs = state.saved;
    state.up = true;
    return 0;
  });
}

int32_t TimeService::bringDownService(koerr::Status* status) {
  if (status == nullptr) return kInvalidArgument;
  return change(Call::kBringDownService, {}, {}, status, [](State& state, koerr::Status&) {
    state.up = false;
    return 0;
  });
}

int32_t TimeService::bringUpService(koerr::Status* status) {
  if (status == nullptr) return kInvalidArgument;
  return change(Call::kBringUpService, {}, {}, status, [](State& state, koerr::Status&) {
    state.up = true;
    return 0;
  });
}

int32_t TimeService::persistConfig(koerr::Status* status) {
  if (status == nullptr) return kInvalidArgument;
  return change(Call::kPersistConfig, {}, {}, status, [](State& state, koerr::Status&) {
    state.saved = state.live.trs;
    return 0;
  });
}

int32_t TimeService::updateTrFromConfig(const char* trId, koerr::Status* status) {
  constexpr Call kCall = Call::kUpdateTrFromConfig;
  if (status == nullptr) return kInvalidArgument;
  if (trId == nullptr) return reportInvalidArgument(*status, kCall, "No TR.");
  return change(kCall, trId, {}, status, [&](State& state, koerr::Status& st) {
    const auto live = state.live.trs.find(std::string_view(trId));
    const auto saved = state.saved.find(std::string_view(trId));
    if (live == state.live.trs.end() || saved == state.saved.end()) {
      return reportNoTr(st, kCall, trId);
    }
    live->second = saved->second;
    return 0;
  });
}

int32_t TimeService::adjustTime(int64_t seconds, int64_t nanoseconds, koerr::Status* status) {
  constexpr Call kCall = Call::kAdjustTime;
  if (status == nullptr) return kInvalidArgument;
  return change(kCall, {}, {}, status, [&](State& state, koerr::Status& st) {
    int64_t step;
    int64_t offset;
    if (__builtin_mul_overflow(seconds, int64_t{1000000000}, &step) ||
        __builtin_add_overflow(step, nanoseconds, &step) ||
        __builtin_add_overflow(state.live.selectedTrOffsetNanos, step, &offset)) {
      return reportInvalidArgument(st, kCall, "The step overflows 64-bit nanoseconds.");
    }
    state.live.selectedTrOffsetNanos = offset;
    return 0;
  });
}

}  // namespace kopdmsim
