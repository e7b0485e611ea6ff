// Human-readable explanations of status codes, read from the explanation
// files installed under the shared-data directory ("errors/<language>/*.txt"
// or "*.err"). Files are read on every lookup; nothing is cached. Failures
// come back in the caller's error record, never as exceptions, and a failed
// or fruitless lookup leaves the text empty.
//
// Thread-safety: reentrant; no shared state.
#ifndef QUILLON_KOXLATOR_ERRORS_PARSER_H_
#define QUILLON_KOXLATOR_ERRORS_PARSER_H_

#include <cstdint>
#include <string>

#include "error_record/status.h"

namespace koxlator {

// Index 0 is the default language.
inline constexpr uint32_t kEnglish = 0;

// The subdirectory name of language `language` ("English", "French",
// "German", "Japanese", "Korean", "ChineseS"); "" with -52005
// "koapalerr_invalidParameter" in `status` for an index outside 0..5.
std::string languageName(uint32_t language, koerr::Status& status);

// Sets `directory` to the shared-data directory followed by "/errors".
void errorsDirectory(std::string& directory, koerr::Status& status);

// Clears `text`, then fills it with the explanation of `code`: from the
// language's subdirectory of `directory` first and, only when that gives
// nothing and no error, from `directory` itself. Does nothing more when
// `status` already holds an error. A missing language subdirectory is an
// error, not a reason to fall back.
void lookupExplanation(const std::string& directory, int32_t code, uint32_t language,
                       std::string& text, koerr::Status& status);

// Reads the explanation files of `directory` in listing order until one
// explains `code` or one fails; `text` stays empty when none explains it.
void searchDirectory(const std::string& directory, int32_t code, std::string& text,
                     koerr::Status& status);

// Clears `text`, then fills it with the explanation of `code` in the file
// `path`, without trailing line ends. Files of another kind (wrong header or
// document tag) are skipped quietly; a file that cannot be opened or is
// malformed sets -52006 "koapalerr_resourceNotFound" in `status` and leaves
// `text` empty.
void readExplanationFile(const std::string& path, int32_t code, std::string& text,
                         koerr::Status& status);

}  // namespace koxlator

#endif  // QUILLON_KOXLATOR_ERRORS_PARSER_H_
