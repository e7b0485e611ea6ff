#include "error_record/error.h"

namespace koerr {

Report::Report(Status& status, int32_t code) : status_(status), taken_(setCode(status, code)) {}

Report::Report(Status& status, const ErrorConstant& constant, const char* file, int32_t line)
    : Report(status, constant.code, constant.name, file, line) {}

Report::Report(Status& status, int32_t code, const char* constantName, const char* file,
               int32_t line)
    : Report(status, code) {
  writeHeader(constantName, file, line);
}

void Report::writeHeader(const char* constantName, const char* file, int32_t line) {
  if (!taken_) return;
  cursor_ = addString(start(), "error_constant", constantName, status_);
  location(file, line);
}

char* Report::start() {
  if (!started_) {
    started_ = true;
    cursor_ = beginJson(status_, 2);
  }
  return cursor_;
}

Report& Report::location(const char* file, int32_t line) {
  if (!taken_) return *this;
  cursor_ = addString(start(), "file", file, status_);
  cursor_ = koerr::addInt(cursor_, "line", line, status_);
  cursor_ = addString(cursor_, "component", kComponent, status_);
  return *this;
}

Report& Report::open(const char* key) {
  if (taken_) {
    cursor_ = addObject(start(), key, status_);
    ++openObjects_;
  }
  return *this;
}

Report& Report::close() {
  // Stepping past the root's brace would put later members outside the
  // object and leave the record unparsable.
  if (taken_ && openObjects_ > 0) {
    cursor_ = leaveContainer(cursor_);
    --openObjects_;
  }
  return *this;
}

Report& Report::add(const char* key, const char* value) {
  if (taken_) cursor_ = addString(start(), key, value, status_);
  return *this;
}

Report& Report::add(const char* key, const std::string& value) {
  if (taken_) cursor_ = addStdString(start(), key, value, status_);
  return *this;
}

Report& Report::addInt(const char* key, int32_t value) {
  if (taken_) cursor_ = koerr::addInt(start(), key, value, status_);
  return *this;
}

Report& Report::addUInt(const char* key, uint32_t value) {
  if (taken_) cursor_ = koerr::addUInt(start(), key, value, status_);
  return *this;
}

Report& Report::addBool(const char* key, bool value) {
  if (taken_) cursor_ = koerr::addBool(start(), key, value, status_);
  return *this;
}

Report& Report::addRaw(const char* key, const char* json) {
  if (taken_) cursor_ = addRawValue(start(), key, json, status_);
  return *this;
}

Report& Report::addRaw(const char* key, const std::string& json) { return addRaw(key, json.c_str()); }

Report& Report::nest(Status& caught) {
  if (!taken_) return *this;
  nestError(status_, caught);
  // Nesting may move the buffer; later members go at the root.
  started_ = true;
  cursor_ = beginJson(status_, 2);
  openObjects_ = 0;
  return *this;
}

Error::Error(const ErrorConstant& constant, const char* file, int32_t line, const char* channel)
    : Error(constant.code, constant.name, file, line, channel) {}

Error::Error(int32_t code, const char* constantName, const char* file, int32_t line,
             const char* channel)
    : report_(exception_.status(), code, constantName, file, line) {
  if (channel != nullptr) report_.open(channel);
}

void Error::raise() { throw exception_; }

Exception Error::take() { return exception_; }

}  // namespace koerr
