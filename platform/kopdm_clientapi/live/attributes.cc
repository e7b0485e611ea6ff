#include "live/attributes.h"

#include <functional>
#include <map>
#include <memory>

#include "answer_text.h"
#include "error_record/json_text.h"

namespace kopdmlive {
namespace {

using ptpmgmt::formatClockIdentity;
using ptpmgmt::formatScaledNanoseconds;

std::string jsonInt(int64_t value) { return std::to_string(value); }
std::string jsonBool(bool value) { return value ? "true" : "false"; }
// A name from the codec's tables, or the raw number when it has none.
std::string jsonName(const char* name, int64_t value) {
  return name != nullptr ? jsonString(name) : jsonInt(value);
}

class FromConfig : public TrAttribute {
 public:
  using Render = std::function<std::string(const TrConfig&)>;
  explicit FromConfig(Render render) : render_(std::move(render)) {}
  bool needsDaemon(const TrConfig&) const override { return false; }
  bool render(const TrConfig& tr, const DaemonState*, std::string* json,
              const Failure**) const override {
    *json = render_(tr);
    return true;
  }

 private:
  Render render_;
};

// An attribute read from one data set of the daemon's state.
template <typename DataSet>
class FromDataSet : public TrAttribute {
 public:
  using Render = std::function<std::string(const DataSet&)>;
  FromDataSet(Fetched<DataSet> DaemonState::*member, Render render)
      : member_(member), render_(std::move(render)) {}
  bool needsDaemon(const TrConfig&) const override { return true; }
  bool render(const TrConfig&, const DaemonState* state, std::string* json,
              const Failure** failure) const override {
    const Fetched<DataSet>& fetched = state->*member_;
    if (!fetched.ok) {
      *failure = &fetched.failure;
      return false;
    }
    *json = render_(fetched.value);
    return true;
  }

 private:
  Fetched<DataSet> DaemonState::*member_;
  Render render_;
};

// The configured type, or the one the daemon's transport and ports give.
class TypeAttribute : public TrAttribute {
 public:
  bool needsDaemon(const TrConfig& tr) const override { return tr.type.empty(); }
  bool render(const TrConfig& tr, const DaemonState* state, std::string* json,
              const Failure** failure) const override {
    if (!tr.type.empty()) {
      *json = jsonString(tr.type);
      return true;
    }
    if (!state->defaults.ok) {
      *failure = &state->defaults.failure;
      return false;
    }
    *json = jsonString(derivedType(state->transportSpecific, state->defaults.value.numberPorts));
    return true;
  }
};

using Table = std::map<std::string, std::unique_ptr<TrAttribute>, kopdmsim::ShortTextLess>;

template <typename DataSet>
void add(Table& table, const char* key, Fetched<DataSet> DaemonState::*member,
         typename FromDataSet<DataSet>::Render render) {
  table.emplace(key, std::make_unique<FromDataSet<DataSet>>(member, std::move(render)));
}

void addConfigAttributes(Table& table) {
  table.emplace("uds", std::make_unique<FromConfig>(
                           [](const TrConfig& tr) { return jsonString(tr.uds); }));
  table.emplace("portNumber", std::make_unique<FromConfig>(
                                  [](const TrConfig& tr) { return jsonInt(tr.port); }));
}

void addDefaultDataSet(Table& table) {
  using ptpmgmt::DefaultDataSet;
  constexpr auto kSet = &DaemonState::defaults;
  add<DefaultDataSet>(table, "clockId", kSet, [](const DefaultDataSet& d) {
    return jsonString(formatClockIdentity(d.clockIdentity));
  });
  add<DefaultDataSet>(table, "domainNumber", kSet,
                      [](const DefaultDataSet& d) { return jsonInt(d.domainNumber); });
  add<DefaultDataSet>(table, "numberPorts", kSet,
                      [](const DefaultDataSet& d) { return jsonInt(d.numberPorts); });
  add<DefaultDataSet>(table, "priority1", kSet,
                      [](const DefaultDataSet& d) { return jsonInt(d.priority1); });
  add<DefaultDataSet>(table, "priority2", kSet,
                      [](const DefaultDataSet& d) { return jsonInt(d.priority2); });
  add<DefaultDataSet>(table, "clockClass", kSet,
                      [](const DefaultDataSet& d) { return jsonInt(d.quality.clockClass); });
  add<DefaultDataSet>(table, "clockAccuracy", kSet,
                      [](const DefaultDataSet& d) { return jsonInt(d.quality.clockAccuracy); });
  add<DefaultDataSet>(table, "offsetScaledLogVariance", kSet, [](const DefaultDataSet& d) {
    return jsonInt(d.quality.offsetScaledLogVariance);
  });
  add<DefaultDataSet>(table, "slaveOnly", kSet,
                      [](const DefaultDataSet& d) { return jsonBool(d.slaveOnly); });
  add<DefaultDataSet>(table, "twoStep", kSet,
                      [](const DefaultDataSet& d) { return jsonBool(d.twoStep); });
  table.emplace("type", std::make_unique<TypeAttribute>());
}

void addParentDataSet(Table& table) {
  using ptpmgmt::ParentDataSet;
  constexpr auto kSet = &DaemonState::parent;
  add<ParentDataSet>(table, "gmClockId", kSet, [](const ParentDataSet& p) {
    return jsonString(formatClockIdentity(p.grandmasterIdentity));
  });
  add<ParentDataSet>(table, "gmPriority1", kSet,
                     [](const ParentDataSet& p) { return jsonInt(p.grandmasterPriority1); });
  add<ParentDataSet>(table, "gmPriority2", kSet,
                     [](const ParentDataSet& p) { return jsonInt(p.grandmasterPriority2); });
  add<ParentDataSet>(table, "gmClockClass", kSet, [](const ParentDataSet& p) {
    return jsonInt(p.grandmasterQuality.clockClass);
  });
  add<ParentDataSet>(table, "gmClockAccuracy", kSet, [](const ParentDataSet& p) {
    return jsonInt(p.grandmasterQuality.clockAccuracy);
  });
  add<ParentDataSet>(table, "gmOffsetScaledLogVariance", kSet, [](const ParentDataSet& p) {
    return jsonInt(p.grandmasterQuality.offsetScaledLogVariance);
  });
  add<ParentDataSet>(table, "parentClockId", kSet, [](const ParentDataSet& p) {
    return jsonString(formatClockIdentity(p.parentPortIdentity.clock));
  });
  add<ParentDataSet>(table, "parentPortNumber", kSet,
                     [](const ParentDataSet& p) { return jsonInt(p.parentPortIdentity.port); });
}

void addCurrentDataSet(Table& table) {
  using ptpmgmt::CurrentDataSet;
  constexpr auto kSet = &DaemonState::current;
  add<CurrentDataSet>(table, "stepsRemoved", kSet,
                      [](const CurrentDataSet& c) { return jsonInt(c.stepsRemoved); });
  add<CurrentDataSet>(table, "offsetFromMasterNanos", kSet, [](const CurrentDataSet& c) {
    return formatScaledNanoseconds(c.offsetFromMaster);
  });
  add<CurrentDataSet>(table, "meanPathDelayNanos", kSet, [](const CurrentDataSet& c) {
    return formatScaledNanoseconds(c.meanPathDelay);
  });
}

void addTimeProperties(Table& table) {
  using ptpmgmt::TimePropertiesDataSet;
  constexpr auto kSet = &DaemonState::timeProperties;
  add<TimePropertiesDataSet>(table, "currentUtcOffset", kSet, [](const TimePropertiesDataSet& t) {
    return jsonInt(t.currentUtcOffset);
  });
  const std::pair<const char*, uint8_t> flags[] = {
      {"leap61", 0x01},        {"leap59", 0x02},         {"currentUtcOffsetValid", 0x04},
      {"ptpTimescale", 0x08},  {"timeTraceable", 0x10},  {"frequencyTraceable", 0x20}};
  for (const auto& [key, bit] : flags) {
    add<TimePropertiesDataSet>(table, key, kSet, [bit = bit](const TimePropertiesDataSet& t) {
      return jsonBool((t.flags & bit) != 0);
    });
  }
  add<TimePropertiesDataSet>(table, "timeSource", kSet,
                             [](const TimePropertiesDataSet& t) { return jsonInt(t.timeSource); });
}

void addPortDataSet(Table& table) {
  using ptpmgmt::PortDataSet;
  constexpr auto kSet = &DaemonState::port;
  add<PortDataSet>(table, "portState", kSet, [](const PortDataSet& p) {
    return jsonString(std::string("PTP_") + ptpmgmt::portStateName(p.portState));
  });
  add<PortDataSet>(table, "delayMechanism", kSet, [](const PortDataSet& p) {
    return jsonName(ptpmgmt::delayMechanismName(p.delayMechanism), p.delayMechanism);
  });
  add<PortDataSet>(table, "peerMeanPathDelayNanos", kSet, [](const PortDataSet& p) {
    return formatScaledNanoseconds(p.peerMeanPathDelay);
  });
  add<PortDataSet>(table, "logAnnounceInterval", kSet,
                   [](const PortDataSet& p) { return jsonInt(p.logAnnounceInterval); });
  add<PortDataSet>(table, "announceReceiptTimeout", kSet,
                   [](const PortDataSet& p) { return jsonInt(p.announceReceiptTimeout); });
  add<PortDataSet>(table, "logSyncInterval", kSet,
                   [](const PortDataSet& p) { return jsonInt(p.logSyncInterval); });
  add<PortDataSet>(table, "logMinDelayReqInterval", kSet,
                   [](const PortDataSet& p) { return jsonInt(p.logMinDelayReqInterval); });
  add<PortDataSet>(table, "logMinPdelayReqInterval", kSet,
                   [](const PortDataSet& p) { return jsonInt(p.logMinPdelayReqInterval); });
}

void addLinuxptpDataSets(Table& table) {
  using ptpmgmt::PortPropertiesNp;
  using ptpmgmt::TimeStatusNp;
  add<TimeStatusNp>(table, "masterOffsetNanos", &DaemonState::timeStatus,
                    [](const TimeStatusNp& t) { return jsonInt(t.masterOffset); });
  add<TimeStatusNp>(table, "gmPresent", &DaemonState::timeStatus,
                    [](const TimeStatusNp& t) { return jsonBool(t.gmPresent); });
  add<PortPropertiesNp>(table, "interface", &DaemonState::portProperties,
                        [](const PortPropertiesNp& p) { return jsonString(p.interfaceName); });
  add<PortPropertiesNp>(table, "timestamping", &DaemonState::portProperties,
                        [](const PortPropertiesNp& p) {
                          return jsonName(ptpmgmt::timestampingName(p.timestamping),
                                          p.timestamping);
                        });
}

const Table& table() {
  static const Table kTable = [] {
    Table built;
    addConfigAttributes(built);
    addDefaultDataSet(built);
    addParentDataSet(built);
    addCurrentDataSet(built);
    addTimeProperties(built);
    addPortDataSet(built);
    addLinuxptpDataSets(built);
    return built;
  }();
  return kTable;
}

}  // namespace

const TrAttribute* findTrAttribute(std::string_view key) {
  const auto found = table().find(key);
  return found != table().end() ? found->second.get() : nullptr;
}

const std::vector<std::string>& trAttributeNames() {
  static const std::vector<std::string> kNames = [] {
    std::vector<std::string> names;
    for (const auto& entry : table()) names.push_back(entry.first);
    return names;
  }();
  return kNames;
}

std::string derivedType(uint8_t transportSpecific, uint16_t numberPorts) {
  const bool gptp = transportSpecific == 1;
  if (numberPorts > 1) return gptp ? "IEEE 802.1AS-2011 TAB" : "IEEE 1588-2008 BC";
  return gptp ? "IEEE 802.1AS-2011" : "IEEE 1588-2008";
}

std::string jsonString(std::string_view text) {
  std::string json;
  json.reserve(text.size() + 2);  // the common case, nothing to escape
  json += '"';
  koerr::appendJsonEscaped(json, text);
  json += '"';
  return json;
}

}  // namespace kopdmlive
