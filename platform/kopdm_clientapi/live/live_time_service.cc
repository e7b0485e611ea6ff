#include "live/live_time_service.h"

#include <cstring>

#include "answer_text.h"
#include "error_record/error.h"
#include "live/attributes.h"
#include "service_codes.h"

namespace kopdmlive {
namespace {

using kopdmsim::Call;
using kopdmsim::callName;

constexpr const char* kFile = "kopdm_clientapi/liveTimeService";
constexpr const char* kChannel = "kopdmclientapi_debug";
constexpr int32_t kApiVersion = 1;

const char* const kPdmAttributes[] = {"timeReferences", "selectedTr", "selection",
                                      "timeoutMillis", "maxAgeMillis"};

std::string jsonList(const std::vector<std::string>& items) {
  std::string list = "[";
  for (const std::string& item : items) {
    if (list.size() > 1) list += ',';
    list += jsonString(item);
  }
  return list + "]";
}

const char* selectionName(const LiveConfig& config) {
  return config.automaticSelection ? "automatic" : "configured";
}

// A time reference may be selected automatically when its port is SLAVE to
// a grandmaster that is present.
bool isLockedSlave(const DaemonState& state) {
  return state.port.ok && state.port.value.portState == ptpmgmt::kPortStateSlave &&
         state.timeStatus.ok && state.timeStatus.value.gmPresent;
}

const char* failureMessage(const Failure& failure) {
  switch (failure.kind) {
    case FailureKind::kUnreachable:
      return "The ptp4l daemon of the time reference cannot be reached.";
    case FailureKind::kTimedOut:
      return failure.system.call != nullptr
                 ? "The ptp4l daemon of the time reference does not read its management socket."
                 : "The ptp4l daemon of the time reference did not answer in time.";
    case FailureKind::kManagementError:
      return "The ptp4l daemon of the time reference refused the management request.";
    case FailureKind::kMalformed:
      return "The ptp4l daemon of the time reference gave a malformed answer.";
  }
  return "";
}

struct FailureCode {
  int32_t code;
  const char* constant;
};

FailureCode failureCode(FailureKind kind) {
  switch (kind) {
    case FailureKind::kUnreachable:
      return {kopdmsim::kDaemonUnreachable, "koapalerr_communicationsFault"};
    case FailureKind::kTimedOut:
      return {kopdmsim::kDaemonTimedOut, "koapalerr_communicationsFault"};
    case FailureKind::kManagementError:
      return {kopdmsim::kManagementError, "kopdmclientapi_managementError"};
    case FailureKind::kMalformed:
      return {kopdmsim::kMalformedAnswer, "kopdmclientapi_malformedAnswer"};
  }
  return {kopdmsim::kMalformedAnswer, "kopdmclientapi_malformedAnswer"};
}

const char* nameOr(const char* name, const char* fallback) {
  return name != nullptr ? name : fallback;
}

}  // namespace

LiveTimeService::LiveTimeService(std::string configPath, std::string clientDirectory)
    : path_(std::move(configPath)),
      client_(std::make_shared<ptpmgmt::SharedUdsClient>(std::move(clientDirectory))) {
  watch_ = std::make_unique<kopdmsim::ScenarioWatch>(
      path_, [this](const kopdmsim::ScenarioWatch::Settling& settling) { reload(&settling); });
  // Loaded after the watch exists, so an edit in between is not missed.
  reload(nullptr);
}

LiveTimeService::~LiveTimeService() { watch_.reset(); }

std::shared_ptr<const LiveTimeService::State> LiveTimeService::loadState() const {
  auto state = std::make_shared<State>();
  std::string text;
  if (!kopdmsim::readTextFile(path_, &text, &state->problem)) return state;
  if (!parseLiveConfig(text, &state->config, &state->problem)) return state;
  state->usable = true;
  const auto timeout = std::chrono::milliseconds(state->config.timeoutMillis);
  const auto maxAge = std::chrono::milliseconds(state->config.maxAgeMillis);
  for (const TrConfig& tr : state->config.trs) {
    state->links.push_back(std::make_unique<DaemonLink>(tr, timeout, maxAge, client_));
  }
  return state;
}

void LiveTimeService::reload(const kopdmsim::ScenarioWatch::Settling* settling) {
  std::shared_ptr<const State> loaded = loadState();
  // A file that changed while it was read may be half-written: the watch
  // reports again once its writer is done.
  if (settling != nullptr && !settling->keep(loaded->usable, [] { return true; })) return;
  std::lock_guard<std::mutex> lock(mutex_);
  state_ = std::move(loaded);
}

std::shared_ptr<const LiveTimeService::State> LiveTimeService::current() const {
  std::lock_guard<std::mutex> lock(mutex_);
  return state_;
}

DaemonLink* LiveTimeService::findLink(const State& state, std::string_view trId) const {
  for (const auto& link : state.links) {
    if (link->tr().id == trId) return link.get();
  }
  return nullptr;
}

DaemonLink* LiveTimeService::selectedLink(const State& state) const {
  if (!state.config.automaticSelection) return findLink(state, state.config.selectedTr);
  // Daemons that cannot tell are passed over: they cannot be locked slaves.
  for (const auto& link : state.links) {
    if (isLockedSlave(*link->state())) return link.get();
  }
  return nullptr;
}

int32_t LiveTimeService::usableState(Call call, koerr::Status& status,
                                     std::shared_ptr<const State>* out) const {
  *out = current();
  return (*out)->usable ? 0 : reportUnusable(status, call, **out);
}

int32_t LiveTimeService::getApiVersion() {
  return current()->usable ? kApiVersion : kopdmsim::kScenarioUnusable;
}

int32_t LiveTimeService::getSelectedTrId(char* buffer, uint32_t capacity,
                                         koerr::Status* status) {
  constexpr Call kCall = Call::kGetSelectedTrId;
  if (status == nullptr) return kopdmsim::kInvalidArgument;
  if (buffer == nullptr || capacity == 0) {
    return reportInvalidArgument(*status, kCall, "No buffer, or a capacity of 0.");
  }
  std::shared_ptr<const State> state;
  if (int32_t code = usableState(kCall, *status, &state)) return code;
  const DaemonLink* selected = selectedLink(*state);
  if (selected == nullptr) return 0;
  kopdmsim::copyAnswer(selected->tr().id, buffer, capacity);
  return 1;
}

int32_t LiveTimeService::getSelectedTrOffsetNanos(int64_t* offsetOut, koerr::Status* status) {
  constexpr Call kCall = Call::kGetSelectedTrOffsetNanos;
  if (status == nullptr) return kopdmsim::kInvalidArgument;
  if (offsetOut == nullptr) return reportInvalidArgument(*status, kCall, "No output variable.");
  std::shared_ptr<const State> state;
  if (int32_t code = usableState(kCall, *status, &state)) return code;
  DaemonLink* selected = selectedLink(*state);
  if (selected == nullptr) return reportNoSelectedTr(*status, kCall);
  const std::shared_ptr<const DaemonState> daemon = selected->state();
  if (!daemon->timeStatus.ok) {
    return reportFailure(*status, kCall, *selected, daemon->timeStatus.failure);
  }
  *offsetOut = daemon->timeStatus.value.masterOffset;
  return 0;
}

int32_t LiveTimeService::getPdmAttrJson(const char* key, char* buffer, uint32_t capacity,
                                        koerr::Status* status) {
  constexpr Call kCall = Call::kGetPdmAttrJson;
  if (status == nullptr) return kopdmsim::kInvalidArgument;
  if (key == nullptr || buffer == nullptr || capacity == 0) {
    return reportInvalidArgument(*status, kCall, "No key or buffer, or a capacity of 0.");
  }
  std::shared_ptr<const State> state;
  if (int32_t code = usableState(kCall, *status, &state)) return code;
  const std::string_view wanted(key);
  const LiveConfig& config = state->config;
  std::string value;
  if (wanted == "timeReferences") {
    value = trIdList(config);
  } else if (wanted == "selectedTr") {
    const DaemonLink* selected = selectedLink(*state);
    value = selected != nullptr ? jsonString(selected->tr().id) : "null";
  } else if (wanted == "selection") {
    value = jsonString(selectionName(config));
  } else if (wanted == "timeoutMillis") {
    value = std::to_string(config.timeoutMillis);
  } else if (wanted == "maxAgeMillis") {
    value = std::to_string(config.maxAgeMillis);
  } else {
    return reportNoAttr(*status, kCall, {}, wanted);
  }
  kopdmsim::copyMember(wanted, value, buffer, capacity);
  return 0;
}

int32_t LiveTimeService::getPdmMetadataJson(char* buffer, uint32_t capacity,
                                            koerr::Status* status) {
  constexpr Call kCall = Call::kGetPdmMetadataJson;
  if (status == nullptr) return kopdmsim::kInvalidArgument;
  if (buffer == nullptr || capacity == 0) {
    return reportInvalidArgument(*status, kCall, "No buffer, or a capacity of 0.");
  }
  std::shared_ptr<const State> state;
  if (int32_t code = usableState(kCall, *status, &state)) return code;
  const LiveConfig& config = state->config;
  const std::string metadata =
      "{\"source\":\"ptp4l\",\"configFile\":" + jsonString(path_) +
      ",\"timeReferences\":" + trIdList(config) +
      ",\"selection\":" + jsonString(selectionName(config)) +
      ",\"timeoutMillis\":" + std::to_string(config.timeoutMillis) +
      ",\"maxAgeMillis\":" + std::to_string(config.maxAgeMillis) + ",\"attributes\":" +
      jsonList(std::vector<std::string>(std::begin(kPdmAttributes), std::end(kPdmAttributes))) +
      "}";
  kopdmsim::copyAnswer(metadata, buffer, capacity);
  return 0;
}

int32_t LiveTimeService::getTrAttrJson(const char* trId, const char* key, char* buffer,
                                       uint32_t capacity, koerr::Status* status) {
  constexpr Call kCall = Call::kGetTrAttrJson;
  if (status == nullptr) return kopdmsim::kInvalidArgument;
  if (trId == nullptr || key == nullptr || buffer == nullptr || capacity == 0) {
    return reportInvalidArgument(*status, kCall, "No TR, key or buffer, or a capacity of 0.");
  }
  std::shared_ptr<const State> state;
  if (int32_t code = usableState(kCall, *status, &state)) return code;
  DaemonLink* link = findLink(*state, trId);
  if (link == nullptr) return reportNoTr(*status, kCall, trId);
  const TrAttribute* attribute = findTrAttribute(key);
  if (attribute == nullptr) return reportNoAttr(*status, kCall, trId, key);
  // Held while the attribute renders: `failure` may point into it.
  std::shared_ptr<const DaemonState> daemon;
  if (attribute->needsDaemon(link->tr())) daemon = link->state();
  std::string value;
  const Failure* failure = nullptr;
  if (!attribute->render(link->tr(), daemon.get(), &value, &failure)) {
    return reportFailure(*status, kCall, *link, *failure);
  }
  kopdmsim::copyMember(key, value, buffer, capacity);
  return 0;
}

int32_t LiveTimeService::getTrMetadataJson(const char* trId, char* buffer, uint32_t capacity,
                                           koerr::Status* status) {
  constexpr Call kCall = Call::kGetTrMetadataJson;
  if (status == nullptr) return kopdmsim::kInvalidArgument;
  if (trId == nullptr || buffer == nullptr || capacity == 0) {
    return reportInvalidArgument(*status, kCall, "No TR or buffer, or a capacity of 0.");
  }
  std::shared_ptr<const State> state;
  if (int32_t code = usableState(kCall, *status, &state)) return code;
  const DaemonLink* link = findLink(*state, trId);
  if (link == nullptr) return reportNoTr(*status, kCall, trId);
  const TrConfig& tr = link->tr();
  const std::string metadata =
      "{\"source\":\"ptp4l\",\"uds\":" + jsonString(tr.uds) +
      ",\"port\":" + std::to_string(tr.port) +
      ",\"domainNumber\":" + std::to_string(tr.domainNumber) +
      ",\"type\":" + (tr.type.empty() ? std::string("null") : jsonString(tr.type)) +
      ",\"attributes\":" + jsonList(trAttributeNames()) + "}";
  kopdmsim::copyAnswer(metadata, buffer, capacity);
  return 0;
}

int32_t LiveTimeService::refuseChange(Call call, koerr::Status* status) const {
  if (status == nullptr) return kopdmsim::kInvalidArgument;
  koerr::Report(*status, kopdmsim::kReadOnly, "kopdmclientapi_readOnly", kFile, __LINE__)
      .open(kChannel)
      .add("message",
           "The live time service only reads the ptp4l daemons; this call would change them.")
      .add("call", callName(call))
      .add("configFile", path_)
      .close();
  return kopdmsim::kReadOnly;
}

int32_t LiveTimeService::setTrAttr(const char*, const char*, const char*, koerr::Status* status) {
  return refuseChange(Call::kSetTrAttr, status);
}

int32_t LiveTimeService::restartService(koerr::Status* status) {
  return refuseChange(Call::kRestartService, status);
}

int32_t LiveTimeService::bringDownService(koerr::Status* status) {
  return refuseChange(Call::kBringDownService, status);
}

int32_t LiveTimeService::bringUpService(koerr::Status* status) {
  return refuseChange(Call::kBringUpService, status);
}

int32_t LiveTimeService::persistConfig(koerr::Status* status) {
  return refuseChange(Call::kPersistConfig, status);
}

int32_t LiveTimeService::updateTrFromConfig(const char*, koerr::Status* status) {
  return refuseChange(Call::kUpdateTrFromConfig, status);
}

int32_t LiveTimeService::adjustTime(int64_t, int64_t, koerr::Status* status) {
  return refuseChange(Call::kAdjustTime, status);
}

int32_t LiveTimeService::reportUnusable(koerr::Status& status, Call call,
                                        const State& state) const {
  koerr::Report(status, kopdmsim::kScenarioUnusable, "kopdmclientapi_configUnusable", kFile,
                __LINE__)
      .open(kChannel)
      .add("message", "Unusable ptp4l configuration: " + state.problem + ".")
      .add("configFile", path_)
      .add("call", callName(call))
      .close();
  return kopdmsim::kScenarioUnusable;
}

int32_t LiveTimeService::reportInvalidArgument(koerr::Status& status, Call call,
                                               const char* problem) const {
  koerr::Report(status, kopdmsim::kInvalidArgument, "kopdmclientapi_invalidArgument", kFile,
                __LINE__)
      .open(kChannel)
      .add("message", problem)
      .add("call", callName(call))
      .close();
  return kopdmsim::kInvalidArgument;
}

int32_t LiveTimeService::reportNoTr(koerr::Status& status, Call call,
                                    std::string_view trId) const {
  koerr::Report(status, kopdmsim::kTrDoesNotExist, "kopdmclientapi_trDoesNotExist", kFile,
                __LINE__)
      .open(kChannel)
      .add("message", "The time reference does not exist.")
      .add("call", callName(call))
      .add("trId", std::string(trId))
      .close();
  return kopdmsim::kTrDoesNotExist;
}

int32_t LiveTimeService::reportNoAttr(koerr::Status& status, Call call, std::string_view trId,
                                      std::string_view key) const {
  koerr::Report report(status, kopdmsim::kAttrNotSet, "kopdmclientapi_attrNotSet", kFile,
                       __LINE__);
  report.open(kChannel).add("message", "The attribute is unknown.").add("call", callName(call));
  if (!trId.empty()) report.add("trId", std::string(trId));
  report.add("attrKey", std::string(key)).close();
  return kopdmsim::kAttrNotSet;
}

int32_t LiveTimeService::reportFailure(koerr::Status& status, Call call, const DaemonLink& link,
                                       const Failure& failure) const {
  const FailureCode code = failureCode(failure.kind);
  koerr::Report report(status, code.code, code.constant, kFile, __LINE__);
  report.open(kChannel)
      .add("message", failureMessage(failure))
      .add("call", callName(call))
      .add("trId", link.tr().id)
      .add("uds", link.tr().uds)
      .addUInt("managementId", failure.managementId)
      .add("managementIdName", nameOr(ptpmgmt::managementIdName(failure.managementId), "?"));
  if (failure.system.call != nullptr) {
    report.add("systemCall", failure.system.call)
        .add("systemError", std::strerror(failure.system.error));
  }
  switch (failure.kind) {
    case FailureKind::kManagementError:
      report.addUInt("managementErrorId", failure.managementErrorId)
          .add("managementErrorName",
               nameOr(ptpmgmt::managementErrorName(failure.managementErrorId), "?"));
      break;
    case FailureKind::kMalformed:
      report.add("problem", ptpmgmt::describe(failure.decodeError));
      break;
    case FailureKind::kTimedOut:
      if (failure.system.call == nullptr) {
        report.addUInt("timeoutMillis", static_cast<uint32_t>(link.timeout().count()))
            .add("transportSpecific",
                 failure.probedTransports ? "0 and 1" : std::to_string(failure.transportSpecific));
      }
      break;
    case FailureKind::kUnreachable:
      break;
  }
  report.addUInt("domainNumber", link.tr().domainNumber).close();
  return code.code;
}

int32_t LiveTimeService::reportNoSelectedTr(koerr::Status& status, Call call) const {
  koerr::Report(status, kopdmsim::kNoSelectedTr, "kopdmclientapi_noSelectedTr", kFile, __LINE__)
      .open(kChannel)
      .add("message",
           "No time reference is selected: none has its port in SLAVE state with a grandmaster "
           "present.")
      .add("call", callName(call))
      .close();
  return kopdmsim::kNoSelectedTr;
}

}  // namespace kopdmlive
