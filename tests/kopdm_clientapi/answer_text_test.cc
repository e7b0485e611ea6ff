#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "answer_text.h"

namespace {

// The live service lists its attribute table in the table's order, so the
// inline comparison must order exactly as the strings themselves do; the
// lookup order need only tell exactly the equal strings apart.
TEST(ShortTextLess, OrdersAsStringsDoAndLookupLessFindsEqualStrings) {
  const std::string texts[] = {"",    "a",   "A",         "tr0", "tr1", "tr10", "tr 1",
                               "tr",  "\xE9", "\x7F",     "b",   "ab",  "type", "portState",
                               "gmClockId", std::string("a\0b", 3), std::string("a\0", 2)};
  const kopdmsim::ShortTextLess less;
  const kopdmsim::LookupLess lookupLess;
  for (const std::string& a : texts) {
    for (const std::string& b : texts) {
      SCOPED_TRACE(testing::PrintToString(a) + " < " + testing::PrintToString(b));
      EXPECT_EQ(less(a, b), a < b);
      EXPECT_EQ(!lookupLess(a, b) && !lookupLess(b, a), a == b);
      EXPECT_FALSE(lookupLess(a, b) && lookupLess(b, a));
    }
  }
}

// Written straight into the caller's buffer, a member must come out as the
// rendered member copied in would, cut at the same byte.
TEST(CopyMember, WritesWhatTheRenderedMemberCopiedInWould) {
  for (const std::string key : {"type", "", "gm\"Id", "k\x01", "\x7f"}) {
    for (const std::string value : {"\"PTP_MASTER\"", "1", ""}) {
      for (const uint32_t capacity : {1u, 2u, 5u, 12u, 17u, 1024u}) {
        SCOPED_TRACE(testing::PrintToString(key) + " " + value + " " + std::to_string(capacity));
        std::vector<char> written(capacity, 'x');
        std::vector<char> expected(capacity, 'x');
        kopdmsim::copyMember(key, value, written.data(), capacity);
        kopdmsim::copyAnswer(kopdmsim::renderMember(key, value), expected.data(), capacity);
        EXPECT_EQ(std::string(written.data()), std::string(expected.data()));
      }
    }
  }
}

}  // namespace
