// The floor under the host: libmicrohttpd alone, configured as ws-runtime
// configures it (epoll, a pool of threads accepting for themselves, the
// answer queued on the handler's last call), with 8 KiB of connection memory
// and by default without an idle timeout, which libmicrohttpd pays for on
// every request (the host times idle connections out itself); it serves one
// fixed answer with no plug-in, no URL mapping and no per-request state.
// bench/host/run.sh measures the host against it, so that what the host adds
// is seen apart from what the machine and the library allow;
// bench/host/instructions.sh also runs it with an idle timeout, so that the
// library's cost of one is seen.
//
//   bare-http-daemon PORT THREADS FILE CONTENT-TYPE [IDLE-TIMEOUT-SECONDS]
#include <microhttpd.h>
#include <signal.h>

#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <string>

namespace {

struct Answer {
  std::string body;
  std::string contentType;
};

MHD_Result serve(void* context, MHD_Connection* connection, const char*, const char*, const char*,
                 const char*, size_t* uploadSize, void** requestContext) {
  // Answering on the first call would make the daemon close the connection.
  if (*requestContext == nullptr) {
    *requestContext = connection;
    return MHD_YES;
  }
  if (*uploadSize != 0) {
    *uploadSize = 0;
    return MHD_YES;
  }
  const auto* answer = static_cast<const Answer*>(context);
  MHD_Response* response = MHD_create_response_from_buffer(
      answer->body.size(), const_cast<char*>(answer->body.data()), MHD_RESPMEM_PERSISTENT);
  if (response == nullptr) return MHD_NO;
  MHD_add_response_header(response, MHD_HTTP_HEADER_CONTENT_TYPE, answer->contentType.c_str());
  const MHD_Result queued = MHD_queue_response(connection, MHD_HTTP_OK, response);
  MHD_destroy_response(response);
  return queued;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc != 5 && argc != 6) {
    std::fprintf(stderr, "usage: %s PORT THREADS FILE CONTENT-TYPE [IDLE-TIMEOUT-SECONDS]\n",
                 argv[0]);
    return 2;
  }
  std::ifstream file(argv[3], std::ios::binary);
  if (!file) {
    std::fprintf(stderr, "%s: cannot read %s\n", argv[0], argv[3]);
    return 1;
  }
  Answer answer{std::string(std::istreambuf_iterator<char>(file), {}), argv[4]};
  const auto port = static_cast<uint16_t>(std::atoi(argv[1]));
  const auto threads = static_cast<unsigned>(std::atoi(argv[2]));
  const auto idleTimeout = static_cast<unsigned>(argc == 6 ? std::atoi(argv[5]) : 0);

  sigset_t stop;
  sigemptyset(&stop);
  sigaddset(&stop, SIGINT);
  sigaddset(&stop, SIGTERM);
  pthread_sigmask(SIG_BLOCK, &stop, nullptr);  // the daemon's threads inherit the mask
  MHD_Daemon* daemon = MHD_start_daemon(
      MHD_USE_EPOLL_INTERNAL_THREAD | MHD_USE_ITC | MHD_USE_TURBO, port, nullptr, nullptr, &serve,
      &answer, MHD_OPTION_THREAD_POOL_SIZE, threads, MHD_OPTION_CONNECTION_MEMORY_LIMIT,
      static_cast<size_t>(8 * 1024), MHD_OPTION_CONNECTION_TIMEOUT, idleTimeout, MHD_OPTION_END);
  if (daemon == nullptr) {
    std::fprintf(stderr, "%s: cannot start the daemon on port %u\n", argv[0], port);
    return 1;
  }
  int signal = 0;
  sigwait(&stop, &signal);
  MHD_stop_daemon(daemon);
  return 0;
}
