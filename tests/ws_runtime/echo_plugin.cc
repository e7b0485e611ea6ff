// A plug-in for the host's own tests and benchmarks, mounted with
// "--service echo". Commands:
//   echo    writes back, a "key=value" line each, what it reads of the request
//   status  sets the code from the variable "code", the MIME type from "mime"
//   gate    answers "released" once the FIFO named by ECHO_PLUGIN_GATE ends
//   fixed, resources
//           read the request as a real service does and answer a fixed
//           200-byte JSON document at once (the benchmarks' immediate plug-in)
// Init, Finalize and "gate" append lines to the file named by ECHO_PLUGIN_LOG,
// so a test can see what ran, and how often.
#include <fcntl.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <string>

#include "ws_runtime/request_info.h"
#include "ws_runtime/ws_runtime.h"

#define ECHO_EXPORT extern "C" __attribute__((visibility("default")))

namespace {

void appendToLog(const char* line) {
  const char* path = std::getenv("ECHO_PLUGIN_LOG");
  if (path == nullptr) return;
  const int fd = ::open(path, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0600);
  if (fd < 0) return;
  [[maybe_unused]] const ssize_t written = ::write(fd, line, std::strlen(line));
  ::close(fd);
}

std::string toUtf8(const std::u32string& text) {
  static constexpr unsigned char kLead[] = {0x00, 0xC0, 0xE0, 0xF0};
  std::string out;
  for (const char32_t c : text) {
    const int tail = c < 0x80 ? 0 : c < 0x800 ? 1 : c < 0x10000 ? 2 : 3;
    out += static_cast<char>(kLead[tail] | (c >> (6 * tail)));
    for (int i = tail - 1; i >= 0; --i) out += static_cast<char>(0x80 | ((c >> (6 * i)) & 0x3F));
  }
  return out;
}

std::string readVariable(uint32_t id, const char* name) {
  char buffer[256];
  uint32_t length = sizeof buffer;
  const int32_t code = ReadRequestVariable_C_REST_KO_GXWS_(id, name, buffer, &length);
  if (code == ws::runtime::errorCodes::k_VARNOTDEFINED) return "<undefined>";
  if (code != 0) return "<error " + std::to_string(code) + ">";
  return buffer;
}

std::string readBody(uint32_t id) {
  uint32_t length = 0;
  if (ReadPostData_C_REST_KO_GXWS_(id, nullptr, &length) < 0) return "<error>";
  std::string body(length, '\0');
  if (length > 0 && ReadPostData_C_REST_KO_GXWS_(id, body.data(), &length) != 0) return "<error>";
  return body;
}

std::string urlVariable(const ws::runtime::RequestInfo& info, const char32_t* name) {
  std::u32string value = U"<undefined>";
  info.lookupVariable(name, value);
  return toUtf8(value);
}

void write(uint32_t id, const std::string& text) {
  WriteOutput_C_REST_KO_GXWS_(id, text.data(), static_cast<uint32_t>(text.size()));
}

void echo(const ws::runtime::RequestInfo& info, uint32_t id) {
  std::string out;
  out += "method=" + readVariable(id, "REQUEST_METHOD") + "\n";
  out += "content-type=" + readVariable(id, "CONTENT_TYPE") + "\n";
  out += "accept=" + readVariable(id, "ACCEPT") + "\n";
  out += "command=" + toUtf8(info.command()) + "\n";
  out += "path=" + toUtf8(info.path()) + "\n";
  out += "client=" + toUtf8(info.clientAddress()) + "\n";
  for (const char32_t* name : {U"plugin", U"type", U"name", U"resourceType"}) {
    out += toUtf8(name) + "=" + urlVariable(info, name) + "\n";
  }
  // Written in two pieces: the host must concatenate them.
  write(id, out);
  write(id, "body=" + readBody(id) + "\n");
  SetHTTPResponseMimeType_C_REST_KO_GXWS_(id, "text/plain; charset=utf-8");
}

void status(const ws::runtime::RequestInfo& info, uint32_t id) {
  std::u32string code, mime;
  if (info.lookupVariable(U"code", code)) {
    SetHTTPResponseCode_KO_GXWS_(id, static_cast<int32_t>(std::strtol(toUtf8(code).c_str(), nullptr, 10)));
  }
  if (info.lookupVariable(U"mime", mime)) {
    SetHTTPResponseMimeType_C_REST_KO_GXWS_(id, toUtf8(mime).c_str());
  }
  write(id, "status\n");
}

void gate(uint32_t id) {
  appendToLog("gate-entered\n");
  const char* path = std::getenv("ECHO_PLUGIN_GATE");
  const int fd = path != nullptr ? ::open(path, O_RDONLY | O_CLOEXEC) : -1;
  if (fd >= 0) {
    char byte;
    while (::read(fd, &byte, 1) > 0) {
    }
    ::close(fd);
  }
  appendToLog("gate-left\n");
  write(id, "released");
}

constexpr char kFixedDocument[] =
    "{\"error\":{\"success\":true,\"code\":0,\"text\":\"\",\"data\":{}},\"result\":"
    "{\"resources\":[\"/quillon/syncableDevices/pendulo/timekeeper/genericTk\"],"
    "\"note\":\"fixed answer of the echo plug-in, two hundred bytes...\"}}";
static_assert(sizeof kFixedDocument - 1 == 200);

void fixed(const ws::runtime::RequestInfo& info, uint32_t id) {
  SetHTTPResponseCode_KO_GXWS_(id, 200);
  char method[5];
  uint32_t length = sizeof method;
  ReadRequestVariable_C_REST_KO_GXWS_(id, "REQUEST_METHOD", method, &length);
  char types[2][128];
  length = sizeof types[0];
  ReadRequestVariable_C_REST_KO_GXWS_(id, "CONTENT_TYPE", types[0], &length);
  length = sizeof types[1];
  ReadRequestVariable_C_REST_KO_GXWS_(id, "ACCEPT", types[1], &length);
  static const std::u32string kResourceType = U"resourceType";
  std::u32string value;
  info.lookupVariable(kResourceType, value);
  WriteOutput_C_REST_KO_GXWS_(id, kFixedDocument, sizeof kFixedDocument - 1);
  FlushOutput_KO_GXWS_(id);
  SetHTTPResponseMimeType_C_REST_KO_GXWS_(id, "vnd.ko.syncDomain.v0/json; charset=utf-8");
}

}  // namespace

ECHO_EXPORT void echoInit() { appendToLog("init\n"); }
ECHO_EXPORT void echoPause() {}
ECHO_EXPORT void echoResume() {}
ECHO_EXPORT void echoFinalize() { appendToLog("finalize\n"); }

ECHO_EXPORT void echoRun(ws::runtime::RequestInfo* info, uint32_t id) {
  const std::u32string& command = info->command();
  // The benchmarks' commands first, so that finding them adds least to what
  // the benchmarks measure.
  if (command == U"resources" || command == U"fixed") {
    fixed(*info, id);
  } else if (command == U"echo") {
    echo(*info, id);
  } else if (command == U"status") {
    status(*info, id);
  } else if (command == U"gate") {
    gate(id);
  } else {
    SetHTTPResponseCode_KO_GXWS_(id, 404);
  }
}
