#include <cjson/cJSON.h>
#include <gtest/gtest.h>

#include <functional>
#include <string>
#include <vector>

#include "error_record/error.h"
#include "kojsonlh/array_iterator.h"
#include "kojsonlh/cjson_utils.h"
#include "kojsonlh/cpp_json.h"
#include "support/raised.h"

namespace {

std::string thrownBy(const std::function<void()>& call) {
  const auto raised = quillon::test_support::raisedBy(call);
  return std::to_string(raised.code) + " " + raised.record;
}

std::string headOnly(int code, const char* constant, const char* file, int line) {
  return std::to_string(code) + " {\"error_constant\":\"" + constant + "\",\"file\":\"" + file +
         "\",\"line\":" + std::to_string(line) + ",\"component\":\"quillon\"}";
}

TEST(JsonLayer, KeysMatchInAnyAsciiCaseWhateverTheLocale) {
  CppJson document("{\"timeReferenceId\":1,\"gmIdentity\":2,\"\u0130d\":3,\"id\":4,\"ID\":5}");
  struct Case {
    const char* key;
    int value;  // 0: no member
  } cases[] = {
      {"TIMEREFERENCEID", 1}, {"GMidentity", 2}, {"\xc4\xb0" "d", 3}, {"iD", 4}, {"ID", 4},
      {"\xc4\xb1" "d", 0},  // a dotless i is no "i", nor is the dotted capital
      {"timeReferenceI", 0},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.key);
    const cJSON* member = cJSONUtils::getObjectItem(document.get(), c.key);
    EXPECT_EQ(member != nullptr ? member->valueint : 0, c.value);
  }
  EXPECT_EQ(cJSONUtils::getObjectItem(nullptr, "id"), nullptr);
  EXPECT_EQ(cJSONUtils::getObjectItem(document.get(), nullptr), nullptr);
}

TEST(JsonLayer, TypeTestsCompareTheWholeTypeWord) {
  CppJson document("{\"s\":\"text\",\"a\":[1],\"n\":null,\"o\":{}}");
  const cJSON* s = cJSONUtils::getObjectItem(document.get(), "S");  // keys match in any case
  const cJSON* a = cJSONUtils::getObjectItem(document.get(), "a");
  const cJSON* n = cJSONUtils::getObjectItem(document.get(), "n");
  EXPECT_TRUE(cJSONUtils::isString(s) && cJSONUtils::isArray(a) && cJSONUtils::isNull(n));
  EXPECT_FALSE(cJSONUtils::isString(a) || cJSONUtils::isArray(n) || cJSONUtils::isNull(s));
  EXPECT_FALSE(cJSONUtils::isString(nullptr) || cJSONUtils::isArray(nullptr) ||
               cJSONUtils::isNull(nullptr));
  EXPECT_EQ(cJSONUtils::getString(s), "text");

  // A reference to a string is no string here, though cJSON's own test says so.
  CppJson reference(cJSON_CreateStringReference("borrowed"));
  ASSERT_TRUE(cJSON_IsString(reference.get()));
  EXPECT_FALSE(cJSONUtils::isString(reference.get()));
  EXPECT_EQ(thrownBy([&] { (void)cJSONUtils::getString(reference.get()); }),
            headOnly(-52004, "jsonErrorsTypeMismatch", "kojsonlh/cJSONUtils", 305));
  EXPECT_EQ(thrownBy([&] { cJSONUtils::requireArray(s); }),
            headOnly(-52004, "jsonErrorsNotAnArray", "kojsonlh/cJSONUtils", 83));
  EXPECT_EQ(thrownBy([] { CppJson bad("{\"a\":"); }),
            headOnly(-52005, "jsonErrorsInvalidJSON", "kojsonlh/CppJson", 34));
}

TEST(JsonLayer, ArraysAreWalkedInOrderAndNotPastTheEnd) {
  CppJson document("[\"a\",\"b\",\"c\"]");
  ArrayIterator elements(document.get());
  std::vector<std::string> seen;
  while (elements.hasNext()) seen.push_back(cJSONUtils::getString(elements.next()));
  EXPECT_EQ(seen, (std::vector<std::string>{"a", "b", "c"}));
  EXPECT_EQ(cJSONUtils::getString(elements.at(2)), "c");
  const std::string outOfBounds =
      headOnly(-52004, "jsonErrorsArrayItemOutOfBounds", "kojsonlh/ArrayIterator", 47);
  EXPECT_EQ(thrownBy([&] { (void)elements.at(3); }), outOfBounds);
  EXPECT_EQ(thrownBy([&] { (void)elements.next(); }), outOfBounds);
}

TEST(JsonLayer, HolderOwnsExactlyOneTreeAtATime) {
  CppJson holder("[1]");
  holder.reset(cJSON_Parse("[2]"));  // the first tree is freed (the leak check sees it)
  CppJson moved(std::move(holder));
  EXPECT_EQ(holder.get(), nullptr);
  EXPECT_EQ(cJSON_GetArrayItem(moved.get(), 0)->valuedouble, 2);
  moved = CppJson("[3]");
  EXPECT_EQ(cJSON_GetArrayItem(moved.get(), 0)->valuedouble, 3);
  moved.reset();
  EXPECT_EQ(moved.get(), nullptr);
}

}  // namespace
