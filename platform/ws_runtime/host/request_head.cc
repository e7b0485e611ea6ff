#include "request_head.h"

namespace ws::host {

namespace {

char lowerAscii(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }

// Whether the ", "-joined `list` has `value` as one of its items: the same
// media type sent in two fields must not read as a list of two.
bool listHolds(std::string_view list, std::string_view value) {
  for (size_t start = 0;;) {
    const size_t end = list.find(", ", start);
    if (list.substr(start, end - start) == value) return true;
    if (end == std::string_view::npos) return false;
    start = end + 2;
  }
}

}  // namespace

bool equalsIgnoringCase(std::string_view a, std::string_view b) {
  if (a.size() != b.size()) return false;
  for (size_t i = 0; i < a.size(); ++i) {
    const auto x = static_cast<unsigned char>(a[i]);
    const auto y = static_cast<unsigned char>(b[i]);
    if (x == y) continue;
    // Differing only in the case bit, and a letter.
    const unsigned lower = x | 0x20u;
    if ((x ^ y) != 0x20u || lower < 'a' || lower > 'z') return false;
  }
  return true;
}

std::string_view trimSpaces(std::string_view value) {
  const auto isSpace = [](char c) { return c == ' ' || c == '\t'; };
  while (!value.empty() && isSpace(value.front())) value.remove_prefix(1);
  while (!value.empty() && isSpace(value.back())) value.remove_suffix(1);
  return value;
}

void RequestHead::clear() {
  hasContentType_ = false;
  hasAccept_ = false;
  acceptJoined_.clear();
  hasLength_ = false;
  expectsContinue_ = false;
  verdict_ = HeadVerdict::kAccepted;
}

void RequestHead::add(std::string_view name, std::string_view value) {
  if (name.empty()) return;
  value = trimSpaces(value);
  // The first letter settles most headers (Host, User-Agent, ...) without a
  // whole comparison.
  switch (lowerAscii(name[0])) {
    case 'a':
      if (!equalsIgnoringCase(name, "Accept")) return;
      if (!hasAccept_) {
        hasAccept_ = true;
        acceptView_ = value;
      } else if (!listHolds(acceptView_, value)) {
        if (acceptJoined_.empty()) acceptJoined_.assign(acceptView_);
        acceptJoined_.append(", ").append(value);
        acceptView_ = acceptJoined_;
      }
      return;
    case 'c':
      if (equalsIgnoringCase(name, "Content-Type")) {
        if (hasContentType_ && value != contentType_) {
          verdict_ = HeadVerdict::kConflictingContentType;
        }
        hasContentType_ = true;
        contentType_ = value;
      } else if (equalsIgnoringCase(name, "Content-Length")) {
        hasLength_ = true;
        length_ = value;
      }
      return;
    case 'e':
      if (equalsIgnoringCase(name, "Expect") && equalsIgnoringCase(value, "100-continue")) {
        expectsContinue_ = true;
      }
      return;
    default:
      return;
  }
}

HeadVerdict RequestHead::verdict() const { return verdict_; }

bool RequestHead::declaredLength(uint64_t& length) const {
  if (!hasLength_ || length_.empty() || length_.size() > 19) return false;
  uint64_t value = 0;
  for (const char c : length_) {
    if (c < '0' || c > '9') return false;
    value = value * 10 + static_cast<uint64_t>(c - '0');
  }
  length = value;
  return true;
}

}  // namespace ws::host
