#include "kodynlib/dynload.h"

#include <dlfcn.h>
#include <gtest/gtest.h>

#include "answers_common/fixtures.h"

namespace {

using answers_test::OwnedStatus;
using answers_test::parses;

// The loader's text is free-form; it must at least name what failed, which
// shows it was read for this failure and not left over from an earlier one.
std::string recordWithoutLoaderText(const std::string& record, const std::string& subject) {
  const std::string marker = ",\"string\":\"";
  const size_t at = record.find(marker);
  if (at == std::string::npos) {
    return record;
  }
  const size_t end = record.find("\"}", at + marker.size());
  EXPECT_NE(record.substr(at, end - at).find(subject), std::string::npos) << record;
  return record.substr(0, at) + record.substr(end + 1);
}

TEST(DynloadTest, FailedLoadIsRecordedOnceAndLaterCallsDoNothing) {
  dlopen("libearlier-failure.so.1", RTLD_NOW);  // leaves a loader text unread
  OwnedStatus status(3);                        // a warning still gives way to the error
  EXPECT_EQ(kodynlib_load("libnot-installed.so.7", RTLD_NOW, &status), nullptr);
  EXPECT_EQ(status.code, -52005);
  ASSERT_TRUE(parses(status.text()));
  EXPECT_EQ(recordWithoutLoaderText(status.text(), "libnot-installed.so.7"),
            "{\"error_constant\":\"koapalerr_invalidParameter\",\"file\":\"kodynlib/dynload\","
            "\"line\":64,\"component\":\"quillon\",\"kodynlib_debug\":{\"debug\":"
            "\"failed to kodynlib_load library\",\"path\":\"libnot-installed.so.7\"},"
            "\"internal_error\":{\"api\":\"dlerror\"}}");

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
  EXPECT_EQ(status.code, -52005);
  ASSERT_TRUE(parses(status.text()));
  EXPECT_EQ(recordWithoutLoaderText(status.text(), "no_such_function_here"),
            "{\"error_constant\":\"koapalerr_invalidParameter\",\"file\":\"kodynlib/dynload\","
            "\"line\":139,\"component\":\"quillon\",\"kodynlib_debug\":{\"debug\":"
            "\"failed to get symbol\",\"kodynlib_symbol\":\"no_such_function_here\"},"
            "\"internal_error\":{\"api\":\"dlerror\"}}");
  kodynlib_unload(handle);
}

}  // namespace
