// Real HTTP transfers through the run-time bound library: the example client,
// which uses nothing else to talk HTTP, against a ws-runtime host started by
// the test.
#include <gtest/gtest.h>
#include <sys/wait.h>

#include <cstdio>
#include <string>

#include "support/host_process.h"
#include "support/scratch.h"

namespace {

using quillon::test_support::HostProcess;

struct ClientRun {
  int exitCode = -1;
  std::string out, err;
};

ClientRun runClient(const std::string& args) {
  const answers_test::ScratchDir scratch;
  const std::string command =
      std::string(TRANSFER_CLIENT_PATH) + " " + args + " 2>" + scratch.file("err");
  ClientRun run;
  FILE* pipe = ::popen(command.c_str(), "r");
  char buffer[512];
  for (size_t got; (got = std::fread(buffer, 1, sizeof buffer, pipe)) > 0;) {
    run.out.append(buffer, got);
  }
  const int status = ::pclose(pipe);
  run.exitCode = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  run.err = scratch.read("err");
  return run;
}

TEST(RealTransfer, ExampleClientPrintsTheAnswer) {
  HostProcess host({"--plugin", ECHO_PLUGIN_PATH, "--service", "echo"});
  const std::string port = std::to_string(host.port());
  const struct {
    const char* name;
    std::string args;
    int exitCode;
    std::string out, err;
  } cases[] = {
      {"document",
       port + " /echo/fixed",
       0,
       "{\"error\":{\"success\":true,\"code\":0,\"text\":\"\",\"data\":{}},\"result\":"
       "{\"resources\":[\"/quillon/syncableDevices/pendulo/timekeeper/genericTk\"],"
       "\"note\":\"fixed answer of the echo plug-in, two hundred bytes...\"}}\n",
       "HTTP 200 vnd.ko.syncDomain.v0/json; charset=utf-8\n"},
      {"not found", port + " echo/nothing", 4, "\n", "HTTP 404 \n"},
      {"default path", port, 4, "Not Found\n\n", "HTTP 404 text/plain; charset=utf-8\n"},
      {"bad port", "70000", 1, "", "usage: transfer_client PORT [PATH]\n"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    const ClientRun run = runClient(c.args);
    EXPECT_EQ(run.exitCode, c.exitCode);
    EXPECT_EQ(run.out, c.out);
    EXPECT_EQ(run.err, c.err);
  }
  EXPECT_EQ(host.stop(), 0);
}

}  // namespace
