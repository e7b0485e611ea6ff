#include "quillon/errors.h"

#include <gtest/gtest.h>

#include <stdexcept>

#include "support/answer_fixtures.h"
#include "error_record/constants.h"
#include "error_record/error.h"
#include "ko/dsc/exception.h"

namespace {

using answers_test::OwnedStatus;
using answers_test::ScopedEnv;
using answers_test::ScratchDir;

class EnvelopeTest : public ::testing::Test {
 protected:
  void SetUp() override {
    dir_.write("share/errors/English/codes.txt",
               "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<kodocument>\n"
               "<koerror code=\"-52006\">\nThe resource does not \"exist\".\n</koerror>\n"
               "</kodocument>\n");
  }
  ScratchDir dir_;
  ScopedEnv marker_{"KOSYSQ_SHARE_DIR_FILE", dir_.write("share.dir", dir_.str() + "/share")};
};

TEST_F(EnvelopeTest, CarriesCodeExplanationRecordAndResult) {
  OwnedStatus notFound;
  koerr::Report(notFound, koerr::koapalerr_resourceNotFound, "quillon/ResourceManager", 75)
      .open("kosyncdomain_debug")
      .add("uri", "/a\"b")
      .close();
  OwnedStatus warning(4);
  OwnedStatus unexplained;
  koerr::Report(unexplained, koerr::kCommandNotFound, "quillon/Service", 260);
  const std::string big(3000, '7');  // far past the envelope's first buffer

  struct Case {
    const char* name;
    const koerr::Status& status;
    std::string result;
    std::string expected;
  };
  const OwnedStatus success;
  const Case cases[] = {
      {"success, no result", success, "",
       "{\"error\":{\"success\":true,\"errorCode\":0,\"errorText\":\"\"}}"},
      {"success with result", success, "{\"a\":[1]}",
       "{\"error\":{\"success\":true,\"errorCode\":0,\"errorText\":\"\"},\"result\":{\"a\":[1]}}"},
      {"long result", success, big,
       "{\"error\":{\"success\":true,\"errorCode\":0,\"errorText\":\"\"},\"result\":" + big + "}"},
      {"warning without text", warning, "",
       "{\"error\":{\"success\":false,\"errorCode\":4,\"errorText\":\"\"}}"},
      {"explained error", notFound, "",
       "{\"error\":{\"success\":false,\"errorCode\":-52006,\"errorText\":"
       "\"The resource does not \\\"exist\\\".\",\"errorInfo\":\"{\\\"error_constant\\\":"
       "\\\"koapalerr_resourceNotFound\\\",\\\"file\\\":\\\"quillon/ResourceManager\\\","
       "\\\"line\\\":75,\\\"component\\\":\\\"quillon\\\",\\\"kosyncdomain_debug\\\":"
       "{\\\"uri\\\":\\\"/a\\\\\\\"b\\\"}}\"}}"},
      // The "Unknown Error" preset never survives a lookup that finds nothing.
      {"unexplained error", unexplained, "",
       "{\"error\":{\"success\":false,\"errorCode\":-411145,\"errorText\":\"\",\"errorInfo\":"
       "\"{\\\"error_constant\\\":\\\"kCommandNotFound\\\",\\\"file\\\":\\\"quillon/Service\\\","
       "\\\"line\\\":260,\\\"component\\\":\\\"quillon\\\"}\"}}"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    const std::string envelope = quillon::buildEnvelope(c.status, c.result);
    EXPECT_EQ(envelope, c.expected);
  }
}

// The result is written as a C string, so a NUL byte ends it, success or not.
TEST_F(EnvelopeTest, ResultEndsAtItsFirstNulByte) {
  const OwnedStatus success;
  const std::string result("{\"a\"\0,\"b\":1}", 12);
  EXPECT_EQ(quillon::buildEnvelope(success, result),
            "{\"error\":{\"success\":true,\"errorCode\":0,\"errorText\":\"\"},\"result\":{\"a\"}");
}

template <typename Thrower>
void translate(koerr::Status& status, Thrower thrower) {
  try {
    thrower();
  } catch (...) {
    quillon::translateCurrentException(status);
  }
}

TEST(TranslateTest, EachKindOfExceptionBecomesItsRecord) {
  OwnedStatus fromRecord;
  translate(fromRecord, [] {
    koerr::Error(koerr::koapalerr_osFault, "kosysq/stdpath_util", 249, "kosysq_debug")
        .add("k", "v")
        .raise();
  });
  EXPECT_EQ(fromRecord.code, -52008);
  EXPECT_EQ(
      fromRecord.text(),
      "{\"error_constant\":\"koapalerr_osFault\",\"file\":\"kosysq/stdpath_util\",\"line\":249,"
      "\"component\":\"quillon\",\"kosysq_debug\":{\"k\":\"v\"}}");

  OwnedStatus fromDsc;
  translate(fromDsc, [] { throw ko::dsc::exception::OutOfRange("ko/dsc/SafeInteger", 88); });
  EXPECT_EQ(fromDsc.code, -52005);
  EXPECT_EQ(fromDsc.text(),
            "{\"file\":\"ko/dsc/SafeInteger\",\"line\":88,\"component\":\"quillon\"}");

  OwnedStatus fromStd;
  translate(fromStd, [] { throw std::runtime_error("disk \"full\""); });
  EXPECT_EQ(fromStd.code, -411200);
  EXPECT_EQ(fromStd.text(),
            "{\"error_constant\":\"quillon::kInternalSoftwareError\",\"file\":\"quillon/errors\","
            "\"line\":50,\"component\":\"quillon\",\"quillon_debug\":{\"std::exception\":"
            "\"disk \\\"full\\\"\"}}");

  // The first error wins; anything that is no exception class passes through.
  translate(fromStd, [] { throw std::logic_error("later"); });
  EXPECT_EQ(fromStd.code, -411200);
  EXPECT_NE(fromStd.text().find("disk"), std::string::npos);
  OwnedStatus untouched;
  EXPECT_THROW(translate(untouched, [] { throw 42; }), int);
  EXPECT_EQ(untouched.code, 0);
}

}  // namespace
