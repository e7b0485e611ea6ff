// Binds the segments of a slash-separated resource path, in order, to names
// given by the caller.
//
// Thread-safety: re-entrant.
#ifndef QUILLON_KOSDTOOLS_CURL_WEB_HELPER_FUNCTIONS_H_
#define QUILLON_KOSDTOOLS_CURL_WEB_HELPER_FUNCTIONS_H_

#include <string>
#include <unordered_map>
#include <vector>

namespace kosdtools {
namespace curl {

// Fills `out` with key -> raw segment (no decoding, no trimming); one leading
// "/" and one trailing "/" are tolerated. A key already in `out` keeps its
// value. Raises koapalerr_invalidParameter (-52005) on an empty URI or key
// list, on an empty segment, and when segments and keys do not pair up;
// `out` then keeps the pairs inserted so far.
void parseUri(const std::string& uri, const std::vector<std::string>& uriKeys,
              std::unordered_map<std::string, std::string>& out);

}  // namespace curl
}  // namespace kosdtools

#endif  // QUILLON_KOSDTOOLS_CURL_WEB_HELPER_FUNCTIONS_H_
