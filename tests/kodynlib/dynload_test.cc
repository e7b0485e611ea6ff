#include "kodynlib/dynload.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include "support/answer_fixtures.h"

namespace {

using answers_test::OwnedStatus;

void expectRecord(const OwnedStatus& status, int line, const char* debug, const char* key,
                  const std::string& subject) {
  EXPECT_EQ(status.code, -52005);
  EXPECT_TRUE(answers_test::parses(status.text()));
  const std::string head =
      "{\"error_constant\":\"koapalerr_invalidParameter\",\"file\":\"kodynlib/dynload\",\"line\":" +
      std::to_string(line) + ",\"component\":\"quillon\",\"kodynlib_debug\":{\"debug\":\"" +
      debug + "\",\"" + key + "\":\"" + subject +
      "\"},\"internal_error\":{\"api\":\"dlerror\",\"string\":\"";
  const std::string text = status.text();
  EXPECT_EQ(text.substr(0, head.size()), head);
  // The loader's text is free-form; naming what failed shows it was read
  // for this failure and not left over from an earlier one.
  EXPECT_NE(text.find(subject, head.size()), std::string::npos) << text;
  EXPECT_EQ(text.substr(text.size() - 3), "\"}}");
}

TEST(DynloadTest, FailedLoadIsRecordedOnceAndLaterCallsDoNothing) {
  dlopen("libearlier-failure.so.1", RTLD_NOW);  // leaves a loader text unread
  OwnedStatus status(3);                        // a warning still gives way to the error
  EXPECT_EQ(kodynlib_load("libnot-installed.so.7", RTLD_NOW, &status), nullptr);
  expectRecord(status, 64, "failed to kodynlib_load library", "path", "libnot-installed.so.7");

  const std::string first = status.text();
  EXPECT_EQ(kodynlib_load("libm.so.6", RTLD_NOW, &status), nullptr);
  void* self = dlopen(nullptr, RTLD_NOW);
  EXPECT_EQ(kodynlib_symbol(self, "main", &status), nullptr);
  dlclose(self);
  EXPECT_EQ(status.text(), first);
}

TEST(DynloadTest, ResolvesSymbolsAndRecordsMissingOnes) {
  OwnedStatus status;
  void* handle = kodynlib_load("libm.so.6", RTLD_NOW | RTLD_LOCAL, &status);
  ASSERT_NE(handle, nullptr);
  using Cos = double (*)(double);
  auto cosine = reinterpret_cast<Cos>(kodynlib_symbol(handle, "cos", &status));
  ASSERT_NE(cosine, nullptr);
  EXPECT_EQ(cosine(0.0), 1.0);
  EXPECT_EQ(status.code, 0);
  EXPECT_EQ(status.json, nullptr);

  EXPECT_EQ(kodynlib_symbol(handle, "no_such_function_here", &status), nullptr);
  expectRecord(status, 139, "failed to get symbol", "kodynlib_symbol", "no_such_function_here");
  kodynlib_unload(handle);
}

}  // namespace
