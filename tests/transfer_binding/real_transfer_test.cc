// Real HTTP transfers through the run-time bound library, against a ws-runtime
// host started by the test: in this process through the table, and through
// the example client as a child process.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <fstream>
#include <sstream>
#include <string>
#include <vector>

#include "support/host_process.h"
#include "transfer_binding/curl.h"

extern char** environ;

namespace ko::chronos::shared {
namespace {

using quillon::test_support::HostProcess;

size_t collect(char* data, size_t size, size_t count, void* sink) {
  static_cast<std::string*>(sink)->append(data, size * count);
  return size * count;
}

struct Answer {
  CURLcode result = CURLE_OK;
  long status = 0;
  std::string mediaType;
  std::string body;
};

// One request through the bound table; `body` non-empty makes it a PUT.
Answer transfer(const CurlFunctions& curl, const std::string& url, const char* header,
                const std::string& body) {
  Answer answer;
  CURL* easy = curl.easy_init();
  curl_slist* headers = curl.slist_append(nullptr, header);
  kocurl_optval value{};
  auto set = [&](CURLoption option, kocurl_optval v) {
    EXPECT_EQ(curl.easy_setopt(easy, option, v), CURLE_OK) << option;
  };
  value.pointer = const_cast<char*>(url.c_str());
  set(CURLOPT_URL, value);
  value.pointer = headers;
  set(CURLOPT_HTTPHEADER, value);
  value.function = reinterpret_cast<void (*)()>(&collect);
  set(CURLOPT_WRITEFUNCTION, value);
  value.pointer = &answer.body;
  set(CURLOPT_WRITEDATA, value);
  value.number = 30;
  set(CURLOPT_TIMEOUT, value);
  if (!body.empty()) {
    value.pointer = const_cast<char*>("PUT");
    set(CURLOPT_CUSTOMREQUEST, value);
    value.pointer = const_cast<char*>(body.c_str());
    set(CURLOPT_POSTFIELDS, value);
    value.offset = static_cast<curl_off_t>(body.size());
    set(CURLOPT_POSTFIELDSIZE_LARGE, value);
  }
  answer.result = curl.easy_perform(easy);
  char* mediaType = nullptr;
  curl.easy_getinfo(easy, CURLINFO_RESPONSE_CODE, &answer.status);
  curl.easy_getinfo(easy, CURLINFO_CONTENT_TYPE, &mediaType);
  answer.mediaType = mediaType != nullptr ? mediaType : "";
  curl.slist_free_all(headers);
  curl.easy_cleanup(easy);
  return answer;
}

TEST(RealTransfer, BoundTableTalksHttpToTheHost) {
  HostProcess host({"--plugin", ECHO_PLUGIN_PATH, "--service", "echo"});
  tCURL binding;
  ASSERT_TRUE(binding.load()) << binding.lastFailure();
  const CurlFunctions& curl = *binding.functions();
  ASSERT_EQ(curl.global_init(CURL_GLOBAL_DEFAULT), CURLE_OK);
  const std::string base = "http://127.0.0.1:" + std::to_string(host.port());

  const Answer get = transfer(curl, base + "/echo/echo?resourceType=timescales",
                              "Accept: application/json", "");
  EXPECT_EQ(get.result, CURLE_OK);
  EXPECT_EQ(get.status, 200);
  EXPECT_EQ(get.mediaType, "text/plain; charset=utf-8");
  EXPECT_EQ(get.body,
            "method=GET\ncontent-type=<undefined>\naccept=application/json\ncommand=echo\n"
            "path=/echo/echo\nclient=127.0.0.1\nplugin=<undefined>\ntype=<undefined>\n"
            "name=<undefined>\nresourceType=timescales\nbody=\n");

  const Answer put =
      transfer(curl, base + "/echo/echo/pendulo/tk/genericTk", "Content-Type: x/y", "{\"k\":1}");
  EXPECT_EQ(put.status, 200);
  EXPECT_EQ(put.body,
            "method=PUT\ncontent-type=x/y\naccept=*/*\ncommand=echo\n"
            "path=/echo/echo/pendulo/tk/genericTk\nclient=127.0.0.1\nplugin=pendulo\ntype=tk\n"
            "name=genericTk\n"
            "resourceType=<undefined>\nbody={\"k\":1}\n");

  const Answer missing = transfer(curl, base + "/echo/nothing", "Accept: */*", "");
  EXPECT_EQ(missing.status, 404);
  curl.global_cleanup();
  EXPECT_EQ(host.stop(), 0);

  const Answer refused = transfer(curl, base + "/echo/echo", "Accept: */*", "");
  EXPECT_EQ(refused.result, CURLE_COULDNT_CONNECT);
}

struct ClientRun {
  int exitCode = -1;
  std::string out;
  std::string err;
};

std::string slurp(const std::string& path) {
  std::ifstream in(path);
  std::ostringstream text;
  text << in.rdbuf();
  ::unlink(path.c_str());
  return text.str();
}

ClientRun runClient(const std::vector<std::string>& args) {
  char outPath[] = "/tmp/transfer_client_out_XXXXXX";
  char errPath[] = "/tmp/transfer_client_err_XXXXXX";
  const int out = ::mkstemp(outPath);
  const int err = ::mkstemp(errPath);
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, out, STDOUT_FILENO);
  posix_spawn_file_actions_adddup2(&actions, err, STDERR_FILENO);
  std::vector<char*> argv{const_cast<char*>(TRANSFER_CLIENT_PATH)};
  for (const auto& arg : args) {
    argv.push_back(const_cast<char*>(arg.c_str()));
  }
  argv.push_back(nullptr);
  pid_t pid = -1;
  ClientRun run;
  if (posix_spawn(&pid, TRANSFER_CLIENT_PATH, &actions, nullptr, argv.data(), environ) == 0) {
    int status = 0;
    ::waitpid(pid, &status, 0);
    run.exitCode = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
  }
  posix_spawn_file_actions_destroy(&actions);
  ::close(out);
  ::close(err);
  run.out = slurp(outPath);
  run.err = slurp(errPath);
  return run;
}

TEST(RealTransfer, ExampleClientPrintsTheAnswer) {
  HostProcess host({"--plugin", ECHO_PLUGIN_PATH, "--service", "echo"});
  const std::string port = std::to_string(host.port());
  const struct {
    const char* name;
    std::vector<std::string> args;
    int exitCode;
    std::string out;
    std::string err;
  } cases[] = {
      {"document",
       {port, "/echo/fixed"},
       0,
       "{\"error\":{\"success\":true,\"code\":0,\"text\":\"\",\"data\":{}},\"result\":"
       "{\"resources\":[\"/quillon/syncableDevices/pendulo/timekeeper/genericTk\"],"
       "\"note\":\"fixed answer of the echo plug-in, two hundred bytes...\"}}\n",
       "HTTP 200 vnd.ko.syncDomain.v0/json; charset=utf-8\n"},
      {"not found", {port, "echo/nothing"}, 4, "\n", "HTTP 404 \n"},
      {"bad port", {"70000"}, 1, "", "usage: transfer_client PORT [PATH]\n"},
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
}  // namespace ko::chronos::shared
