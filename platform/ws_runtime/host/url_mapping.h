// Turns a request URL into what the plug-in sees: the command word and the
// URL variables of the service mounted at "/<service>".
//
//   /<service>/{command}                          -> command
//   /<service>/{command}/{plugin}/{type}/{name}   -> command, "plugin", "type", "name"
//
// Query parameters become variables too, after the route's own. Every segment
// and every query key and value is percent-decoded after the split (so "%2F"
// stays inside its segment) and then decoded from UTF-8.
//
// Thread-safety: pure functions.
#ifndef WS_RUNTIME_HOST_URL_MAPPING_H_
#define WS_RUNTIME_HOST_URL_MAPPING_H_

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "ws_runtime/exchange.h"

namespace ws::host {

enum class Mapping {
  kMapped,      // the request is for the plug-in
  kNotFound,    // not a route of the service
  kBadRequest,  // a route, but with a malformed escape or invalid UTF-8
};

// A query parameter as received: still percent-encoded; a parameter without
// '=' has an empty value.
struct RawParameter {
  std::string_view key;
  std::string_view value;
};

// Splits a raw query as the HTTP daemon would: at each '&', then at the
// first '='; '+' stands for a space and becomes one here, before any
// percent-decoding. A piece without '=' has an empty value; an empty piece
// between two '&' is a parameter with an empty name; a last empty piece
// (a query ending in '&') is nothing. `query` is rewritten in place and the
// parameters point into it. `out` is cleared first.
void splitQuery(std::string& query, std::vector<RawParameter>& out);

// Fills `request`'s path, command and variables from the raw (undecoded)
// path and query. `request` is written only when the result is kMapped.
Mapping mapUrl(std::string_view service, std::string_view rawPath,
               const std::vector<RawParameter>& query, ws::runtime::ExchangeRequest& request);

// Replaces each "%XX" by its byte; false on a '%' not followed by two hex
// digits.
bool percentDecode(std::string_view text, std::string& out);

// Strict UTF-8 (no overlong forms, surrogates or values above U+10FFFF);
// false on any invalid sequence.
bool utf8Decode(std::string_view text, std::u32string& out);

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_URL_MAPPING_H_
