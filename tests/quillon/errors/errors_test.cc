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

// The plain success envelopes and explained errors are checked over HTTP;
// these are the ones a client cannot provoke.
TEST(EnvelopeTest, CarriesCodeExplanationRecordAndResult) {
  ScratchDir share;  // no explanations: every "errorText" is ""
  ScopedEnv marker("KOSYSQ_SHARE_DIR_FILE", share.write("share.dir", share.str()));
  OwnedStatus warning(4);
  OwnedStatus unexplained;
  koerr::Report(unexplained, koerr::kCommandNotFound, "quillon/Service", 260);
  const OwnedStatus success;
  struct Case {
    const char* name;
    const koerr::Status& status;
    std::string result;
    std::string expected;
  } cases[] = {
      {"plain success", success, "{\"version\":1}",
       "{\"error\":{\"success\":true,\"errorCode\":0,\"errorText\":\"\"},\"result\":"
       "{\"version\":1}}"},
      {"success without result", success, "",
       "{\"error\":{\"success\":true,\"errorCode\":0,\"errorText\":\"\"}}"},
      // The result is written as a C string, so a NUL byte ends it.
      {"result with a NUL byte", success, std::string("{\"a\"\0,\"b\":1}", 12),
       "{\"error\":{\"success\":true,\"errorCode\":0,\"errorText\":\"\"},\"result\":{\"a\"}"},
      {"warning without text", warning, "{}",
       "{\"error\":{\"success\":false,\"errorCode\":4,\"errorText\":\"\"},\"result\":{}}"},
      // The "Unknown Error" preset never survives a lookup that finds nothing.
      {"unexplained error", unexplained, "",
       "{\"error\":{\"success\":false,\"errorCode\":-411145,\"errorText\":\"\",\"errorInfo\":"
       "\"{\\\"error_constant\\\":\\\"kCommandNotFound\\\",\\\"file\\\":\\\"quillon/Service\\\","
       "\\\"line\\\":260,\\\"component\\\":\\\"quillon\\\"}\"}}"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    EXPECT_EQ(quillon::buildEnvelope(c.status, c.result), c.expected);
    // Handed over, the result's storage is reused, with or without the room.
    for (const std::size_t room : {std::size_t{0}, quillon::kEnvelopeRoom}) {
      std::string owned;
      owned.reserve(c.result.size() + room);
      owned = c.result;
      EXPECT_EQ(quillon::buildEnvelope(c.status, std::move(owned)), c.expected) << room;
    }
  }
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
  const std::string recordText =
      "{\"error_constant\":\"koapalerr_osFault\",\"file\":\"kosysq/stdpath_util\",\"line\":249,"
      "\"component\":\"quillon\",\"kosysq_debug\":{\"k\":\"v\"}}";
  EXPECT_EQ(fromRecord.code, -52008);
  EXPECT_EQ(fromRecord.text(), recordText);

  OwnedStatus fromDsc;
  translate(fromDsc, [] { throw ko::dsc::exception::OutOfRange("ko/dsc/SafeInteger", 88); });
  EXPECT_EQ(fromDsc.code, -52005);
  EXPECT_EQ(fromDsc.text(),
            "{\"file\":\"ko/dsc/SafeInteger\",\"line\":88,\"component\":\"quillon\"}");

  // The first error wins; anything that is no exception class passes through.
  // What other exceptions become is checked with the service's answers.
  translate(fromRecord, [] { throw std::logic_error("later"); });
  EXPECT_EQ(fromRecord.code, -52008);
  EXPECT_EQ(fromRecord.text(), recordText);
  OwnedStatus untouched;
  EXPECT_THROW(translate(untouched, [] { throw 42; }), int);
  EXPECT_EQ(untouched.code, 0);
}

}  // namespace
