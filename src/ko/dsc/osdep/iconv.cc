#include "ko/dsc/osdep/iconv.h"

#include <iconv.h>
#include <langinfo.h>
#include <locale.h>

#include <cerrno>
#include <cstring>

#include "ko/dsc/exception.h"

namespace ko::dsc::osdep {
namespace {

constexpr const char* kFile = "ko/dsc/osdep/IConv";
constexpr const char* kWide = "WCHAR_T";

class Descriptor {
 public:
  Descriptor(const char* to, const char* from) : cd_(iconv_open(to, from)) {}
  ~Descriptor() {
    if (valid()) {
      iconv_close(cd_);
    }
  }
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;
  bool valid() const { return cd_ != reinterpret_cast<iconv_t>(-1); }
  iconv_t get() const { return cd_; }

 private:
  iconv_t cd_;
};

bool convertible(const std::string& encoding) {
  return Descriptor(encoding.c_str(), kWide).valid() && Descriptor(kWide, encoding.c_str()).valid();
}

// Converts `size` bytes at `input`; the output grows until it holds all.
// `unitSize` turns the byte offset of a failure into a character offset.
std::string convert(const char* to, const char* from, const char* input, size_t size,
                    size_t unitSize) {
  const Descriptor cd(to, from);
  if (!cd.valid()) {
    throw exception::InvalidLocale(kFile, __LINE__,
                                   std::string("iconv_open: no conversion from ") + from +
                                       " to " + to + ": " + std::strerror(errno));
  }
  std::string output(size + 16, '\0');
  char* in = const_cast<char*>(input);  // iconv's interface is not const-correct
  size_t inLeft = size;
  size_t produced = 0;
  bool flushing = false;  // after the input, once more to close any shift state
  for (;;) {
    char* out = output.data() + produced;
    size_t outLeft = output.size() - produced;
    const size_t rc = flushing ? iconv(cd.get(), nullptr, nullptr, &out, &outLeft)
                               : iconv(cd.get(), &in, &inLeft, &out, &outLeft);
    produced = output.size() - outLeft;
    if (rc != static_cast<size_t>(-1)) {
      if (flushing) {
        break;
      }
      flushing = true;
      continue;
    }
    if (errno == E2BIG) {
      output.resize(output.size() * 2);
      continue;
    }
    const size_t offset = static_cast<size_t>(in - input) / unitSize;
    throw exception::InvalidSequence(
        kFile, __LINE__,
        std::string(errno == EINVAL ? "incomplete" : "unconvertible") + " character at offset " +
            std::to_string(offset) + " converting " + from + " to " + to);
  }
  output.resize(produced);
  return output;
}

}  // namespace

IConv::IConv() : narrowEncoding_(systemEncoding()) {}

IConv::IConv(std::string narrowEncoding) : narrowEncoding_(std::move(narrowEncoding)) {
  if (!convertible(narrowEncoding_)) {
    throw exception::InvalidLocale(kFile, __LINE__,
                                   "Invalid locale: no conversion between wide text and '" +
                                       narrowEncoding_ + "'");
  }
}

std::string IConv::systemEncoding() {
  // The environment's locale, read without touching the process's global
  // locale, which other code may rely on.
  const locale_t environment = newlocale(LC_CTYPE_MASK, "", static_cast<locale_t>(0));
  if (environment == static_cast<locale_t>(0)) {
    return kFallbackEncoding;
  }
  std::string codeset = nl_langinfo_l(CODESET, environment);
  freelocale(environment);
  if (codeset.empty() || !convertible(codeset)) {
    return kFallbackEncoding;
  }
  return codeset;
}

std::string IConv::narrow(const std::wstring& wide) const {
  return convert(narrowEncoding_.c_str(), kWide, reinterpret_cast<const char*>(wide.data()),
                 wide.size() * sizeof(wchar_t), sizeof(wchar_t));
}

std::wstring IConv::widen(const std::string& narrow) const {
  const std::string bytes = convert(kWide, narrowEncoding_.c_str(), narrow.data(), narrow.size(), 1);
  std::wstring wide(bytes.size() / sizeof(wchar_t), L'\0');
  std::memcpy(wide.data(), bytes.data(), wide.size() * sizeof(wchar_t));
  return wide;
}

}  // namespace ko::dsc::osdep
