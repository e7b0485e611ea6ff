#include "quillon/errors.h"

#include <cstdlib>
#include <cstring>
#include <exception>
#include <string_view>

#include "error_record/constants.h"
#include "error_record/error.h"
#include "error_record/exception.h"
#include "ko/dsc/exception.h"
#include "koxlator/errors_parser.h"

namespace quillon {
namespace {

constexpr uint32_t kEnvelopeStartSize = 256;
// Far below where the record writer stops growing its buffer.
constexpr size_t kPlainResultLimit = size_t{1} << 30;

// The lookup clears its output before searching, so the preset survives only
// a lookup that never ran; whether found or not, the lookup's own troubles
// are no concern of the answer.
std::string errorText(int32_t code) {
  if (code == 0) {
    return std::string();
  }
  std::string text = "Unknown Error";
  koerr::Status lookupStatus;
  std::string directory;
  koxlator::errorsDirectory(directory, lookupStatus);
  koxlator::lookupExplanation(directory, code, koxlator::kEnglish, text, lookupStatus);
  koerr::releaseText(lookupStatus);
  return text;
}

// An envelope starts small and grows by doubling through the record's
// reallocate function, the way every record does.
koerr::Status envelopeBuffer() {
  koerr::Status envelope;
  char* buffer = static_cast<char*>(std::calloc(kEnvelopeStartSize, 1));
  if (buffer != nullptr) {
    std::memcpy(buffer, "{}", 2);
    buffer[kEnvelopeStartSize - 1] = koerr::kGuard;
    envelope.capacity = kEnvelopeStartSize;
    envelope.json = buffer;
  }
  return envelope;
}

// A success without details is nearly every answer. Its envelope is the
// record writer's text for it, written in one pass instead of measuring and
// shifting the text at each member. A result with a NUL byte goes the long
// way, which cuts it there.
bool isPlainSuccess(const koerr::Status& status, const std::string& result) {
  return status.code == 0 && status.json == nullptr &&
         result.find('\0') == std::string::npos && result.size() < kPlainResultLimit;
}

constexpr std::string_view kSuccessError = R"({"error":{"success":true,"errorCode":0,"errorText":""})";
constexpr std::string_view kResultMember = R"(,"result":)";
constexpr std::string_view kSuccessWithResult =
    R"({"error":{"success":true,"errorCode":0,"errorText":""},"result":)";
static_assert(kSuccessWithResult.size() == kSuccessError.size() + kResultMember.size());
static_assert(kEnvelopeRoom == kSuccessWithResult.size() + 1);

std::string plainSuccessEnvelope(const std::string& result) {
  std::string answer;
  answer.reserve(kSuccessError.size() + kResultMember.size() + result.size() + 1);
  answer += kSuccessError;
  if (!result.empty()) {
    answer += kResultMember;
    answer += result;
  }
  answer += '}';
  return answer;
}

// The result's bytes move up in place; only a result without the spare room
// for the envelope costs an allocation here.
std::string plainSuccessEnvelope(std::string&& result) {
  if (result.empty()) return plainSuccessEnvelope(result);
  std::string answer = std::move(result);
  answer.insert(0, kSuccessWithResult.data(), kSuccessWithResult.size());
  answer += '}';
  return answer;
}

}  // namespace


std::string buildEnvelope(const koerr::Status& status, std::string&& result) {
  if (isPlainSuccess(status, result)) return plainSuccessEnvelope(std::move(result));
  return buildEnvelope(status, static_cast<const std::string&>(result));
}

std::string buildEnvelope(const koerr::Status& status, const std::string& result) {
  if (isPlainSuccess(status, result)) return plainSuccessEnvelope(result);
  const std::string text = errorText(status.code);
  koerr::Status envelope = envelopeBuffer();
  char* cursor = koerr::beginJson(envelope, 2);
  cursor = koerr::addObject(cursor, "error", envelope);
  cursor = koerr::addBool(cursor, "success", status.code == 0, envelope);
  cursor = koerr::addInt(cursor, "errorCode", status.code, envelope);
  cursor = koerr::addStdString(cursor, "errorText", text, envelope);
  if (status.json != nullptr) {
    cursor = koerr::addString(cursor, "errorInfo", status.json, envelope);
  }
  cursor = koerr::leaveContainer(cursor);
  if (!result.empty()) {
    cursor = koerr::addRawValue(cursor, "result", result.c_str(), envelope);
  }
  std::string answer = envelope.json != nullptr ? envelope.json : "";
  koerr::releaseText(envelope);
  return answer;
}

void translateCurrentException(koerr::Status& status) {
  try {
    throw;
  } catch (const koerr::ExceptionBase& caught) {
    koerr::copyStatusKeepSource(status, caught.status());
  } catch (const ko::dsc::exception::Exception& caught) {
    koerr::Report(status, caught.code()).location(caught.file(), caught.line());
  } catch (const std::exception& caught) {
    koerr::Report(status, koerr::kQuillonInternalSoftwareError, "quillon/errors", 50)
        .open("quillon_debug")
        .add("std::exception", caught.what())
        .close();
  }
}

}  // namespace quillon
