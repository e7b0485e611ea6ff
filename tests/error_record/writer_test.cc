#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "error_record/json_text.h"
#include "error_record/record_checks.h"
#include "error_record/status.h"

namespace {

using koerr::Status;
using koerr_test::holdsInvariant;

TEST(Writers, WriteEveryKindInOrderAndNest) {
  Status status;
  char* c = koerr::beginJson(status, 2);
  c = koerr::addString(c, "s", "text", status);
  c = koerr::addStdString(c, "std", std::string("a\0b", 3), status);
  c = koerr::addInt(c, "i", -2147483647 - 1, status);
  c = koerr::addUInt(c, "u", 4294967295u, status);
  c = koerr::addBool(c, "t", true, status);
  c = koerr::addBool(c, "f", false, status);
  c = koerr::addRawValue(c, "raw", "[1,2]", status);
  char* inner = koerr::addObject(c, "k", status);
  inner = koerr::addInt(inner, "a", 1, status);
  inner = koerr::addInt(inner, "b", 2, status);
  c = koerr::leaveContainer(inner);
  char* list = koerr::addArray(c, "list", status);
  list = koerr::addRawElement(list, "{}", status);
  list = koerr::addRawElement(list, "3", status);
  c = koerr::leaveContainer(list);
  c = koerr::addString(c, "after", "x", status);
  EXPECT_STREQ(status.json,
               R"({"s":"text","std":"a\u0000b","i":-2147483648,"u":4294967295,"t":true,)"
               R"("f":false,"raw":[1,2],"k":{"a":1,"b":2},"list":[{},3],"after":"x"})");
  EXPECT_TRUE(holdsInvariant(status));
  EXPECT_EQ(koerr::leaveContainer(nullptr), nullptr);
  EXPECT_EQ(koerr::addInt(nullptr, "x", 1, status), nullptr);
  koerr::releaseText(status);
}

// One row per escaping rule: the short forms, \u00XX (0x7f included) and
// bytes that pass unchanged.
TEST(Writers, EscapeKeysAndValues) {
  struct Case {
    std::string raw;
    const char* written;
  };
  const std::vector<Case> cases = {
      {"q\"b\\\b\f\n\r\t", R"("q\"b\\\b\f\n\r\t")"},
      {"\x01\x1f\v\x7f", R"("\u0001\u001f\u000b\u007f")"},
      {"caf\xc3\xa9", "\"caf\xc3\xa9\""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.written);
    Status status;
    koerr::addStdString(koerr::beginJson(status, 2), c.raw.c_str(), c.raw, status);
    EXPECT_EQ(status.json, std::string("{") + c.written + ":" + c.written + "}");
    EXPECT_TRUE(holdsInvariant(status));
    std::string appended = "<";
    koerr::appendJsonEscaped(appended, c.raw);
    EXPECT_EQ(appended, "<" + std::string(c.written + 1, std::strlen(c.written) - 2));
    koerr::releaseText(status);
  }
}

// Fails the Nth allocation: every failure must leave a shorter valid record.
struct FailingAllocator {
  static int calls;
  static int failAt;
  static int reallocate(Status* status, uint32_t capacity) {
    if (capacity != 0 && ++calls == failAt) return 0;
    return koerr::defaultReallocate(status, capacity);
  }
};
int FailingAllocator::calls = 0;
int FailingAllocator::failAt = 0;

std::string buildLargeRecord(Status& status) {
  const std::string value(300, 'x');
  char* c = koerr::beginJson(status, 2);
  c = koerr::addString(c, "error_constant", "koapalerr_resourceNotFound", status);
  char* debug = koerr::addObject(c, "quillon_debug", status);
  for (int i = 0; i < 12; ++i) {
    debug = koerr::addStdString(debug, ("line" + std::to_string(i)).c_str(), value, status);
  }
  c = koerr::addString(koerr::leaveContainer(debug), "last", "y", status);
  return c != nullptr ? "complete" : "short";
}

// The complete record grows through several buffers and keeps every member.
TEST(Writers, AllocationFailureAtEveryStepLeavesValidShorterJson) {
  FailingAllocator::failAt = 0;
  FailingAllocator::calls = 0;
  Status reference;
  reference.reallocate = &FailingAllocator::reallocate;
  ASSERT_EQ(buildLargeRecord(reference), "complete");
  const int allocations = FailingAllocator::calls;
  ASSERT_GE(allocations, 4);
  const std::string full = reference.json;
  std::string expected = R"({"error_constant":"koapalerr_resourceNotFound","quillon_debug":{)";
  for (int i = 0; i < 12; ++i) {
    expected += (i ? ",\"line" : "\"line") + std::to_string(i) + "\":\"" + std::string(300, 'x') + "\"";
  }
  EXPECT_EQ(full, expected + R"(},"last":"y"})");

  for (int n = 1; n <= allocations + 1; ++n) {
    SCOPED_TRACE("failing allocation " + std::to_string(n));
    FailingAllocator::calls = 0;
    FailingAllocator::failAt = n;
    Status status;
    status.reallocate = &FailingAllocator::reallocate;
    const std::string outcome = buildLargeRecord(status);
    EXPECT_EQ(outcome, n > allocations ? "complete" : "short");
    EXPECT_TRUE(holdsInvariant(status));
    // Shorter, never longer: a failed member leaves no trace.
    if (status.json != nullptr) {
      EXPECT_LE(std::string(status.json).size(), full.size());
    }
    koerr::releaseText(status);
  }
  koerr::releaseText(reference);
}

}  // namespace
