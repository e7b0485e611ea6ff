// transfer_client: fetches one URL of a running service through the run-time
// bound transfer library and prints the answer.
//
//   transfer_client PORT [PATH]     GET http://127.0.0.1:PORT/PATH
//                                   (PATH defaults to /quillon/resources)
//
// The body goes to standard output; the status code and media type go to
// standard error as "HTTP <code> <media type>". Exit status: 0 when the
// server answered below 400, 1 for bad arguments, 2 when the libraries could
// not be bound, 3 when the transfer failed, 4 when the server answered 400 or
// above. Set KO_DSC_LIBRARY_PATH to the folder holding libkosslinit.so.13 and
// libcurlimpl.so.13 when they are not on the loader's path.
#include <cstdio>
#include <cstdlib>
#include <string>

#include "transfer_binding/curl.h"

namespace {

using ko::chronos::shared::CurlFunctions;
using ko::chronos::shared::tCURL;

size_t collect(char* data, size_t size, size_t count, void* sink) {
  static_cast<std::string*>(sink)->append(data, size * count);
  return size * count;
}

bool parsePort(const char* text, long& port) {
  char* end = nullptr;
  port = std::strtol(text, &end, 10);
  return end != text && *end == '\0' && port > 0 && port < 65536;
}

// One GET; the easy handle is released on every path.
int fetch(const CurlFunctions& curl, const std::string& url) {
  CURL* easy = curl.easy_init();
  if (easy == nullptr) {
    std::fprintf(stderr, "transfer_client: curl_easy_init failed\n");
    return 3;
  }
  std::string body;
  kocurl_optval value{};
  value.pointer = const_cast<char*>(url.c_str());
  curl.easy_setopt(easy, CURLOPT_URL, value);
  value.function = reinterpret_cast<void (*)()>(&collect);
  curl.easy_setopt(easy, CURLOPT_WRITEFUNCTION, value);
  value.pointer = &body;
  curl.easy_setopt(easy, CURLOPT_WRITEDATA, value);
  value.number = 10;
  curl.easy_setopt(easy, CURLOPT_TIMEOUT, value);

  int exitCode = 0;
  const CURLcode result = curl.easy_perform(easy);
  if (result != CURLE_OK) {
    std::fprintf(stderr, "transfer_client: GET %s: %s\n", url.c_str(), curl.easy_strerror(result));
    exitCode = 3;
  } else {
    long status = 0;
    char* mediaType = nullptr;
    curl.easy_getinfo(easy, CURLINFO_RESPONSE_CODE, &status);
    curl.easy_getinfo(easy, CURLINFO_CONTENT_TYPE, &mediaType);
    std::fprintf(stderr, "HTTP %ld %s\n", status, mediaType != nullptr ? mediaType : "");
    std::fwrite(body.data(), 1, body.size(), stdout);
    std::fputc('\n', stdout);
    exitCode = status < 400 ? 0 : 4;
  }
  curl.easy_cleanup(easy);
  return exitCode;
}

}  // namespace

int main(int argc, char** argv) {
  long port = 0;
  if (argc < 2 || argc > 3 || !parsePort(argv[1], port)) {
    std::fprintf(stderr, "usage: transfer_client PORT [PATH]\n");
    return 1;
  }
  std::string path = argc == 3 ? argv[2] : "/quillon/resources";
  if (path.empty() || path[0] != '/') {
    path.insert(0, "/");
  }

  tCURL binding;
  if (!binding.load()) {
    std::fprintf(stderr, "transfer_client: cannot bind the transfer library: %s\n",
                 binding.lastFailure().c_str());
    return 2;
  }
  const CurlFunctions& curl = *binding.functions();
  if (curl.global_init(CURL_GLOBAL_DEFAULT) != CURLE_OK) {
    std::fprintf(stderr, "transfer_client: curl_global_init failed\n");
    return 3;
  }
  const int exitCode = fetch(curl, "http://127.0.0.1:" + std::to_string(port) + path);
  curl.global_cleanup();
  return exitCode;
}
