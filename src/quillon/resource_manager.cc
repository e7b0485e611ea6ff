#include "quillon/resource_manager.h"

#include <cstring>
#include <stdexcept>
#include <string_view>
#include <utility>
#include <vector>

#include "error_record/error.h"
#include "quillon/errors.h"
#include "syncable_device/syncable_device_actual.h"

namespace quillon {

namespace {

constexpr const char* kFile = "quillon/ResourceManager";
constexpr const char* kChannel = "kosyncdomain_debug";

// Documents are plain concatenations; one buffer sized up front keeps a
// listing to a single allocation in the common case.
void appendUriEntry(std::string& out, const std::string& uri) {
  out += "{\"uri\":\"";
  out += uri;
  out += "\"},";
}

// The grandmaster identity is the URI's last segment written as a clock
// identity: dashes become colons, capitals become small letters. ASCII-only
// lowering is what tolower does in the "C" locale the plug-in runs under.
// Appended straight to the document.
void appendGrandmasterId(std::string& out, const std::string& uri) {
  const std::string::size_type slash = uri.rfind('/');
  const std::size_t start = out.size();
  out.append(uri, slash == std::string::npos ? 0 : slash + 1, std::string::npos);
  for (std::size_t i = start; i < out.size(); ++i) {
    char& c = out[i];
    if (c == '-') {
      c = ':';
    } else if (c >= 'A' && c <= 'Z') {
      c = static_cast<char>(c - 'A' + 'a');
    }
  }
}

std::string quotedList(const std::vector<std::string>& uris) {
  std::string list = "[";
  for (std::size_t i = 0; i < uris.size(); ++i) {
    if (i != 0) list += ',';
    list += '"';
    list += uris[i];
    list += '"';
  }
  list += ']';
  return list;
}

}  // namespace

ResourceManager::ResourceManager(
    const std::shared_ptr<kosdtools::pendulo::TimescaleHelpersInterface>& helpers)
    : ResourceManager(
          helpers,
          std::make_shared<kosdplugins::pendulo::wrapper::SyncableDeviceActual>(kLocalDeviceUri)) {}

ResourceManager::ResourceManager(
    const std::shared_ptr<kosdtools::pendulo::TimescaleHelpersInterface>& helpers,
    std::shared_ptr<kosdlib::wrapper::SyncableDeviceInterface> device)
    : timescaleHelpers_(helpers), localDevice_(std::move(device)) {}

ResourceManager::~ResourceManager() = default;

std::string ResourceManager::getResources(const std::string& resourceType) {
  constexpr std::string_view kHead = "{\"version\":1,\"resources\":[";
  constexpr std::string_view kEntryHead = "{\"uri\":\"";
  constexpr std::string_view kEntryTail = "\"},";
  const bool all = resourceType.empty();
  const bool listsDevice = all || resourceType == "syncableDevices";
  const bool listsTimescales = all || resourceType == "timescales";
  // Both are asked for before anything is written, in this order, so that
  // the document can be sized once; the timescales are asked for even when
  // the device has no URI, so their errors still reach the client.
  const char* deviceUri = listsDevice ? localDevice_->getUri() : nullptr;
  std::vector<std::string> uris;
  if (listsTimescales) uris = timescaleHelpers_->getTimescaleUris();

  std::size_t size = kHead.size() + 2;
  if (deviceUri != nullptr) size += kEntryHead.size() + std::strlen(deviceUri) + kEntryTail.size();
  for (const std::string& uri : uris) size += kEntryHead.size() + uri.size() + kEntryTail.size();
  std::string out;
  // The envelope is later written around the document in the same storage.
  out.reserve(size + kEnvelopeRoom);
  out += kHead;
  if (listsDevice) {
    out += kEntryHead;
    // A device without a URI ends the document at that point, as a failed
    // stream write would.
    if (deviceUri == nullptr) return out;
    out += deviceUri;
    out += "\"}";
    if (all) out += ',';
  }
  if (listsTimescales) {
    for (const std::string& uri : uris) appendUriEntry(out, uri);
    // Always one step back: it drops the trailing comma, and with no entries
    // at all it drops the character before them ("[" or the device's ",").
    out.pop_back();
  }
  out += "]}";
  return out;
}

void ResourceManager::requireLocalDevice(const std::string& uri, int32_t line) {
  const char* deviceUri = localDevice_->getUri();
  if (deviceUri == nullptr) {
    throw std::logic_error("basic_string: construction from null is not valid");
  }
  if (uri == deviceUri) return;
  koerr::Error(koerr::koapalerr_resourceNotFound, kFile, line, kChannel)
      .add("message", "Requested syncableDeviceUri does not exist on this host.")
      .add("localDeviceUri", uri)
      .add("onlyDeviceUri", deviceUri)
      .raise();
}

std::string ResourceManager::getSyncableDevice(const std::string& uri) {
  requireLocalDevice(uri, 75);
  return localDevice_->toJson();
}

void ResourceManager::putSyncableDevice(const std::string& uri, const std::string& body) {
  requireLocalDevice(uri, 127);
  localDevice_->setCoherencyRequirements(body, std::string());
}

std::string ResourceManager::getTimescale(const std::string& uri) {
  const std::vector<std::string> uris = timescaleHelpers_->getTimescaleUris();
  for (const std::string& current : uris) {
    if (current != uri) continue;
    std::string out;
    // The identity is no longer than the URI; the envelope goes around it.
    out.reserve(64 + 2 * uri.size() + kEnvelopeRoom);
    out += "{\"version\":1,\"uri\":\"";
    out += uri;
    out += "\",\"data\":{\"grandmasterId\":\"";
    appendGrandmasterId(out, uri);
    out += "\"}}";
    return out;
  }
  koerr::Error(koerr::koapalerr_resourceNotFound, kFile, 98, kChannel)
      .add("message", "Requested timescaleUri does not match any timescaleUri on the system")
      .add("localTimescaleUri", uri)
      .addRaw("currentTimescaleUris", quotedList(uris))
      .raise();
}

}  // namespace quillon
