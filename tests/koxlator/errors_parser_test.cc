#include "koxlator/errors_parser.h"

#include <gtest/gtest.h>

#include <cstring>
#include <filesystem>

#include "support/answer_fixtures.h"

namespace {

using answers_test::errnoMember;
using answers_test::OwnedStatus;
using answers_test::ScratchDir;

const std::string kHead = "<?xml version=\"1.0\"?>\n<kodocument>\n";

std::string entry(const std::string& code, const std::string& body) {
  return "<koerror code=\"" + code + "\">\n" + body + "</koerror>\n";
}

std::string lookupIn(const std::string& file, int32_t code, OwnedStatus& status) {
  std::string text = "stale";
  koxlator::readExplanationFile(file, code, text, status);
  return text;
}

TEST(ErrorsParserTest, FindsEntriesWhateverTheirSpellingAndSkipsOtherFiles) {
  ScratchDir dir;
  const std::string lf =
      dir.write("lf.txt",
                "<?XML VERSION=\"1.0\" encoding=\"UTF-8\"?>\n<KODOCUMENT>\n"
                "<kocomment>\n" +
                    entry("7", "inside a comment\n") +
                    "</kocomment> closes here\n"
                    "<KOERROR CODE=\"-52005\">\nInvalid parameter.\n</KoError>\n" +
                    entry("0x10", "Sixteen,\non two lines.\n\n") +
                    "  <koerror code=\"5\">\nindented, so never an entry\n</koerror>\n"
                    "free text between entries\n"
                    "<koerror code=\"12\">text on the tag line\nbody\n</koerror> and after it\n" +
                    // A 1023-byte piece fills the line buffer; the rest of that line then
                    // arrives as a line of its own, which here ends the entry.
                    "<koerror code=\"13\">\n" + std::string(1023, 'x') +
                    "</koerror>\n"
                    "</kodocument>\n" +
                    entry("99", "after the end\n"));
  const std::string crlf =
      dir.write("crlf.txt",
                "<?xml version=\"1.0\"?>\r\n<kodocument>\r\n<koerror code=\"1\">\r\n"
                "line one\r\nline two\r\n\r\n</koerror>\r\n</kodocument>\r\n");
  // Files of another kind are skipped without a word.
  const std::string body = entry("1", "one\n") + "</kodocument>\n";
  const std::string others[] = {
      dir.write("empty.txt", ""), dir.write("head.txt", "<?xml version=\"1.0\"?>\n"),
      dir.write("v11.txt", "<?xml version=\"1.1\"?>\n<kodocument>\n" + body),
      dir.write("indented.txt", "<?xml version=\"1.0\"?>\n <kodocument>\n" + body)};
  struct Case {
    const std::string* file;
    int32_t code;
    std::string expected;
  };
  const Case cases[] = {
      {&lf, -52005, "Invalid parameter."},
      {&lf, 16, "Sixteen,\non two lines."},
      {&lf, 7, ""},
      {&lf, 5, ""},
      {&lf, 12, "body"},
      {&lf, 13, std::string(1023, 'x')},
      {&lf, 99, ""},
      {&crlf, 1, "line one\r\nline two"},
      {&others[0], 1, ""}, {&others[1], 1, ""}, {&others[2], 1, ""}, {&others[3], 1, ""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(*c.file + " code " + std::to_string(c.code));
    OwnedStatus status;
    EXPECT_EQ(lookupIn(*c.file, c.code, status), c.expected);
    EXPECT_EQ(status.code, 0);
    EXPECT_EQ(status.json, nullptr);
  }
}

TEST(ErrorsParserTest, MalformedFilesAreReportedExactly) {
  ScratchDir dir;
  // `debug` ends in the quote of the debug text, plus any members after it.
  const auto malformed = [](int line, const std::string& debug) {
    return "{\"error_constant\":\"koapalerr_resourceNotFound\","
           "\"file\":\"koxlator/gxErrorsParser\",\"line\":" + std::to_string(line) +
           ",\"component\":\"quillon\",\"koxlator_debug\":{\"debug\":\"" + debug + "}}";
  };
  struct Case {
    const char* name;
    std::string content;  // empty: the file does not exist
    std::string expected;
  };
  const Case cases[] = {
      {"missing", "",
       malformed(148, "Could not open status explanations file\",\"path\":\"" + dir.str() +
                          "/missing\"")},
      {"no end tag", kHead + "<koerror code=\"1\">\none\n",
       malformed(208, "Bad explanation file. Could not find the end of the status code "
                      "definition !\"")},
      {"NUL line",
       kHead + entry("2", "two\n") + std::string("\0heading\n", 9) + entry("1", "one\n"),
       malformed(229, "Bad explanation file. Unidentified section heading !\"")},
      {"unreadable code", kHead + entry("one", "one\n"),
       malformed(176, "Could not successfully read the status data!\",\"sscanf\":0")},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    const std::string path =
        c.content.empty() ? dir.str() + "/missing" : dir.write(c.name, c.content);
    OwnedStatus status;
    EXPECT_EQ(lookupIn(path, 1, status), "");
    EXPECT_EQ(status.code, -52006);
    EXPECT_EQ(status.text(), c.expected);
  }
}

TEST(ErrorsParserTest, SearchesLanguageDirectoryThenItsParent) {
  ScratchDir dir;
  const std::string errors = dir.str() + "/errors";
  // Whichever of a.txt and b.err is listed first, the search must stop at the
  // file that explains the code.
  dir.write("errors/English/a.txt", kHead + entry("3", "three\n"));
  dir.write("errors/English/b.err", kHead + entry("4", "four\n"));
  dir.write("errors/English/c.md", kHead + entry("5", "not an explanation file\n"));
  dir.write("errors/English/sub.txt/d.txt", kHead + entry("6", "in a subdirectory\n"));
  dir.write("errors/parent.txt",
            kHead + entry("2", "from the parent\n") + entry("3", "shadowed\n"));

  struct Case {
    int32_t code;
    std::string expected;
  };
  const Case cases[] = {{2, "from the parent"}, {3, "three"}, {4, "four"}, {5, ""}, {6, ""}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.code);
    OwnedStatus status;
    std::string text = "stale";
    koxlator::lookupExplanation(errors, c.code, koxlator::kEnglish, text, status);
    EXPECT_EQ(text, c.expected);
    EXPECT_EQ(status.code, 0);
  }
}

TEST(ErrorsParserTest, DirectoryFailuresStopTheLookup) {
  ScratchDir dir;
  dir.write("errors/parent.txt", kHead + entry("2", "from the parent\n"));
  const std::string errors = dir.str() + "/errors";
  // Both failed system calls, each in its own source file.
  const auto notFound = [&](const char* file, int line, const char* key, const char* debug,
                            const char* path) {
    return std::string("{\"error_constant\":\"koapalerr_resourceNotFound\",\"file\":\"koxlator/") +
           file + "\",\"line\":" + std::to_string(line) + ",\"component\":\"quillon\"," +
           errnoMember(ENOENT) + ",\"koxlator_debug\":{\"" + key + "\":\"" + debug +
           "\",\"path\":\"" + errors + path + "\"}}";
  };
  const std::string noEnglish =
      notFound("koxlator_internal", 63, "debug", "open dir failed", "/English");
  const std::string dangling =
      notFound("gxErrorsParser", 96, "koxlator", "get file info failed", "/English/gone.txt");
  const std::string badLanguage =
      "{\"error_constant\":\"koapalerr_invalidParameter\",\"file\":\"koxlator/gxErrorsParser\","
      "\"line\":43,\"component\":\"quillon\",\"koxlator_debug\":{\"gxerrorsparser\":"
      "\"invalid language\",\"lang\":6}}";
  struct Case {
    const char* name;
    uint32_t language;
    bool breakEnglish;
    std::string expected;
  };
  // The explanation sits in the parent all along: no failure falls back to it.
  const Case cases[] = {{"no English subdirectory", 0, false, noEnglish},
                        {"language out of range", 6, false, badLanguage},
                        {"dangling link in English", 0, true, dangling}};
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    if (c.breakEnglish) {
      std::filesystem::create_directories(errors + "/English");
      std::filesystem::create_symlink(dir.str() + "/nowhere", errors + "/English/gone.txt");
    }
    OwnedStatus status;
    std::string text = "stale";
    koxlator::lookupExplanation(errors, 2, c.language, text, status);
    EXPECT_EQ(text, "");
    EXPECT_LT(status.code, 0);
    EXPECT_EQ(status.text(), c.expected);
  }
}

}  // namespace
