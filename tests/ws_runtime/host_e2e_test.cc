// ws-runtime over real HTTP, serving the echo plug-in.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <future>
#include <string>

#include <gtest/gtest.h>

#include "support/host_process.h"
#include "support/http_client.h"
#include "support/scratch.h"

namespace {

using quillon::test_support::HostProcess;
using quillon::test_support::HttpClient;
using quillon::test_support::HttpRequest;
using quillon::test_support::HttpResponse;
using Scratch = answers_test::ScratchDir;

std::vector<std::string> echoArgs(std::vector<std::string> extra = {}) {
  std::vector<std::string> args = {"--plugin", ECHO_PLUGIN_PATH, "--service", "echo"};
  args.insert(args.end(), extra.begin(), extra.end());
  return args;
}

TEST(HostEndToEnd, MapsDecodesAndKeepsTheConnectionAlive) {
  Scratch scratch;
  HostProcess host(echoArgs(), {{"ECHO_PLUGIN_LOG", scratch.file("log")}});
  HttpClient client(host.port());

  HttpResponse get = client.send(HttpRequest{
      "GET", "/echo/echo?resourceType=time%73cales", {{"Accept", "application/json"}}, ""});
  EXPECT_EQ(get.status, 200);
  EXPECT_EQ(get.header("Content-Type"), "text/plain; charset=utf-8");
  EXPECT_EQ(get.body,
            "method=GET\ncontent-type=<undefined>\naccept=application/json\ncommand=echo\n"
            "path=/echo/echo\nclient=127.0.0.1\nplugin=<undefined>\ntype=<undefined>\n"
            "name=<undefined>\nresourceType=timescales\nbody=\n");

  // Route variables come before the query's.
  HttpResponse put = client.send(HttpRequest{"PUT", "/echo/echo/pen%2Fdulo/t%C3%A9/a+b?plugin=q",
                                             {{"Content-Type", "x/y"}}, "{\"k\":1}"});
  EXPECT_EQ(put.status, 200);
  EXPECT_EQ(put.body,
            "method=PUT\ncontent-type=x/y\naccept=<undefined>\ncommand=echo\n"
            "path=/echo/echo/pen/dulo/t\xC3\xA9/a+b\nclient=127.0.0.1\nplugin=pen/dulo\n"
            "type=t\xC3\xA9\nname=a+b\nresourceType=<undefined>\nbody={\"k\":1}\n");

  struct Case {
    const char* target;
    int status;
    const char* body;
  } hostAnswers[] = {
      {"/other/echo", 404, "Not Found\n"},
      {"/echo/%zz", 400, "Bad Request: malformed escape or invalid UTF-8 in URL\n"},
  };
  for (const Case& c : hostAnswers) {
    SCOPED_TRACE(c.target);
    HttpResponse answer = client.send(HttpRequest{"GET", c.target, {}, ""});
    EXPECT_EQ(answer.status, c.status);
    EXPECT_EQ(answer.body, c.body);
    EXPECT_EQ(answer.header("Content-Type"), "text/plain; charset=utf-8");
  }
  EXPECT_FALSE(client.closedByServer());

  EXPECT_EQ(host.stop(SIGINT), 0);
  EXPECT_EQ(scratch.read("log"), "init\nfinalize\n");
  const std::string log = host.log();
  EXPECT_NE(log.find("127.0.0.1 GET /echo/echo 200 "), std::string::npos) << log;
  EXPECT_NE(log.find("127.0.0.1 GET /other/echo 404 10 "), std::string::npos) << log;
}

TEST(HostEndToEnd, SendsTheLastCodeAndOutOfRangeCodesAs500WithTheCodeInAHeader) {
  HostProcess host(echoArgs({"--quiet"}));
  struct Case {
    const char* target;
    int status;
    const char* statusHeader;  // null: header absent
    const char* contentType;   // null: header absent
    const char* body;
  } cases[] = {
      {"/echo/status?code=599&mime=a%2Fb", 599, nullptr, "a/b", "status\n"},
      {"/echo/status?code=-52006&mime=vnd.x%2Fjson", 500, "-52006", "vnd.x/json", "status\n"},
      {"/echo/status?code=600", 500, "600", nullptr, "status\n"},
      {"/echo/status", 200, nullptr, nullptr, "status\n"},
  };
  HttpClient client(host.port());
  for (const Case& c : cases) {
    SCOPED_TRACE(c.target);
    HttpResponse answer = client.send(HttpRequest{"GET", c.target, {}, ""});
    EXPECT_EQ(answer.status, c.status);
    EXPECT_EQ(answer.body, c.body);
    EXPECT_EQ(answer.header("X-Status-Code"),
              c.statusHeader ? std::optional<std::string>(c.statusHeader) : std::nullopt);
    EXPECT_EQ(answer.header("Content-Type"),
              c.contentType ? std::optional<std::string>(c.contentType) : std::nullopt);
  }
  EXPECT_EQ(host.stop(), 0);
}

TEST(HostEndToEnd, RefusesALargeBodyWithoutThePluginAndKeepsServing) {
  HostProcess host(echoArgs({"--max-body", "16", "--quiet"}));
  HttpClient client(host.port());
  HttpResponse tooLarge =
      client.send(HttpRequest{"PUT", "/echo/echo", {}, std::string(17, 'x')});
  EXPECT_EQ(tooLarge.status, 413);
  EXPECT_EQ(tooLarge.body, "Payload Too Large\n");
  HttpResponse fits = client.send(HttpRequest{"PUT", "/echo/echo", {}, std::string(16, 'y')});
  EXPECT_EQ(fits.status, 200);
  EXPECT_NE(fits.body.find("body=yyyyyyyyyyyyyyyy\n"), std::string::npos) << fits.body;
  // Chunked bodies are counted the same way.
  HttpResponse chunked = client.send(HttpRequest{
      "PUT", "/echo/echo", {{"Transfer-Encoding", "chunked"}}, "9\r\n123456789\r\n9\r\n123456789\r\n0\r\n\r\n"});
  EXPECT_EQ(chunked.status, 413);
  EXPECT_EQ(host.stop(), 0);
}

TEST(HostEndToEnd, StartUpFailuresNameTheirCause) {
  HostProcess holder(echoArgs({"--quiet"}));  // takes the address of the last case
  const std::string busy = "127.0.0.1:" + std::to_string(holder.port());

  struct Case {
    std::vector<std::string> args;
    int exitCode;
    std::string logPart;
  } cases[] = {
      {{"--plugin", ECHO_PLUGIN_PATH, "--service", "nope"}, 1,
       std::string("dlsym(\"nopeInit\") in ") + ECHO_PLUGIN_PATH + " failed: "},
      {{"--plugin", "/nonexistent/libx.so"}, 1,
       "dlopen(\"/nonexistent/libx.so\", RTLD_NOW) failed: /nonexistent/libx.so: cannot open"},
      {{"--threads", "x"}, 2, "ws-runtime: --threads 'x': a number from 1 to 256\nusage:"},
      {echoArgs({"--listen", busy}), 3, "cannot listen on " + busy + ": Address already in use"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.logPart);
    const auto run = quillon::test_support::runHostToExit(c.args);
    EXPECT_EQ(run.exitCode, c.exitCode);
    EXPECT_NE(run.log.find(c.logPart), std::string::npos) << run.log;
  }
}

TEST(HostEndToEnd, StopLetsTheRequestInProgressFinishThenFinalizesOnce) {
  Scratch scratch;
  ASSERT_EQ(::mkfifo(scratch.file("gate").c_str(), 0600), 0);
  // Two threads: the second stays free to answer while the first is held.
  HostProcess host(echoArgs({"--threads", "2"}), {{"ECHO_PLUGIN_LOG", scratch.file("log")},
                                                  {"ECHO_PLUGIN_GATE", scratch.file("gate")}});
  auto blocked = std::async(std::launch::async, [&] {
    return quillon::test_support::httpRequest(host.port(), "GET", "/echo/gate");
  });
  // Opening the gate for writing returns once the plug-in waits at it.
  const int gate = ::open(scratch.file("gate").c_str(), O_WRONLY);
  ASSERT_GE(gate, 0);
  host.signal(SIGTERM);
  ASSERT_TRUE(host.waitForLog("stopping on SIGTERM"));
  // A client arriving while the host drains is told so at once.
  const HttpResponse late = quillon::test_support::httpRequest(host.port(), "GET", "/echo/late");
  EXPECT_EQ(late.status, 503);
  EXPECT_EQ(late.header("Connection").value_or(""), "close");
  ::close(gate);
  const HttpResponse answer = blocked.get();
  EXPECT_EQ(answer.status, 200);
  EXPECT_EQ(answer.body, "released");
  EXPECT_EQ(host.wait(), 0);
  EXPECT_EQ(scratch.read("log"), "init\ngate-entered\ngate-left\nfinalize\n");
}

}  // namespace
