#include "ko/dsc/osdep/shared_library.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include <cmath>
#include <string>

#include "ko/dsc/osdep/os_exception.h"
#include "support/scratch.h"

namespace ko::dsc::osdep {
namespace {

TEST(LibrarySearchPath, ComponentFolderFirstThenDirectoryThenTheSystemLoader) {
  const answers_test::ScratchDir scratch;
  const std::string dir = scratch.str();
  const std::string other = dir + "/other";
  scratch.write("libx.so.13", "");
  scratch.write("other/kocurl/libx.so.13", "");

  const LibrarySearchPath path({dir + "/missing", other, dir});
  EXPECT_EQ(path.locate("kocurl", "libx.so.13"), other + "/kocurl/libx.so.13");
  EXPECT_EQ(path.locate("kossl", "libx.so.13"), dir + "/libx.so.13");
  EXPECT_EQ(path.locate("kossl", "liby.so.13"), "liby.so.13");

  setenv(LibrarySearchPath::kVariable, (":" + other + "::" + dir + ":").c_str(), 1);
  EXPECT_EQ(LibrarySearchPath::fromEnvironment().locate("kocurl", "libx.so.13"),
            other + "/kocurl/libx.so.13");
  unsetenv(LibrarySearchPath::kVariable);
  EXPECT_EQ(LibrarySearchPath::fromEnvironment().locate("kocurl", "libx.so.13"), "libx.so.13");
}

// The loader's own failure texts reach the binding's scenario tests; what
// they cannot reach is a symbol asked of a library that did not load.
TEST(SharedLibrary, ResolvesSymbolsAndRaisesOSExceptionWhenNotLoaded) {
  const SharedLibrary math(L"system", L"m", 6, LibrarySearchPath());
  ASSERT_TRUE(math.isLoaded()) << math.loaderError();
  EXPECT_EQ(math.path(), "libm.so.6");
  EXPECT_DOUBLE_EQ(reinterpret_cast<double (*)(double)>(math.symbol("cos"))(0.0), 1.0);

  const SharedLibrary absent(L"kocurl", L"ko_dsc_absent", 13, LibrarySearchPath());
  EXPECT_FALSE(absent.isLoaded());
  try {
    (void)absent.symbol("curl_easy_init");
    FAIL() << "no exception";
  } catch (const OSException& e) {
    EXPECT_EQ(e.code(), -52008);
    EXPECT_EQ(std::string(e.what()),
              "dlsym(curl_easy_init): library kocurl not loaded: " + absent.loaderError());
  }
}

}  // namespace
}  // namespace ko::dsc::osdep
