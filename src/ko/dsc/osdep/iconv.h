// Conversion between wide-character text (wchar_t) and a narrow encoding,
// by default the system's: the character set of the environment's locale, or
// "US-ASCII" when that cannot be determined or converted to.
//
// Thread-safety: an IConv is immutable; every conversion opens its own
// conversion state, so one object may serve any number of threads.
#ifndef QUILLON_KO_DSC_OSDEP_ICONV_H_
#define QUILLON_KO_DSC_OSDEP_ICONV_H_

#include <string>

namespace ko::dsc::osdep {

class IConv {
 public:
  static constexpr const char* kFallbackEncoding = "US-ASCII";

  // Uses systemEncoding().
  IConv();
  // Raises exception::InvalidLocale when the platform converts neither way
  // between wide text and `narrowEncoding`.
  explicit IConv(std::string narrowEncoding);

  // The character set named by the environment's LC_CTYPE when it can be
  // converted to, else kFallbackEncoding.
  static std::string systemEncoding();

  const std::string& narrowEncoding() const noexcept { return narrowEncoding_; }

  // Each raises exception::InvalidSequence, naming the offset of the first
  // character it could not convert, when the text holds a character the
  // other side cannot represent or an incomplete or invalid sequence.
  std::string narrow(const std::wstring& wide) const;
  std::wstring widen(const std::string& narrow) const;

 private:
  std::string narrowEncoding_;
};

}  // namespace ko::dsc::osdep

#endif  // QUILLON_KO_DSC_OSDEP_ICONV_H_
