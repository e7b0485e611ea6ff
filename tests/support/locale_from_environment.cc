// Linked into the test programs that also run under foreign locales: before
// any test, the process takes the locale named by QUILLON_TEST_LOCALE (from
// LOCPATH, where the build compiled it). A locale that cannot be set fails
// the run instead of letting it pass under "C".
#include <clocale>
#include <cstdio>
#include <cstdlib>

namespace {

const bool kLocaleTaken = [] {
  const char* name = std::getenv("QUILLON_TEST_LOCALE");
  if (name == nullptr) return false;
  if (std::setlocale(LC_ALL, name) == nullptr) {
    std::fprintf(stderr, "cannot set the locale %s (LOCPATH=%s)\n", name,
                 std::getenv("LOCPATH") != nullptr ? std::getenv("LOCPATH") : "");
    std::exit(1);
  }
  return true;
}();

}  // namespace
