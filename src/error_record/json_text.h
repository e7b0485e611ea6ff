// JSON string escaping, by the same rule the record writers use, for code
// that renders its own JSON documents (the platform stand-ins).
//
// Thread-safety: pure function over caller-owned text.
#ifndef QUILLON_ERROR_RECORD_JSON_TEXT_H_
#define QUILLON_ERROR_RECORD_JSON_TEXT_H_

#include <string>
#include <string_view>

namespace koerr {

// Appends `text` escaped for the inside of a JSON string (no quotes added):
// quote, backslash and the short control escapes as \" \\ \b \f \n \r \t,
// other control bytes and 0x7f as \u00XX, every other byte unchanged.
void appendJsonEscaped(std::string& out, std::string_view text);

}  // namespace koerr

#endif  // QUILLON_ERROR_RECORD_JSON_TEXT_H_
