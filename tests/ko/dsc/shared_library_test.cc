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

TEST(SharedLibrary, ResolvesSymbolsAndRaisesOSExceptionWithTheLoaderText) {
  const SharedLibrary math(L"system", L"m", 6, LibrarySearchPath());
  ASSERT_TRUE(math.isLoaded()) << math.loaderError();
  EXPECT_EQ(math.path(), "libm.so.6");
  auto* cosine = reinterpret_cast<double (*)(double)>(math.symbol("cos"));
  EXPECT_DOUBLE_EQ(cosine(0.0), 1.0);
  try {
    (void)math.symbol("no_such_symbol_here");
    FAIL() << "no exception";
  } catch (const OSException& e) {
    EXPECT_EQ(e.code(), -52008);
    EXPECT_STREQ(e.file(), "ko/dsc/osdep/SharedLibrary");
    EXPECT_EQ(std::string(e.what()).rfind("dlsym(no_such_symbol_here) in libm.so.6: ", 0), 0u)
        << e.what();
  }

  const SharedLibrary absent(L"kocurl", L"ko_dsc_absent", 13, LibrarySearchPath());
  EXPECT_FALSE(absent.isLoaded());
  EXPECT_EQ(absent.loaderError().rfind("dlopen(libko_dsc_absent.so.13): ", 0), 0u)
      << absent.loaderError();
  try {
    (void)absent.symbol("curl_easy_init");
    FAIL() << "no exception";
  } catch (const OSException& e) {
    EXPECT_EQ(std::string(e.what()).rfind("dlsym(curl_easy_init): library kocurl not loaded: dlopen(", 0),
              0u)
        << e.what();
  }
}

}  // namespace
}  // namespace ko::dsc::osdep
