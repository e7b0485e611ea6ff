// The foundation exception family: every member carries a numeric status code
// (the code an error record takes when the exception is translated), the
// source file tail and line that raised it, and a text.
//
// Thread-safety: values; copies share their immutable text, so copying never
// allocates and never throws.
#ifndef QUILLON_KO_DSC_EXCEPTION_H_
#define QUILLON_KO_DSC_EXCEPTION_H_

#include <cstdint>
#include <exception>
#include <memory>
#include <string>

namespace ko::dsc::exception {

// Codes the members take unless the raiser gives its own.
inline constexpr int32_t kUnspecifiedCode = -411200;     // internal software error
inline constexpr int32_t kInvalidParameterCode = -52005;
inline constexpr int32_t kMemoryFullCode = -52000;
inline constexpr int32_t kNotFoundCode = -52006;
inline constexpr int32_t kNameCollisionCode = -52007;
inline constexpr int32_t kOsFaultCode = -52008;

// The texts reported by members raised without a text of their own.
inline constexpr const char* kUnspecifiedText = "unspecified exception";
inline constexpr const char* kOutOfRangeText = "Out of range";
inline constexpr const char* kInvalidLocaleText = "Invalid locale";

// `file` must outlive the exception (a string literal such as "ko/dsc/SafeInteger");
// an empty `text` selects the member's default text.
class Exception : public std::exception {
 public:
  Exception() : Exception(kUnspecifiedCode, "", 0, {}) {}
  Exception(const char* file, int32_t line, std::string text = {})
      : Exception(kUnspecifiedCode, file, line, std::move(text)) {}
  Exception(int32_t code, const char* file, int32_t line, std::string text)
      : Exception(code, file, line, std::move(text), kUnspecifiedText) {}

  int32_t code() const noexcept { return code_; }
  const char* file() const noexcept { return file_; }
  int32_t line() const noexcept { return line_; }
  const char* what() const noexcept override { return text_->c_str(); }

 protected:
  Exception(int32_t code, const char* file, int32_t line, std::string text, const char* defaultText)
      : code_(code),
        file_(file != nullptr ? file : ""),
        line_(line),
        text_(std::make_shared<const std::string>(text.empty() ? std::string(defaultText)
                                                               : std::move(text))) {}

 private:
  int32_t code_;
  const char* file_;
  int32_t line_;
  std::shared_ptr<const std::string> text_;
};

// Each member: default construction, (file, line[, text]) with the member's
// own code, and (code, file, line, text) for raisers that know better.
#define KO_DSC_EXCEPTION_MEMBER(Name, Base, kCode, kText)                                  \
  class Name : public Base {                                                               \
   public:                                                                                 \
    static constexpr int32_t kDefaultCode = kCode;                                         \
    Name() : Name(kCode, "", 0, {}) {}                                                     \
    Name(const char* file, int32_t line, std::string text = {})                            \
        : Name(kCode, file, line, std::move(text)) {}                                      \
    Name(int32_t code, const char* file, int32_t line, std::string text)                   \
        : Base(code, file, line, std::move(text), kText) {}                                \
                                                                                           \
   protected:                                                                              \
    Name(int32_t code, const char* file, int32_t line, std::string text, const char* dflt) \
        : Base(code, file, line, std::move(text), dflt) {}                                 \
  }

KO_DSC_EXCEPTION_MEMBER(AccessDenied, Exception, kOsFaultCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(BoundExceeded, Exception, kInvalidParameterCode, kUnspecifiedText);
// The "2" members are refinements of their namesakes: a handler of the first
// catches both.
KO_DSC_EXCEPTION_MEMBER(BoundExceeded2, BoundExceeded, kInvalidParameterCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(BufferOverflow, Exception, kMemoryFullCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(DeserializationError, Exception, kInvalidParameterCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(FileAlreadyExists, Exception, kNameCollisionCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(FileReadFailed, Exception, kOsFaultCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(FileWriteFailed, Exception, kOsFaultCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(InvalidArgument, Exception, kInvalidParameterCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(InvalidArgument2, InvalidArgument, kInvalidParameterCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(InvalidLocale, Exception, kInvalidParameterCode, kInvalidLocaleText);
KO_DSC_EXCEPTION_MEMBER(InvalidOperation, Exception, kUnspecifiedCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(InvalidSequence, Exception, kInvalidParameterCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(NonexistentException, Exception, kNotFoundCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(ObjectAlreadyExists, Exception, kNameCollisionCode, kUnspecifiedText);
KO_DSC_EXCEPTION_MEMBER(OutOfRange, Exception, kInvalidParameterCode, kOutOfRangeText);
KO_DSC_EXCEPTION_MEMBER(OutOfRange2, OutOfRange, kInvalidParameterCode, kOutOfRangeText);

#undef KO_DSC_EXCEPTION_MEMBER

}  // namespace ko::dsc::exception

#endif  // QUILLON_KO_DSC_EXCEPTION_H_
