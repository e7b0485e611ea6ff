#include "kosdtools_curl/web_helper_functions.h"

#include "error_record/error.h"

namespace kosdtools {
namespace curl {
namespace {

constexpr const char* kFile = "kosdtools_curl/webHelperFunctions";

const std::string& delimiter() {
  static const std::string kDelimiter("/");
  return kDelimiter;
}

[[noreturn]] void raiseUriError(int32_t line, const char* message, const std::string& uri,
                                const std::vector<std::string>* uriKeys) {
  koerr::Error error(koerr::koapalerr_invalidParameter, kFile, line, "kosyncdomain_debug");
  error.add("message", message).add("uri", uri);
  if (uriKeys != nullptr) error.addUInt("uriKeys.size()", static_cast<uint32_t>(uriKeys->size()));
  error.raise();
}

}  // namespace

void parseUri(const std::string& uri, const std::vector<std::string>& uriKeys,
              std::unordered_map<std::string, std::string>& out) {
  if (uri.empty() || uriKeys.empty()) {
    raiseUriError(176, "Failed to parse URI; URI is empty or was not provided URI keys.", uri,
                  &uriKeys);
  }
  const std::string& delim = delimiter();
  std::size_t start = uri.compare(0, delim.size(), delim) == 0 ? delim.size() : 0;

  for (std::size_t k = 0; k < uriKeys.size(); ++k) {
    const std::size_t found = uri.find(delim, start);
    const std::size_t pos = found == std::string::npos ? uri.size() : found;
    if (pos == start) {
      raiseUriError(194, "Failed to parse URI; encountered contiguous delimiters.", uri, nullptr);
    }
    out.emplace(uriKeys[k], uri.substr(start, pos - start));
    if (found == std::string::npos) {
      // Compared by value on purpose: a repeated last key name also ends it.
      if (uriKeys[k] == uriKeys.back()) return;
      raiseUriError(207, "Failed to parse URI; more keys than URI parts.", uri, &uriKeys);
    }
    start = pos + delim.size();
  }
  if (start < uri.size()) {
    raiseUriError(223, "Failed to parse URI; more URI parts than keys.", uri, &uriKeys);
  }
}

}  // namespace curl
}  // namespace kosdtools
