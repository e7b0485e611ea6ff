#include "ko/dsc/exception.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <string>

#include "ko/dsc/osdep/os_exception.h"

namespace ko::dsc {
namespace {

using namespace exception;

// "code 'what' 'file':line" of a default member caught as std::exception.
template <typename T>
std::string caughtDefault() {
  try {
    throw T();
  } catch (const std::exception& caught) {
    const auto& member = dynamic_cast<const Exception&>(caught);
    return std::to_string(member.code()) + " '" + member.what() + "' '" + member.file() + "':" +
           std::to_string(member.line());
  }
}

// One member of each code and of each default text.
TEST(ExceptionFamily, MembersReportTheirCodeAndDefaultTextThroughTheBase) {
  EXPECT_EQ(caughtDefault<Exception>(), "-411200 'unspecified exception' '':0");
  EXPECT_EQ(caughtDefault<AccessDenied>(), "-52008 'unspecified exception' '':0");
  EXPECT_EQ(caughtDefault<BufferOverflow>(), "-52000 'unspecified exception' '':0");
  EXPECT_EQ(caughtDefault<FileAlreadyExists>(), "-52007 'unspecified exception' '':0");
  EXPECT_EQ(caughtDefault<InvalidLocale>(), "-52005 'Invalid locale' '':0");
  EXPECT_EQ(caughtDefault<NonexistentException>(), "-52006 'unspecified exception' '':0");
  EXPECT_EQ(caughtDefault<OutOfRange2>(), "-52005 'Out of range' '':0");
}

TEST(ExceptionFamily, RaiserDetailsSurviveCopiesAndRefinementsAreCaughtByTheirNamesake) {
  try {
    throw OutOfRange2("ko/dsc/Test", 42, "value 300 does not fit");
  } catch (const OutOfRange& e) {
    const OutOfRange copy(e);
    EXPECT_EQ(copy.code(), -52005);
    EXPECT_STREQ(copy.file(), "ko/dsc/Test");
    EXPECT_EQ(copy.line(), 42);
    EXPECT_STREQ(copy.what(), "value 300 does not fit");
    // Copies share the text, so the pointer handed out stays valid across copies.
    EXPECT_EQ(copy.what(), e.what());
  }
  const InvalidArgument custom(-1, "ko/dsc/Test", 7, "");
  EXPECT_EQ(custom.code(), -1);
  EXPECT_STREQ(custom.what(), "unspecified exception");
  const Exception nullFile(-2, nullptr, 3, "t");
  EXPECT_STREQ(nullFile.file(), "");
}

TEST(OsExceptions, PosixErrorNamesTheCallTheSystemTextAndTheNumber) {
  const osdep::PosixError error("ko/dsc/Test", 9, "open", ENOENT);
  EXPECT_EQ(error.error(), ENOENT);
  EXPECT_EQ(error.code(), -52008);
  EXPECT_EQ(error.line(), 9);
  EXPECT_EQ(std::string(error.what()), "open: No such file or directory (errno 2)");
  const Exception& asMember = error;
  EXPECT_STREQ(asMember.file(), "ko/dsc/Test");
  const osdep::OSException loader("ko/dsc/SharedLibrary", 1, "dlsym: missing");
  EXPECT_STREQ(loader.what(), "dlsym: missing");
}

}  // namespace
}  // namespace ko::dsc
