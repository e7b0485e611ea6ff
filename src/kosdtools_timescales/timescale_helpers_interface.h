// The time service's answers turned into what the resource layer needs: TR
// identifiers, grandmaster identities and the timescale URIs under which each
// usable TR is published, in priority order.
//
// Thread-safety: no state beyond the client reference; as thread-safe as the
// client library. Every call asks the time service again.
#ifndef QUILLON_KOSDTOOLS_TIMESCALES_TIMESCALE_HELPERS_INTERFACE_H_
#define QUILLON_KOSDTOOLS_TIMESCALES_TIMESCALE_HELPERS_INTERFACE_H_

#include <string>
#include <vector>

namespace kosdtools {
namespace pendulo {

class TimescaleHelpersInterface {
 public:
  virtual ~TimescaleHelpersInterface() = default;

  // Replaces every ' ' by '-' in place; returns `text`.
  virtual std::string& replaceSpacesWithDashes(std::string& text) = 0;
  // Drops the remote-host segment of a six-segment timescale URI.
  virtual std::string normalizeTimescaleUri(const std::string& uri) = 0;
  virtual std::string getTrGmId(const std::string& trId) = 0;
  virtual std::string getTimescaleUri(const std::string& trId) = 0;
  virtual std::string getFirstTrId() = 0;
  virtual std::string getFirstTrTimescaleUri() = 0;
  // URIs of all usable TRs, in priority order.
  virtual std::vector<std::string> getTimescaleUris() = 0;
  virtual std::string getFirstTrGmId() = 0;
};

}  // namespace pendulo
}  // namespace kosdtools

#endif  // QUILLON_KOSDTOOLS_TIMESCALES_TIMESCALE_HELPERS_INTERFACE_H_
