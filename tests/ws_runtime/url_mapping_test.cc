// How the host turns URLs into command words and variables, and its command
// line.
#include <string>
#include <vector>

#include <gtest/gtest.h>

#include "options.h"
#include "url_mapping.h"

namespace {

using ws::host::Mapping;
using ws::host::RawParameter;

std::u32string variable(const ws::runtime::ExchangeRequest& request, const std::u32string& name) {
  for (const auto& [key, value] : request.variables) {
    if (key == name) return value;
  }
  return U"<none>";
}

TEST(UrlMapping, RoutesAndDecodesSegmentsAndQuery) {
  struct Case {
    const char* path;
    std::vector<RawParameter> query;
    std::u32string decodedPath, command, plugin, type, name, resourceType;
  } cases[] = {
      {"/quillon/resources", {{"resource%54ype", "a+b"}}, U"/quillon/resources",
       U"resources", U"<none>", U"<none>", U"<none>", U"a+b"},
      {"/quillon/timescales/pendulo/tr%2F0/a%20b", {}, U"/quillon/timescales/pendulo/tr/0/a b",
       U"timescales", U"pendulo", U"tr/0", U"a b", U"<none>"},
      {"/quillon/x/%C3%A9/%E2%82%AC/%F0%9F%98%80", {}, U"/quillon/x/\u00e9/\u20ac/\U0001F600",
       U"x", U"\u00e9", U"\u20ac", U"\U0001F600", U"<none>"},
      {"/quil%6Con/resources", {}, U"/quillon/resources", U"resources", U"<none>", U"<none>",
       U"<none>", U"<none>"},
      // UTF-8 sent as raw bytes rather than escapes.
      {"/quillon/x/caf\xC3\xA9/t/n", {{"resourceType", "\xE2\x82\xAC"}},
       U"/quillon/x/caf\u00e9/t/n", U"x", U"caf\u00e9", U"t", U"n", U"\u20ac"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.path);
    ws::runtime::ExchangeRequest request;
    ASSERT_EQ(ws::host::mapUrl("quillon", c.path, c.query, request), Mapping::kMapped);
    EXPECT_EQ(request.path, c.decodedPath);
    EXPECT_EQ(request.command, c.command);
    EXPECT_EQ(variable(request, U"plugin"), c.plugin);
    EXPECT_EQ(variable(request, U"type"), c.type);
    EXPECT_EQ(variable(request, U"name"), c.name);
    EXPECT_EQ(variable(request, U"resourceType"), c.resourceType);
  }
}

TEST(UrlMapping, RejectsOtherPathsAndBadEncodingsWithoutTouchingTheRequest) {
  struct Case {
    const char* path;
    std::vector<RawParameter> query;
    Mapping result;
  } cases[] = {
      {"/quillon", {}, Mapping::kNotFound},
      {"/quillon/resources/", {}, Mapping::kNotFound},
      {"/quillon/a/b/c/d/e", {}, Mapping::kNotFound},
      {"/quillon/a//c/d", {}, Mapping::kNotFound},
      {"/Quillon/resources", {}, Mapping::kNotFound},
      {"quillon/resources", {}, Mapping::kNotFound},
      {"/quillon/a%2", {}, Mapping::kBadRequest},
      {"/quillon/a%zz", {}, Mapping::kBadRequest},
      {"/quillon/%C3", {}, Mapping::kBadRequest},           // truncated
      {"/quillon/%C0%AF", {}, Mapping::kBadRequest},        // overlong
      {"/quillon/%ED%A0%80", {}, Mapping::kBadRequest},     // surrogate
      {"/quillon/%F4%90%80%80", {}, Mapping::kBadRequest},  // above U+10FFFF
      {"/quillon/%FF", {}, Mapping::kBadRequest},
      {"/quillon/r", {{"k\xFF", "v"}}, Mapping::kBadRequest},
      {"/quillon/r", {{"k", "%E2%82"}}, Mapping::kBadRequest},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.path);
    ws::runtime::ExchangeRequest request;
    request.command = U"untouched";
    EXPECT_EQ(ws::host::mapUrl("quillon", c.path, c.query, request), c.result);
    EXPECT_EQ(request.command, U"untouched");
    EXPECT_TRUE(request.variables.empty());
  }
}

TEST(Options, ParsesFlagsAndNamesTheBadOne) {
  std::string error;
  auto options = ws::host::parseOptions({"--listen", "[::1]:0", "--plugin", "/x.so", "--service",
                                         "echo", "--threads", "3", "--max-body", "0", "--quiet"},
                                        error);
  ASSERT_TRUE(options) << error;
  EXPECT_EQ(options->address.ss_family, AF_INET6);
  EXPECT_EQ(options->pluginPath, "/x.so");
  EXPECT_EQ(options->service, "echo");
  EXPECT_EQ(options->threads, 3u);
  EXPECT_EQ(options->maxBody, 0u);
  EXPECT_TRUE(options->quiet);

  struct Case {
    std::vector<std::string> args;
    const char* error;
  } cases[] = {
      {{"--listen", "localhost:80"}, "--listen 'localhost:80': expected ADDRESS:PORT with a numeric address"},
      {{"--listen", "127.0.0.1:65536"}, "--listen '127.0.0.1:65536': expected ADDRESS:PORT with a numeric address"},
      {{"--threads", "0"}, "--threads '0': a number from 1 to 256"},
      {{"--max-body", "-1"}, "--max-body '-1': a number of bytes"},
      {{"--service", "a/b"}, "--service 'a/b': letters, digits and '_' only"},
      {{"--threads"}, "--threads needs a value"},
      {{"--verbose"}, "unknown argument '--verbose'"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.args.front());
    EXPECT_FALSE(ws::host::parseOptions(c.args, error));
    EXPECT_EQ(error, c.error);
  }
}

}  // namespace
