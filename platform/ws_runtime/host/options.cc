#include "options.h"

#include <arpa/inet.h>

#include <algorithm>
#include <charconv>
#include <filesystem>
#include <thread>

namespace ws::host {

#ifndef WS_RUNTIME_DEFAULT_PLUGIN
#define WS_RUNTIME_DEFAULT_PLUGIN "libquillon.so.1"
#endif

namespace {

constexpr unsigned kMaxThreads = 256;
// Threads beyond one per processor: a plug-in's call may wait on an outside
// service (a time-sync daemon that answers late), and a waiting call holds
// its thread and every connection that thread serves.
constexpr unsigned kWaitingThreads = 4;
constexpr uint64_t kMinConnections = 16;
constexpr uint64_t kMaxConnections = 1000000;

// A default that starts with "$ORIGIN/" lies relative to the folder of the
// running host, so that one binary finds its plug-in in the build tree and
// where it is installed without naming either. The loader's own $ORIGIN
// cannot serve: under a sanitizer the dlopen call comes from the sanitizer's
// runtime, not from the host.
std::string defaultPluginPath() {
  const std::string configured = WS_RUNTIME_DEFAULT_PLUGIN;
  const std::string origin = "$ORIGIN/";
  if (configured.compare(0, origin.size(), origin) != 0) return configured;
  std::error_code error;
  const std::filesystem::path host = std::filesystem::read_symlink("/proc/self/exe", error);
  // Without /proc the path stays relative, and dlopen names it in its error.
  if (error) return configured.substr(origin.size());
  return (host.parent_path() / configured.substr(origin.size())).lexically_normal().string();
}

bool parseUnsigned(const std::string& text, uint64_t& value) {
  const char* end = text.data() + text.size();
  auto [ptr, ec] = std::from_chars(text.data(), end, value);
  return !text.empty() && ec == std::errc() && ptr == end;
}

bool validServiceName(const std::string& name) {
  if (name.empty()) return false;
  for (char c : name) {
    const bool ok = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
                    c == '_';
    if (!ok) return false;
  }
  return true;
}

}  // namespace

std::string usage() {
  return "usage: ws-runtime [--listen ADDR:PORT] [--plugin PATH] [--service NAME]\n"
         "                  [--threads N] [--max-body BYTES] [--max-connections N]\n"
         "                  [--access-log PATH] [--quiet]\n"
         "  --listen    numeric address and port, e.g. 127.0.0.1:8080 or [::1]:8080;\n"
         "              port 0 picks a free one (default 127.0.0.1:8080)\n"
         "  --plugin    the plug-in library (default " + defaultPluginPath() + ")\n"
         "  --service   the entry-point prefix and mount point /NAME (default quillon)\n"
         "  --threads   request threads, 1.." + std::to_string(kMaxThreads) +
         " (default: one per processor, plus " +
         std::to_string(kWaitingThreads) + ")\n"
         "  --max-body  largest request body accepted, in bytes (default 1048576)\n"
         "  --max-connections  open connections at most (default 10000)\n"
         "  --access-log  append the access log to PATH, reopened on SIGHUP (default stderr)\n"
         "  --quiet     no access log\n";
}

bool parseListenAddress(const std::string& text, sockaddr_storage& address) {
  const auto colon = text.rfind(':');
  if (colon == std::string::npos) return false;
  std::string host = text.substr(0, colon);
  uint64_t port = 0;
  if (!parseUnsigned(text.substr(colon + 1), port) || port > 65535) return false;
  address = sockaddr_storage{};
  if (host.size() >= 2 && host.front() == '[' && host.back() == ']') {
    auto* v6 = reinterpret_cast<sockaddr_in6*>(&address);
    v6->sin6_family = AF_INET6;
    v6->sin6_port = htons(static_cast<uint16_t>(port));
    return inet_pton(AF_INET6, host.substr(1, host.size() - 2).c_str(), &v6->sin6_addr) == 1;
  }
  auto* v4 = reinterpret_cast<sockaddr_in*>(&address);
  v4->sin_family = AF_INET;
  v4->sin_port = htons(static_cast<uint16_t>(port));
  return inet_pton(AF_INET, host.c_str(), &v4->sin_addr) == 1;
}

std::optional<Options> parseOptions(const std::vector<std::string>& args, std::string& error) {
  Options options;
  options.pluginPath = defaultPluginPath();
  for (size_t i = 0; i < args.size(); ++i) {
    const std::string& flag = args[i];
    if (flag == "--quiet") {
      options.quiet = true;
      continue;
    }
    if (flag == "--help" || flag == "-h") {
      options.help = true;
      continue;
    }
    if (flag != "--listen" && flag != "--plugin" && flag != "--service" && flag != "--threads" &&
        flag != "--max-body" && flag != "--max-connections" && flag != "--access-log") {
      error = "unknown argument '" + flag + "'";
      return std::nullopt;
    }
    if (i + 1 == args.size()) {
      error = flag + " needs a value";
      return std::nullopt;
    }
    const std::string& value = args[++i];
    uint64_t number = 0;
    if (flag == "--listen") {
      options.listen = value;
    } else if (flag == "--plugin") {
      if (value.empty()) {
        error = "--plugin needs a path";
        return std::nullopt;
      }
      options.pluginPath = value;
    } else if (flag == "--service") {
      if (!validServiceName(value)) {
        error = "--service '" + value + "': letters, digits and '_' only";
        return std::nullopt;
      }
      options.service = value;
    } else if (flag == "--threads") {
      if (!parseUnsigned(value, number) || number == 0 || number > kMaxThreads) {
        error = "--threads '" + value + "': a number from 1 to " + std::to_string(kMaxThreads);
        return std::nullopt;
      }
      options.threads = static_cast<unsigned>(number);
    } else if (flag == "--max-connections") {
      if (!parseUnsigned(value, number) || number < kMinConnections || number > kMaxConnections) {
        error = "--max-connections '" + value + "': a number from " +
                std::to_string(kMinConnections) + " to " + std::to_string(kMaxConnections);
        return std::nullopt;
      }
      options.maxConnections = static_cast<unsigned>(number);
    } else if (flag == "--access-log") {
      if (value.empty()) {
        error = "--access-log needs a path";
        return std::nullopt;
      }
      options.accessLog = value;
    } else {
      if (!parseUnsigned(value, number)) {
        error = "--max-body '" + value + "': a number of bytes";
        return std::nullopt;
      }
      options.maxBody = number;
    }
  }
  if (!parseListenAddress(options.listen, options.address)) {
    error = "--listen '" + options.listen + "': expected ADDRESS:PORT with a numeric address";
    return std::nullopt;
  }
  if (options.threads == 0) {
    const unsigned cores = std::thread::hardware_concurrency();
    options.threads = std::min((cores == 0 ? 1 : cores) + kWaitingThreads, kMaxThreads);
  }
  return options;
}

}  // namespace ws::host
