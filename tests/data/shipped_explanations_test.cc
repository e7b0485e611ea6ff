// The explanation file we install must explain every code that the plug-in
// and the platform stand-ins can report, and be read without any error.
#include <gtest/gtest.h>

#include <string>

#include "error_record/status.h"
#include "koxlator/errors_parser.h"

namespace {

TEST(ShippedExplanations, ExplainEveryCodeThatCanReachAClient) {
  const int32_t codes[] = {
      -411200, -411145, -411203,                                   // plug-in
      -52000, -52004, -52005, -52006, -52008,                      // portable
      -67303, -67310, -67311, -67312, -67313, 67320,               // host
      -1074100990, -1074100991, -1074100992, -1074100993, -1074100994,  // time service
      -1074100995, -1074100996, -1074100997, -1074100998, -1074100999, -1074101000,  // live
  };
  for (int32_t code : codes) {
    SCOPED_TRACE(code);
    koerr::Status status;
    std::string text;
    koxlator::lookupExplanation(SHIPPED_ERRORS_DIR, code, koxlator::kEnglish, text, status);
    EXPECT_EQ(status.code, 0) << (status.json != nullptr ? status.json : "");
    EXPECT_GT(text.size(), 20u);
    EXPECT_EQ(text.find('\n'), std::string::npos) << "one line per explanation: " << text;
    koerr::releaseText(status);
  }
}

}  // namespace
