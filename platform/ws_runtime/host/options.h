// The command line of ws-runtime.
//
// Thread-safety: plain values.
#ifndef WS_RUNTIME_HOST_OPTIONS_H_
#define WS_RUNTIME_HOST_OPTIONS_H_

#include <netinet/in.h>
#include <sys/socket.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace ws::host {

struct Options {
  std::string listen = "127.0.0.1:8080";
  sockaddr_storage address{};  // `listen`, parsed
  std::string pluginPath;      // defaults to the plug-in beside the host's build or installation
  std::string service = "quillon";
  unsigned threads = 0;        // defaults to the number of processors
  uint64_t maxBody = 1024 * 1024;
  unsigned maxConnections = 10000;
  // Not a flag: what the descriptors left after the connections allow for
  // connections that are being closed in an orderly way (main.cc).
  unsigned lingeringSockets = 0;
  std::string accessLog;       // empty: stderr
  bool quiet = false;
  bool help = false;
};

// The usage text for --help and for a command-line error.
std::string usage();

// Parses argv[1..]. On an error, returns nothing and sets `error` to a line
// naming the offending argument.
std::optional<Options> parseOptions(const std::vector<std::string>& args, std::string& error);

// "127.0.0.1:8080" or "[::1]:8080" into a socket address; false when the text
// is not a numeric address with a port.
bool parseListenAddress(const std::string& text, sockaddr_storage& address);

}  // namespace ws::host

#endif  // WS_RUNTIME_HOST_OPTIONS_H_
