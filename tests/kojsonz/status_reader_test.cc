#include <gtest/gtest.h>

#include <clocale>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "kojsonz/status_reader.h"

namespace {

using kojsonz::ReadError;

constexpr const char* kRecord =
    R"( { "error_constant" : "x", "nested" : {"code":1,"list":[1,{"a":[]},"]"]},)"
    R"( "esc\"aped":"\u00e9\t", "code" : -1074100990, "ratio":-1.5e3, "zero":0.25,)"
    R"( "ok":true, "none":null })";

TEST(FindMember, ReachesMembersPastNestedValues) {
  struct Case {
    const char* key;
    const char* startsWith;  // null: absent
  };
  const std::vector<Case> cases = {
      {"error_constant", "\"x\""}, {"code", "-1074100990"}, {"esc\"aped", "\"\\u00e9"},
      {"none", "null"},            {"list", nullptr},       {"Code", nullptr},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.key);
    const char* value = kojsonz::findMember(kRecord, c.key);
    if (c.startsWith == nullptr) {
      EXPECT_EQ(value, nullptr);
    } else {
      ASSERT_NE(value, nullptr);
      EXPECT_EQ(std::string(value, std::strlen(c.startsWith)), c.startsWith);
    }
  }
}

TEST(FindMember, NamesWhatIsWrongWithMalformedText) {
  struct Case {
    const char* text;
    ReadError error;
  };
  const std::vector<Case> cases = {
      {"[1]", ReadError::kCurlyBracketExpected},
      {"{a:1}", ReadError::kDoubleQuoteExpected},
      {R"({"a" 1})", ReadError::kColonExpected},
      {R"({"a":1 "b":2})", ReadError::kCommaExpected},
      {R"({"a":1,})", ReadError::kTrailingComma},
      {R"({"a":"\q","want":1})", ReadError::kInvalidStringSequence},
      {R"({"a":"\u12g4","want":1})", ReadError::kInvalidStringSequence},
      {R"({"a":tru,"want":1})", ReadError::kValueExpected},
      {R"({"a":[1 2],"want":1})", ReadError::kSquareBracketExpected},
      {R"({"a":"unterminated)", ReadError::kInvalidStringSequence},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    ReadError error = ReadError::kNone;
    EXPECT_EQ(kojsonz::findMember(c.text, "want", &error), nullptr);
    EXPECT_EQ(error, c.error) << kojsonz::readErrorName(error);
  }
}

TEST(ReadValues, ConvertByTypeAndRefuseOthers) {
  int32_t integer = 0;
  double number = 0;
  std::string text;
  EXPECT_EQ(kojsonz::readInteger(kojsonz::findMember(kRecord, "code"), &integer), 1);
  EXPECT_EQ(integer, -1074100990);
  EXPECT_EQ(kojsonz::readInteger(kojsonz::findMember(kRecord, "ratio"), &integer), 0)
      << "an exponent makes the number fractional";
  EXPECT_EQ(kojsonz::readNumber(kojsonz::findMember(kRecord, "ratio"), &number), 1);
  EXPECT_DOUBLE_EQ(number, -1500.0);
  EXPECT_EQ(kojsonz::readInteger("2147483648", &integer), 0);
  const std::string longFraction = "0." + std::string(80, '0') + "1";
  EXPECT_EQ(kojsonz::readNumber(longFraction.c_str(), &number), 1);
  // Under a decimal-comma locale only the first 63 characters are converted
  // (the reader's rewriting copy), which here are all zeros.
  const bool commaLocale = *std::localeconv()->decimal_point == ',';
  EXPECT_DOUBLE_EQ(number, commaLocale ? 0.0 : 1e-81);
  EXPECT_EQ(kojsonz::readInteger("42,", &integer), 1);
  EXPECT_EQ(integer, 42);
  EXPECT_EQ(kojsonz::readString(kojsonz::findMember(kRecord, "code"), &text), 0);
  EXPECT_EQ(kojsonz::readString(kojsonz::findMember(kRecord, "esc\"aped"), &text), 1);
  EXPECT_EQ(text, "\xc3\xa9\t");
  EXPECT_EQ(kojsonz::readString(R"("\ud83d\ude00")", &text), 1);
  EXPECT_EQ(text, "\xf0\x9f\x98\x80");
  EXPECT_EQ(kojsonz::readNumber("\"1\"", &number), 0);
}

TEST(ReadValues, FractionsSurviveACommaLocale) {
  setenv("LOCPATH", COMMA_LOCALE_DIR, 1);
  const std::string saved = std::setlocale(LC_NUMERIC, nullptr);
  if (std::setlocale(LC_NUMERIC, "de_DE.UTF-8") == nullptr) {
    GTEST_SKIP() << "the decimal-comma locale could not be compiled";
  }
  double number = 0;
  const int read = kojsonz::readNumber(kojsonz::findMember(kRecord, "zero"), &number);
  std::setlocale(LC_NUMERIC, saved.c_str());
  EXPECT_EQ(read, 1);
  EXPECT_DOUBLE_EQ(number, 0.25);
}

}  // namespace
