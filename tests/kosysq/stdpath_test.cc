#include "kosysq/stdpath.h"

#include <gtest/gtest.h>

#include <map>

#include "support/answer_fixtures.h"

namespace {

using answers_test::OwnedStatus;
using answers_test::ScopedEnv;

std::map<std::string, std::string> defaultsWith(
    std::initializer_list<std::pair<const std::string, std::string>> changes) {
  std::map<std::string, std::string> table(kosysq::standardDirectoryDefaults().begin(),
                                           kosysq::standardDirectoryDefaults().end());
  for (const auto& [name, path] : changes) {
    table[name] = path;
  }
  return table;
}

TEST(StandardDirectoriesTest, RelocatesThroughTheLibraryUntilAnAnswerFails) {
  struct Case {
    const char* name;
    const char* library;
    std::optional<std::string> answers;
    std::map<std::string, std::string> expected;
    int32_t code;
  };
  const Case cases[] = {
      {"library answers 0 throughout", kosysq::kRelocationLibrary, std::nullopt, defaultsWith({}),
       0},
      {"two relocated", kosysq::kRelocationLibrary,
       std::string("bindir=/opt/k/bin;initddir=/opt/k/init.d"),
       defaultsWith({{"bindir", "/opt/k/bin"}, {"initddir", "/opt/k/init.d"}}), 0},
      // "libdir" fails: the names after it are never asked.
      {"negative answer", kosysq::kRelocationLibrary,
       std::string("bindir=/opt/k/bin;libdir=!;datadir=/opt/k/share"),
       defaultsWith({{"bindir", "/opt/k/bin"}}), -52006},
      {"no such library", "libkorelocations-absent.so.0", std::string("bindir=/opt/k/bin"),
       defaultsWith({}), 0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    ScopedEnv answers("KORELOCATIONS_ANSWERS", c.answers);
    const kosysq::StandardDirectories table(c.library);
    // Every user of the table hears of its failure, not just the first.
    for (int user = 0; user < 2; ++user) {
      OwnedStatus status;
      EXPECT_EQ(table.directories(status), c.expected);
      EXPECT_EQ(status.code, c.code);
    }
    OwnedStatus earlier(-7);
    EXPECT_EQ(table.lookup("bindir", earlier), c.expected.at("bindir"));
    EXPECT_EQ(earlier.code, -7);
  }
}

TEST(StandardDirectoriesTest, ProcessTableIsBuiltOnceOnFirstUse) {
  ScopedEnv answers("KORELOCATIONS_ANSWERS", std::string("docdir=/opt/k/doc"));
  OwnedStatus status;
  EXPECT_EQ(kosysq::standardDirectories().lookup("docdir", status), "/opt/k/doc");
  ScopedEnv changed("KORELOCATIONS_ANSWERS", std::string("docdir=/elsewhere"));
  EXPECT_EQ(kosysq::standardDirectories().lookup("docdir", status), "/opt/k/doc");
  EXPECT_EQ(kosysq::standardDirectories().lookup("nosuchdir", status), "");
  EXPECT_EQ(status.code, 0);
}

}  // namespace
