#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "error_record/record_checks.h"
#include "error_record/status.h"

namespace {

using koerr::Status;
using koerr_test::holdsInvariant;

TEST(SetCode, FirstErrorWinsAndWarningsGiveWay) {
  struct Case {
    int32_t held;
    int32_t offered;
    bool taken;
  };
  const std::vector<Case> cases = {
      {1, 0, false}, {0, 5, true}, {1, -2, true}, {1, 2, false}, {-1, 3, false},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(std::to_string(c.held) + " <- " + std::to_string(c.offered));
    Status status;
    status.code = c.held;
    EXPECT_EQ(koerr::setCode(status, c.offered), c.taken);
    EXPECT_EQ(status.code, c.taken ? c.offered : c.held);
  }
  // A code that is taken resets the text to an empty object.
  Status status;
  koerr::addInt(koerr::beginJson(status, 2), "old", 1, status);
  ASSERT_TRUE(koerr::setCode(status, -7));
  EXPECT_STREQ(status.json, "{}");
  EXPECT_TRUE(holdsInvariant(status));
  koerr::releaseText(status);
}

TEST(DefaultReallocate, RoundsToPowersOfTwoFromFiveHundredTwelve) {
  struct Case {
    uint32_t request;
    uint32_t capacity;
  };
  for (const Case& c : {Case{512, 512}, Case{513, 1024}, Case{70000, 131072}}) {
    SCOPED_TRACE(c.request);
    Status status;
    ASSERT_NE(koerr::defaultReallocate(&status, c.request), 0);
    EXPECT_EQ(status.capacity, c.capacity);
    EXPECT_STREQ(status.json, "{}");
    EXPECT_TRUE(holdsInvariant(status));
    koerr::releaseText(status);
    EXPECT_EQ(status.json, nullptr);
    EXPECT_EQ(status.capacity, 0u);
  }
  Status status;
  EXPECT_EQ(koerr::defaultReallocate(&status, 2147483648u), 0);
  EXPECT_EQ(koerr::beginJson(status, koerr::kMaxExtra + 1), nullptr);
  EXPECT_EQ(status.json, nullptr);
}

// The move itself is checked with the exceptions that take their records so.
TEST(CopyStatus, KeepingTheSourceCopiesAndARefusedMoveTakesNothing) {
  Status source;
  koerr::addString(koerr::beginJson(source, 2), "k", "v", source);
  source.code = -3;
  bool ok = false;
  Status copied;
  koerr::copyStatusKeepSource(copied, source, &ok);
  EXPECT_TRUE(ok);
  EXPECT_EQ(copied.code, -3);
  EXPECT_STREQ(copied.json, R"({"k":"v"})");
  EXPECT_STREQ(source.json, R"({"k":"v"})");
  EXPECT_NE(copied.json, source.json);

  Status refusing;
  refusing.code = -1;
  koerr::copyStatus(refusing, source, &ok);
  EXPECT_FALSE(ok);
  EXPECT_EQ(refusing.code, -1);
  EXPECT_NE(source.json, nullptr) << "a refused copy must not take the text";
  for (Status* s : {&source, &copied}) koerr::releaseText(*s);
}

TEST(NestError, AddsTheCaughtCodeAndAppendsToOneList) {
  Status outer;
  koerr::setCode(outer, -52006);
  char* cursor = koerr::beginJson(outer, 2);
  cursor = koerr::addString(cursor, "error_constant", "koapalerr_resourceNotFound", outer);

  Status first;
  first.code = -1074100990;
  koerr::addString(koerr::beginJson(first, 2), "msg", "a", first);
  koerr::nestError(outer, first);

  Status second;  // already carries its code: not added twice
  second.code = -9;
  koerr::addInt(koerr::beginJson(second, 2), "code", -9, second);
  koerr::nestError(outer, second);

  Status bare;  // no text at all
  bare.code = -4;
  koerr::nestError(outer, bare);

  EXPECT_STREQ(outer.json,
               R"({"error_constant":"koapalerr_resourceNotFound","nested_error":)"
               R"([{"msg":"a","code":-1074100990},{"code":-9},{"code":-4}]})");
  EXPECT_TRUE(holdsInvariant(outer));
  for (Status* s : {&outer, &first, &second, &bare}) koerr::releaseText(*s);
}

}  // namespace
