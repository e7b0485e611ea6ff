#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "error_record/json_text.h"
#include "error_record/record_checks.h"
#include "error_record/status.h"

namespace {

using koerr::Status;
using koerr_test::holdsInvariant;
using koerr_test::parse;

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

TEST(Writers, EscapeKeysAndValues) {
  struct Case {
    std::string raw;
    const char* written;
  };
  const std::vector<Case> cases = {
      {"quote\"", R"("quote\"")"},
      {"back\\slash", R"("back\\slash")"},
      {"\b\f\n\r\t", R"("\b\f\n\r\t")"},
      {"\x01", R"("\u0001")"},
      {"\x1f", R"("\u001f")"},
      {"\x7f", R"("\u007f")"},
      {"\v", R"("\u000b")"},
      {"caf\xc3\xa9", "\"caf\xc3\xa9\""},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.written);
    Status status;
    koerr::addStdString(koerr::beginJson(status, 2), c.raw.c_str(), c.raw, status);
    const std::string expected = std::string("{") + c.written + ":" + c.written + "}";
    EXPECT_EQ(status.json, expected);
    ASSERT_TRUE(holdsInvariant(status));
    koerr_test::JsonPtr root = parse(status.json);
    const cJSON* member = cJSON_GetObjectItemCaseSensitive(root.get(), c.raw.c_str());
    ASSERT_NE(member, nullptr);
    EXPECT_EQ(std::string(member->valuestring), c.raw);
    std::string appended = "<";
    koerr::appendJsonEscaped(appended, c.raw);
    EXPECT_EQ(appended, "<" + std::string(c.written + 1, std::strlen(c.written) - 2));
    koerr::releaseText(status);
  }
}

TEST(Writers, GrowPastTheFirstBufferKeepingEveryMember) {
  Status status;
  char* c = koerr::beginJson(status, 2);
  ASSERT_EQ(status.capacity, 512u);
  const std::string value(100, 'v');
  for (int i = 0; i < 6; ++i) {
    c = koerr::addStdString(c, ("m" + std::to_string(i)).c_str(), value, status);
  }
  EXPECT_EQ(status.capacity, 1024u);
  EXPECT_EQ(status.json[1023], 'J');
  ASSERT_TRUE(holdsInvariant(status));
  koerr_test::JsonPtr root = parse(status.json);
  int index = 0;
  for (const cJSON* m = root->child; m != nullptr; m = m->next, ++index) {
    EXPECT_EQ(std::string(m->string), "m" + std::to_string(index));
    EXPECT_EQ(std::string(m->valuestring), value);
  }
  EXPECT_EQ(index, 6);
  koerr::releaseText(status);
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

TEST(Writers, AllocationFailureAtEveryStepLeavesValidShorterJson) {
  FailingAllocator::failAt = 0;
  FailingAllocator::calls = 0;
  Status reference;
  reference.reallocate = &FailingAllocator::reallocate;
  ASSERT_EQ(buildLargeRecord(reference), "complete");
  const int allocations = FailingAllocator::calls;
  ASSERT_GE(allocations, 4);
  const std::string full = reference.json;

  for (int n = 1; n <= allocations + 1; ++n) {
    SCOPED_TRACE("failing allocation " + std::to_string(n));
    FailingAllocator::calls = 0;
    FailingAllocator::failAt = n;
    Status status;
    status.reallocate = &FailingAllocator::reallocate;
    const std::string outcome = buildLargeRecord(status);
    EXPECT_EQ(outcome, n > allocations ? "complete" : "short");
    EXPECT_TRUE(holdsInvariant(status));
    if (status.json != nullptr) {
      // Shorter, never different: what survived is a prefix of the members.
      const std::string text = status.json;
      EXPECT_LE(text.size(), full.size());
    }
    koerr::releaseText(status);
  }
  koerr::releaseText(reference);
}

}  // namespace
