#include "kosysq/stdpath_util.h"

#include <gtest/gtest.h>

#include "support/answer_fixtures.h"

namespace {

using answers_test::errnoMember;
using answers_test::OwnedStatus;
using answers_test::ScopedEnv;
using answers_test::ScratchDir;

TEST(StdpathUtilTest, SharedDataDirectoryTrimsTheMarkerOrFallsBack) {
  ScratchDir dir;
  struct Case {
    const char* name;
    std::optional<std::string> marker;  // nullopt: no marker file at all
    std::string expected;
  };
  const Case cases[] = {
      {"no marker", std::nullopt, "/usr/local/korvane/share"},
      {"spaces and slashes", std::string("  /srv/share//\n"), "/srv/share"},
      {"empty", std::string(""), ""},
      {"inner space, NULs", std::string("\t/a b/\0\0\r\n", 10), "/a b"},
      {"only a slash", std::string("/"), ""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    const std::string marker = (dir.path() / c.name).string();
    if (c.marker) {
      dir.write(c.name, *c.marker);
    }
    ScopedEnv env("KOSYSQ_SHARE_DIR_FILE", marker);
    OwnedStatus status;
    std::string directory = "stale";
    kosysq::sharedDataDirectory(directory, status);
    EXPECT_EQ(directory, c.expected);
    EXPECT_EQ(status.code, 0);
    EXPECT_EQ(status.json, nullptr);
  }
  ScopedEnv empty("KOSYSQ_SHARE_DIR_FILE", std::string());
  EXPECT_EQ(kosysq::shareDirMarkerPath(), "/etc/korvane/share/share.dir");
}

TEST(StdpathUtilTest, ReadWholeFileKeepsEveryByteOrReportsWhy) {
  ScratchDir dir;
  const std::string binary("a\0b\nc\xff", 6);
  OwnedStatus status;
  std::string content;
  kosysq::readWholeFile(dir.write("data", binary), content, status);
  EXPECT_EQ(content, binary);
  EXPECT_EQ(status.code, 0);

  struct Case {
    std::string path;
    int32_t code;
    const char* head;
    int error;
    std::string debug;
  };
  const Case cases[] = {
      {dir.str() + "/missing", -52006,
       "{\"error_constant\":\"koapalerr_resourceNotFound\",\"file\":\"kosysq/stdpath_util\","
       "\"line\":224,",
       ENOENT, "\"message\":\"error opening file\",\"path\":\"" + dir.str() + "/missing\""},
      {dir.str(), -52008,
       "{\"error_constant\":\"koapalerr_osFault\",\"file\":\"kosysq/stdpath_util\",\"line\":249,",
       EISDIR, "\"message\":\"didn't read full content of file\""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.path);
    OwnedStatus failed;
    content = "stale";
    kosysq::readWholeFile(c.path, content, failed);
    EXPECT_EQ(content, "");
    EXPECT_EQ(failed.code, c.code);
    EXPECT_EQ(failed.text(), std::string(c.head) + "\"component\":\"quillon\"," +
                                 errnoMember(c.error) + ",\"kosysq_debug\":{" + c.debug + "}}");
  }
}

}  // namespace
