#include <gtest/gtest.h>

#include <string>
#include <unordered_map>
#include <vector>

#include "error_record/error.h"
#include "kosdtools_curl/web_helper_functions.h"
#include "support/raised.h"

namespace {

using Map = std::unordered_map<std::string, std::string>;
using Keys = std::vector<std::string>;

std::string uriError(int line, const char* message, const std::string& uri, int keyCount) {
  std::string record =
      "{\"error_constant\":\"koapalerr_invalidParameter\",\"file\":\"kosdtools_curl/"
      "webHelperFunctions\",\"line\":" + std::to_string(line) +
      ",\"component\":\"quillon\",\"kosyncdomain_debug\":{\"message\":\"" + message +
      "\",\"uri\":\"" + uri + "\"";
  if (keyCount >= 0) record += ",\"uriKeys.size()\":" + std::to_string(keyCount);
  return record + "}}";
}

// The six-part URIs of the timescales, with and without their outer
// slashes, are split by the helpers' normalizing test.
TEST(ParseUri, BindsSegmentsToKeysInOrder) {
  struct Case {
    const char* uri;
    Keys keys;
    Map expected;
  };
  const Case cases[] = {
      {"a/b", {"x", "y"}, {{"x", "a"}, {"y", "b"}}},
      {"/%20 A/b", {"x", "y"}, {{"x", "%20 A"}, {"y", "b"}}},  // raw, untrimmed
      {"x", {"a", "a"}, {{"a", "x"}}},  // the last key is recognised by its name
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.uri);
    Map out;
    kosdtools::curl::parseUri(c.uri, c.keys, out);
    EXPECT_EQ(out, c.expected);
  }
  // What the map held stays: neither cleared nor overwritten.
  Map preset = {{"x", "kept"}};
  kosdtools::curl::parseUri("a/b", {"x", "y"}, preset);
  EXPECT_EQ(preset, (Map{{"x", "kept"}, {"y", "b"}}));
}

TEST(ParseUri, RefusesUrisThatDoNotPairWithTheKeys) {
  const char* empty = "Failed to parse URI; URI is empty or was not provided URI keys.";
  const char* contiguous = "Failed to parse URI; encountered contiguous delimiters.";
  const char* moreKeys = "Failed to parse URI; more keys than URI parts.";
  const char* moreParts = "Failed to parse URI; more URI parts than keys.";
  struct Case {
    const char* uri;
    Keys keys;
    std::string expected;
  };
  const Case cases[] = {
      {"", {"x"}, uriError(176, empty, "", 1)},
      {"a/b", {}, uriError(176, empty, "a/b", 0)},
      {"a//b", {"x", "y", "z"}, uriError(194, contiguous, "a//b", -1)},
      {"a/b/", {"x", "y", "z"}, uriError(194, contiguous, "a/b/", -1)},
      {"a/b", {"x", "y", "z"}, uriError(207, moreKeys, "a/b", 3)},
      {"a/b/c", {"x", "y"}, uriError(223, moreParts, "a/b/c", 2)},
      {"a/b//", {"x", "y"}, uriError(223, moreParts, "a/b//", 2)},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.uri);
    Map out;
    const auto raised =
        quillon::test_support::raisedBy([&] { kosdtools::curl::parseUri(c.uri, c.keys, out); });
    EXPECT_EQ(raised.code, -52005);
    EXPECT_EQ(raised.record, c.expected);
  }
}

}  // namespace
