#include "ko/dsc/c_locale.h"

namespace ko::dsc {
namespace {

// Built at load time, before any request can need it.
const std::locale kCLocale("C");

}  // namespace

const std::locale& cLocale() noexcept { return kCLocale; }

}  // namespace ko::dsc
