#include <gtest/gtest.h>

#include <cstdint>
#include <functional>
#include <string>

#include "ko/dsc/exception.h"
#include "ko/dsc/osdep/iconv.h"
#include "ko/dsc/safe_integer.h"

namespace ko::dsc {
namespace {

struct ConversionCase {
  const char* name;
  std::function<long long()> convert;  // answer widened for comparison
  bool fits;
  long long value;
  const char* error;
};

TEST(SafeInteger, ConvertsWhatFitsAndRaisesOutOfRangeWithTheLimitsOtherwise) {
  using S = SafeInteger;
  const ConversionCase cases[] = {
      {"int64 max to int32", [] { return S::convert<int32_t>(int64_t{INT64_MAX}); }, false, 0,
       "Out of range: 9223372036854775807 is not within [-2147483648, 2147483647]"},
      {"int64 min to int32", [] { return S::convert<int32_t>(int64_t{INT64_MIN}); }, false, 0,
       "Out of range: -9223372036854775808 is not within [-2147483648, 2147483647]"},
      {"int32 min stays", [] { return S::convert<int32_t>(int64_t{INT32_MIN}); }, true, INT32_MIN,
       nullptr},
      {"-1 to uint64", [] { return static_cast<long long>(S::convert<uint64_t>(-1)); }, false, 0,
       "Out of range: -1 is not within [0, 18446744073709551615]"},
      {"255 to uint8", [] { return S::convert<uint8_t>(255U); }, true, 255, nullptr},
      {"uint32 max to int32", [] { return S::convert<int32_t>(uint32_t{UINT32_MAX}); }, false, 0,
       "Out of range: 4294967295 is not within [-2147483648, 2147483647]"},
      {"int32 max to uint32", [] { return S::convert<uint32_t>(INT32_MAX); }, true, INT32_MAX,
       nullptr},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    if (c.fits) {
      EXPECT_EQ(c.convert(), c.value);
      continue;
    }
    try {
      c.convert();
      FAIL() << "no exception";
    } catch (const exception::OutOfRange& e) {
      EXPECT_EQ(e.code(), -52005);
      EXPECT_STREQ(e.file(), "ko/dsc/SafeInteger");
      EXPECT_STREQ(e.what(), c.error);
    }
  }
  static_assert(!SafeInteger::fits<int16_t>(40000) && SafeInteger::fits<int16_t>(-32768));
}

TEST(IConv, RoundTripsAndReportsWhereConversionFails) {
  const osdep::IConv utf8("UTF-8");
  EXPECT_EQ(utf8.narrow(L"kocurl"), "kocurl");
  EXPECT_EQ(utf8.narrow(L""), "");
  EXPECT_EQ(utf8.narrow(L"d\u00e9j\u00e0 \U0001F600"), "d\xc3\xa9j\xc3\xa0 \xf0\x9f\x98\x80");
  EXPECT_EQ(utf8.widen("d\xc3\xa9j\xc3\xa0"), L"d\u00e9j\u00e0");
  const std::wstring longText(5000, L'\u00e9');  // output larger than the first buffer
  EXPECT_EQ(utf8.widen(utf8.narrow(longText)), longText);

  const osdep::IConv ascii("US-ASCII");
  const struct {
    const char* name;
    std::function<void()> convert;
    const char* error;
  } failures[] = {
      {"wide to ascii", [&] { (void)ascii.narrow(L"ab\u00e9"); },
       "unconvertible character at offset 2 converting WCHAR_T to US-ASCII"},
      {"high byte from ascii", [&] { (void)ascii.widen("a\xff"); },
       "unconvertible character at offset 1 converting US-ASCII to WCHAR_T"},
      {"truncated utf-8", [&] { (void)utf8.widen("ab\xc3"); },
       "incomplete character at offset 2 converting UTF-8 to WCHAR_T"},
  };
  for (const auto& f : failures) {
    SCOPED_TRACE(f.name);
    try {
      f.convert();
      FAIL() << "no exception";
    } catch (const exception::InvalidSequence& e) {
      EXPECT_STREQ(e.what(), f.error);
    }
  }
  try {
    osdep::IConv unknown("NO-SUCH-CHARSET");
    FAIL() << "no exception";
  } catch (const exception::InvalidLocale& e) {
    EXPECT_STREQ(e.what(), "Invalid locale: no conversion between wide text and 'NO-SUCH-CHARSET'");
  }
  // Whatever the environment, the default converts plain names.
  EXPECT_EQ(osdep::IConv().narrow(L"kossl"), "kossl");
}

}  // namespace
}  // namespace ko::dsc
