// What the host takes from a request head besides its URL and its framing
// (head_rules.h): the two headers a plug-in may read, and whether the client
// waits for "100 Continue".
//
// Header names compare without regard to ASCII case (never the locale's);
// values are trimmed of surrounding spaces and tabs. Repeated Accept headers
// combine into one list joined by ", ", as HTTP defines for list headers; a
// value the list already holds is not added again.
//
// Thread-safety: one RequestHead per request being read; no shared state.
#ifndef WS_RUNTIME_HOST_REQUEST_HEAD_H_
#define WS_RUNTIME_HOST_REQUEST_HEAD_H_

#include <cstdint>
#include <string>
#include <string_view>

namespace ws::host {

enum class HeadVerdict {
  kAccepted,
  kConflictingContentType,  // two Content-Type values that differ
};

class RequestHead {
 public:
  // Forgets the previous request; keeps the storage of the combined Accept.
  void clear();
  // One header as received, in order.
  void add(std::string_view name, std::string_view value);

  [[nodiscard]] HeadVerdict verdict() const;
  // Null when the header was not sent; otherwise its trimmed value, valid as
  // long as the bytes given to add() and this object.
  const std::string_view* contentType() const { return hasContentType_ ? &contentType_ : nullptr; }
  const std::string_view* accept() const { return hasAccept_ ? &acceptView_ : nullptr; }
  // Whether the client waits for "100 Continue" before it sends its body.
  bool expectsContinue() const { return expectsContinue_; }
  // The declared body size; false when none was declared or it is not a
  // number.
  bool declaredLength(uint64_t& length) const;

 private:
  bool hasContentType_ = false;
  std::string_view contentType_;
  bool hasAccept_ = false;
  std::string_view acceptView_;  // the header itself, or acceptJoined_
  std::string acceptJoined_;
  bool hasLength_ = false;
  std::string_view length_;
  bool expectsContinue_ = false;
  HeadVerdict verdict_ = HeadVerdict::kAccepted;
};

// ASCII-only, so that a Turkish or any other locale cannot change which
// header is which.
bool equalsIgnoringCase(std::string_view a, std::string_view b);
std::string_view trimSpaces(std::string_view value);

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_REQUEST_HEAD_H_
