// The process-wide classic "C" locale that the text utilities imbue their
// streams with, so that numbers never pick up grouping or a decimal comma
// from the environment.
//
// Thread-safety: built during static initialisation, read-only afterwards.
#ifndef QUILLON_KO_DSC_C_LOCALE_H_
#define QUILLON_KO_DSC_C_LOCALE_H_

#include <locale>

namespace ko::dsc {

const std::locale& cLocale() noexcept;

}  // namespace ko::dsc

#endif  // QUILLON_KO_DSC_C_LOCALE_H_
