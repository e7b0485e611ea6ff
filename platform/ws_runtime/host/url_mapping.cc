#include "url_mapping.h"

#include <algorithm>
#include <array>

namespace ws::host {

namespace {

constexpr size_t kCommandOnly = 2;      // service, command
constexpr size_t kWithResource = 5;     // service, command, plugin, type, name
constexpr const char32_t* kResourceVariables[] = {U"plugin", U"type", U"name"};

int hexValue(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

// The segments after the leading '/'; counting stops one past the longest
// route, which is enough to refuse a longer path.
using Segments = std::array<std::string_view, kWithResource + 1>;
size_t splitPath(std::string_view path, Segments& segments) {
  size_t count = 0;
  size_t start = 1;  // after the leading '/'
  while (count < segments.size()) {
    const size_t slash = path.find('/', start);
    if (slash == std::string_view::npos) {
      segments[count++] = path.substr(start);
      return count;
    }
    segments[count++] = path.substr(start, slash - start);
    start = slash + 1;
  }
  return count;
}

// Nearly every component a client sends is plain ASCII without escapes and
// decodes to itself: it is widened in one pass, and only a component with a
// '%' or a byte above 0x7F goes through the two decoders.
bool widenPlain(std::string_view text, std::u32string& out) {
  out.resize(text.size());
  for (size_t i = 0; i < text.size(); ++i) {
    const auto c = static_cast<unsigned char>(text[i]);
    if (c == '%' || c >= 0x80) return false;
    out[i] = c;
  }
  return true;
}

bool decodeComponent(std::string_view raw, std::string& scratch, std::u32string& out) {
  return widenPlain(raw, out) || (percentDecode(raw, scratch) && utf8Decode(scratch, out));
}

bool namesService(std::string_view raw, std::string_view service, std::string& scratch) {
  if (raw.find('%') == std::string_view::npos) return raw == service;
  return percentDecode(raw, scratch) && scratch == service;
}

}  // namespace

bool percentDecode(std::string_view text, std::string& out) {
  out.clear();
  out.reserve(text.size());
  for (size_t i = 0; i < text.size(); ++i) {
    if (text[i] != '%') {
      out.push_back(text[i]);
      continue;
    }
    if (i + 2 >= text.size()) return false;
    const int high = hexValue(text[i + 1]);
    const int low = hexValue(text[i + 2]);
    if (high < 0 || low < 0) return false;
    out.push_back(static_cast<char>(high * 16 + low));
    i += 2;
  }
  return true;
}

bool utf8Decode(std::string_view text, std::u32string& out) {
  out.clear();
  out.reserve(text.size());
  size_t i = 0;
  while (i < text.size()) {
    const auto lead = static_cast<unsigned char>(text[i]);
    if (lead < 0x80) {
      out.push_back(lead);
      ++i;
      continue;
    }
    size_t extra;
    char32_t value;
    char32_t minimum;
    if ((lead & 0xE0) == 0xC0) {
      extra = 1, value = lead & 0x1F, minimum = 0x80;
    } else if ((lead & 0xF0) == 0xE0) {
      extra = 2, value = lead & 0x0F, minimum = 0x800;
    } else if ((lead & 0xF8) == 0xF0) {
      extra = 3, value = lead & 0x07, minimum = 0x10000;
    } else {
      return false;
    }
    if (text.size() - i <= extra) return false;
    for (size_t k = 1; k <= extra; ++k) {
      const auto next = static_cast<unsigned char>(text[i + k]);
      if ((next & 0xC0) != 0x80) return false;
      value = (value << 6) | (next & 0x3F);
    }
    if (value < minimum || value > 0x10FFFF || (value >= 0xD800 && value <= 0xDFFF)) return false;
    out.push_back(value);
    i += extra + 1;
  }
  return true;
}

void splitQuery(std::string& query, std::vector<RawParameter>& out) {
  out.clear();
  std::replace(query.begin(), query.end(), '+', ' ');
  const std::string_view text(query);
  size_t start = 0;
  while (start < text.size()) {
    const size_t amp = text.find('&', start);
    const size_t end = amp == std::string_view::npos ? text.size() : amp;
    const std::string_view piece = text.substr(start, end - start);
    const size_t equals = piece.find('=');
    if (equals == std::string_view::npos) {
      out.push_back(RawParameter{piece, {}});
    } else {
      out.push_back(RawParameter{piece.substr(0, equals), piece.substr(equals + 1)});
    }
    if (amp == std::string_view::npos) break;
    start = amp + 1;
  }
}

Mapping mapUrl(std::string_view service, std::string_view rawPath,
               const std::vector<RawParameter>& query, ws::runtime::ExchangeRequest& request) {
  if (rawPath.empty() || rawPath.front() != '/') return Mapping::kNotFound;
  Segments raw;
  const size_t count = splitPath(rawPath, raw);
  // Every request passes through here: per-thread scratch keeps its storage,
  // and the request's own strings are decoded into in place, so a mapping
  // allocates nothing once warm.
  thread_local std::string scratch;
  thread_local std::u32string path;
  thread_local std::u32string checked;
  if (!namesService(raw[0], service, scratch)) return Mapping::kNotFound;
  if (count != kCommandOnly && count != kWithResource) return Mapping::kNotFound;
  for (size_t i = 1; i < count; ++i) {
    if (raw[i].empty()) return Mapping::kNotFound;
  }
  // A path without escapes or raw UTF-8 is valid as it stands and widens in
  // one pass; any other path has each segment checked before anything is
  // written.
  const bool plain = widenPlain(rawPath, path);
  if (!plain) {
    for (size_t i = 1; i < count; ++i) {
      if (!decodeComponent(raw[i], scratch, checked)) return Mapping::kBadRequest;
    }
  }
  for (const RawParameter& parameter : query) {
    if (!decodeComponent(parameter.key, scratch, checked) ||
        !decodeComponent(parameter.value, scratch, checked)) {
      return Mapping::kBadRequest;
    }
  }
  // Everything decodes, so the request is written only now and in full.
  if (plain) {
    request.path.swap(path);
  } else {
    decodeComponent(rawPath, scratch, request.path);
  }
  decodeComponent(raw[1], scratch, request.command);
  request.variables.clear();
  for (size_t i = 2; i < count; ++i) {
    std::u32string value;
    decodeComponent(raw[i], scratch, value);
    request.addVariable(kResourceVariables[i - 2], std::move(value));
  }
  for (const RawParameter& parameter : query) {
    std::u32string key, value;
    decodeComponent(parameter.key, scratch, key);
    decodeComponent(parameter.value, scratch, value);
    request.addVariable(std::move(key), std::move(value));
  }
  return Mapping::kMapped;
}

}  // namespace ws::host
