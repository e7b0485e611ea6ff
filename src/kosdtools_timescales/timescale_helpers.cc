#include "kosdtools_timescales/timescale_helpers.h"

#include <cjson/cJSON.h>

#include <cstring>
#include <string_view>
#include <unordered_map>

#include "error_record/error.h"
#include "kojsonlh/array_iterator.h"
#include "kojsonlh/cjson_utils.h"
#include "kojsonlh/cpp_json.h"
#include "kosdtools_curl/web_helper_functions.h"
#include "kosynctools_cjson/json_helper_functions.h"

namespace kosdtools {
namespace pendulo {
namespace {

constexpr const char* kFile = "kosdtools_timescales/timescaleHelpers";
constexpr const char* kChannel = "kosyncdomain_debug";
constexpr const char* kTimeReferencesKey = "timeReferences";
constexpr const char* kUriPrefix = "/quillon/timescales/pendulo/";
constexpr const char* kDelimiter = "/";
constexpr const char* kNotExistMessage = "The specified Pendulo Time Reference does not exist.";

// Compared as views: the lengths decide most mismatches without a scan.
bool isBoundaryClockType(std::string_view type) {
  return type == "IEEE 802.1AS-2011 TAB" || type == "IEEE 1588-2008 BC";
}

bool isOrdinaryClockType(std::string_view type) {
  return type == "IEEE 802.1AS-2011" || type == "IEEE 1588-2008";
}

koerr::Error error(const koerr::ErrorConstant& constant, int32_t line) {
  return koerr::Error(constant, kFile, line, kChannel);
}

// The member `key` of a parsed answer, or null when the answer did not parse,
// is no object or lacks the member.
const cJSON* findMember(const CppJson& document, const char* key) {
  if (!cJSON_IsObject(document.get())) return nullptr;
  return cJSONUtils::getObjectItem(document.get(), key);
}

}  // namespace

// The literals that tell the three TR attribute reads apart.
struct TimescaleHelpers::AttrRead {
  std::string key;  // a string already: both the client and the typed read take one
  int32_t notSetLine;
  const char* notSetMessage;
  int32_t notExistLine;
  int32_t parseLine;
  const char* parseMessage;
  const char* parseKeyName;
  const char* parseJsonName;
  int32_t nullLine;
  const char* nullMessage;
  bool namesKey;  // adds "timeReferenceTypeKey" to the not-set, not-exist and null errors
};

TimescaleHelpers::TimescaleHelpers(std::shared_ptr<kopendulo::ApiWrapperInterface> client)
    : client_(std::move(client)) {}

std::string& TimescaleHelpers::replaceSpacesWithDashes(std::string& text) {
  // Spaces are rare in identifiers: the search skips from one to the next
  // instead of testing every byte of the URI.
  char* next = text.data();
  char* const end = next + text.size();
  while (next != end) {
    next = static_cast<char*>(std::memchr(next, ' ', static_cast<std::size_t>(end - next)));
    if (next == nullptr) break;
    *next++ = '-';
  }
  return text;
}

std::string TimescaleHelpers::normalizeTimescaleUri(const std::string& uri) {
  static const std::vector<std::string> kKeys = {"remoteHost", "webService", "resource",
                                                 "plugin",     "trId",       "gmId"};
  std::unordered_map<std::string, std::string> parts;
  kosdtools::curl::parseUri(uri, kKeys, parts);
  // The remote host is dropped: URIs are published without it.
  return kDelimiter + parts["webService"] + kDelimiter + parts["resource"] + kDelimiter +
         parts["plugin"] + kDelimiter + parts["trId"] + kDelimiter + parts["gmId"];
}

std::string TimescaleHelpers::getTrGmId(const std::string& trId) {
  static const AttrRead kRead{"gmClockId",
                              87,
                              "The specified Pendulo Time Reference has not set a Grandmaster ID.",
                              95,
                              106,
                              "Failed to parse gmClockId key from gmIdJson.",
                              "gmClockIdKey",
                              "gmIdJson",
                              115,
                              "The specified Pendulo Time Reference's Grandmaster ID is null.",
                              false};
  return readTrAttr(trId, kRead);
}

std::string TimescaleHelpers::getTimescaleUri(const std::string& trId) {
  const std::string gmId = getTrGmId(trId);
  // Sized once: a listing builds one of these per published TR.
  std::string uri;
  uri.reserve(std::char_traits<char>::length(kUriPrefix) + trId.size() + 1 + gmId.size());
  uri.append(kUriPrefix).append(trId).append(kDelimiter).append(gmId);
  // The URI moves out unless a substitute's replacement hands back another
  // string, which is then what the URI is.
  const std::string& replaced = replaceSpacesWithDashes(uri);
  if (&replaced != &uri) return replaced;
  return uri;
}

std::string TimescaleHelpers::getFirstTrId() {
  std::string listJson = readTrListJson(146);
  CppJson document(cJSON_Parse(listJson.c_str()));
  const cJSON* list = findMember(document, kTimeReferencesKey);
  std::vector<std::string> ids;
  if (list != nullptr && !cJSONUtils::isNull(list)) ids = readStrings(list);
  if (ids.empty()) {
    error(koerr::koapalerr_invalidParameter, 160)
        .add("message", "Failed to parse TR ID from TR list JSON or TR list is empty.")
        .add("trListJson", listJson)
        .add("trId", kTimeReferencesKey)
        .raise();
  }
  return ids.front();
}

std::string TimescaleHelpers::getFirstTrTimescaleUri() { return getTimescaleUri(getFirstTrId()); }

std::vector<std::string> TimescaleHelpers::getTimescaleUris() {
  const std::vector<std::string> ids = getTrIds();
  std::vector<std::string> uris;
  uris.reserve(ids.size());
  for (const std::string& id : ids) {
    const std::string type = getTrType(id);
    if (isBoundaryClockType(type)) {
      uris.insert(uris.begin(), getTimescaleUri(id));
    } else if (isOrdinaryClockType(type)) {
      if (isTrMasterOrDisabled(id)) {
        uris.push_back(getTimescaleUri(id));
      } else if (isTrSelectedSlave(id)) {
        uris.insert(uris.begin(), getTimescaleUri(id));
      }
    }
  }
  return uris;
}

std::string TimescaleHelpers::getFirstTrGmId() { return getTrGmId(getFirstTrId()); }

std::vector<std::string> TimescaleHelpers::getTrIds() {
  std::string listJson = readTrListJson(182);
  CppJson document(cJSON_Parse(listJson.c_str()));
  const cJSON* list = findMember(document, kTimeReferencesKey);
  if (list == nullptr) {
    error(koerr::koapalerr_invalidParameter, 193)
        .add("message", "Failed to parse TR IDs from TR list JSON.")
        .add("trListJson", listJson)
        .add("trIds", kTimeReferencesKey)
        .raise();
  }
  // A null list is taken as an empty one.
  if (cJSONUtils::isNull(list)) return {};
  return readStrings(list);
}

std::string TimescaleHelpers::getTrType(const std::string& trId) {
  static const AttrRead kRead{"type",
                              214,
                              "The specified Pendulo Time Reference has not set a Time Reference Type",
                              221,
                              232,
                              "Failed to parse typeKey key from trTypeJson.",
                              "typeKey",
                              "trTypeJson",
                              240,
                              "The specified Pendulo Time Reference's Type is null.",
                              true};
  return readTrAttr(trId, kRead);
}

std::string TimescaleHelpers::getTrPortState(const std::string& trId) {
  static const AttrRead kRead{"portState",
                              261,
                              "The specified Pendulo Time Reference has not set a Port State",
                              268,
                              279,
                              "Failed to parse portStateKey key from trStateJson.",
                              "portStateKey",
                              "trStateJson",
                              287,
                              "The specified Pendulo Time Reference's Port State is null.",
                              false};
  return readTrAttr(trId, kRead);
}

bool TimescaleHelpers::isTrMasterOrDisabled(const std::string& trId) {
  const std::string portState = getTrPortState(trId);
  const std::string_view state = portState;
  return state == "PTP_MASTER" || state == "PTP_DISABLED";
}

bool TimescaleHelpers::isTrSelectedSlave(const std::string& trId) {
  const std::string portState = getTrPortState(trId);
  std::string selectedTrId;
  if (!client_->getSelectedTrId(&selectedTrId)) return false;
  return selectedTrId == trId && portState == "PTP_SLAVE";
}

std::string TimescaleHelpers::readTrListJson(int32_t olderServiceLine) {
  std::string listJson;
  try {
    client_->getPdmAttrJson(kTimeReferencesKey, &listJson);
  } catch (const koerr::ExceptionBase& caught) {
    if (caught.code() != koerr::kPdmAttrNotSetCode) throw;
    error(koerr::koapalerr_resourceNotFound, olderServiceLine)
        .add("message",
             "Pendulo does not have the specified attr; maybe the target is running an older "
             "version of Pendulo.")
        .add("attrKey", kTimeReferencesKey)
        .nest(caught.status())
        .raise();
  }
  return listJson;
}

std::vector<std::string> TimescaleHelpers::readStrings(const cJSON* list) {
  std::vector<std::string> strings;
  ArrayIterator elements(list);
  std::size_t count = 0;
  for (const cJSON* element = list->child; element != nullptr; element = element->next) ++count;
  strings.reserve(count);
  while (elements.hasNext()) strings.push_back(cJSONUtils::getString(elements.next()));
  return strings;
}

std::string TimescaleHelpers::readTrAttr(const std::string& trId, const AttrRead& read) {
  // A buffer of the call's own, not one kept per thread: a thread-local
  // object with a destructor pins the plug-in in memory after the host
  // unloads it, for as long as the reading thread lives.
  std::string answer;
  try {
    client_->getTrAttrJson(trId, read.key, &answer);
  } catch (const koerr::ExceptionBase& caught) {
    const bool notSet = caught.code() == koerr::kPdmAttrNotSetCode;
    if (!notSet && caught.code() != koerr::kPdmTrDoesNotExistCode) throw;
    koerr::Error replacement = error(koerr::koapalerr_resourceNotFound,
                                     notSet ? read.notSetLine : read.notExistLine);
    replacement.add("message", notSet ? read.notSetMessage : kNotExistMessage)
        .add("timeReferenceId", trId);
    if (read.namesKey) replacement.add("timeReferenceTypeKey", read.key);
    replacement.nest(caught.status()).raise();
  }

  CppJson document(cJSON_Parse(answer.c_str()));
  const cJSON* member = findMember(document, read.key.c_str());
  if (member == nullptr) {
    error(koerr::koapalerr_invalidParameter, read.parseLine)
        .add("message", read.parseMessage)
        .add(read.parseKeyName, read.key)
        .add(read.parseJsonName, answer)
        .raise();
  }
  std::string value;
  if (!cJSONUtils::isNull(member)) {
    value = kosynctools::cjson::getStringValue(member, answer, read.key);
  }
  if (value.empty()) {
    koerr::Error nullValue = error(koerr::koapalerr_resourceNotFound, read.nullLine);
    nullValue.add("message", read.nullMessage).add("timeReferenceId", trId);
    if (read.namesKey) nullValue.add("timeReferenceTypeKey", read.key);
    nullValue.raise();
  }
  return value;
}

}  // namespace pendulo
}  // namespace kosdtools
