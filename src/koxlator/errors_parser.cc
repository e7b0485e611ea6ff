#include "koxlator/errors_parser.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <new>

#include "error_record/constants.h"
#include "error_record/error.h"
#include "ko/dsc/ascii.h"
#include "kosysq/stdpath_util.h"
#include "koxlator/directory.h"
#include "koxlator/line_file.h"

namespace koxlator {
namespace {

constexpr const char* kFile = "koxlator/gxErrorsParser";

constexpr const char* kLanguages[] = {"English",  "French", "German",
                                      "Japanese", "Korean", "ChineseS"};
constexpr uint32_t kLanguageCount = sizeof kLanguages / sizeof kLanguages[0];

// A tag counts only at the very start of a line, compared without regard to
// case over exactly the length given. The header's length stops before its
// closing '>' so that an encoding declaration may follow the version.
struct Tag {
  const char* text;
  size_t length;
};
constexpr Tag kHeader{"<?xml version=\"1.0\"", 19};
constexpr Tag kDocumentStart{"<kodocument>", 12};
constexpr Tag kDocumentEnd{"</kodocument>", 13};
constexpr Tag kEntryStart{"<koerror code=\"", 15};
constexpr Tag kEntryEnd{"</koerror>", 10};
constexpr Tag kCommentStart{"<kocomment>", 11};
constexpr Tag kCommentEnd{"</kocomment>", 12};

bool startsWith(const char* line, const Tag& tag) {
  return ko::dsc::ascii::equalsIgnoringCase(line, tag.text, tag.length);
}

// Only a line whose very first byte is NUL is an unidentified heading; every
// other unknown line is skipped. The narrowness is on purpose: files may
// carry free text between entries.
bool isUnidentifiedHeading(const char* line) { return line[0] == '\0'; }

enum class Outcome { kNoMatch, kMatched, kFailed };

void reportMalformed(koerr::Status& status, int line, const char* debug) {
  koerr::Report(status, koerr::koapalerr_resourceNotFound, kFile, line)
      .open("koxlator_debug")
      .add("debug", debug)
      .close();
}

void reportMemoryFull(koerr::Status& status) {
  koerr::Report(status, koerr::koapalerr_memoryFull, "kohtl/err/Allocator", 32);
}

// Appends without giving up the text already gathered when memory runs out.
void appendLine(std::string& text, const char* line, koerr::Status& status) {
  try {
    text.append(line);
  } catch (const std::exception&) {  // bad_alloc or length_error
    reportMemoryFull(status);
  }
}

// Reads the lines of one entry up to its end tag, gathering them when
// `wanted`. False (and reported) when the file ends first.
bool readEntryBody(LineFile& file, bool wanted, std::string& text, koerr::Status& status) {
  for (const char* line = file.readLine(); line != nullptr; line = file.readLine()) {
    if (startsWith(line, kEntryEnd)) {
      return true;
    }
    if (wanted) {
      appendLine(text, line, status);
    }
  }
  reportMalformed(status, 208,
                  "Bad explanation file. Could not find the end of the status code definition !");
  return false;
}

// False when the file ends inside the comment.
bool skipComment(LineFile& file) {
  for (const char* line = file.readLine(); line != nullptr; line = file.readLine()) {
    if (startsWith(line, kCommentEnd)) {
      return true;
    }
  }
  return false;
}

// Walks the document body, starting with `line`, until the entry of `code`
// has been gathered, the document ends, or the file proves malformed.
Outcome scanEntries(LineFile& file, const char* line, int32_t code, std::string& text,
                    koerr::Status& status) {
  for (; line != nullptr; line = file.readLine()) {
    if (startsWith(line, kDocumentEnd)) {
      return Outcome::kNoMatch;
    }
    if (startsWith(line, kEntryStart)) {
      int entryCode = 0;
      const int converted = std::sscanf(line + kEntryStart.length, "%i", &entryCode);
      if (converted != 1) {
        koerr::Report(status, koerr::koapalerr_resourceNotFound, kFile, 176)
            .open("koxlator_debug")
            .add("debug", "Could not successfully read the status data!")
            .addInt("sscanf", converted)
            .close();
        return Outcome::kFailed;
      }
      const bool wanted = entryCode == code;
      if (!readEntryBody(file, wanted, text, status)) {
        return Outcome::kFailed;
      }
      if (wanted) {
        return Outcome::kMatched;
      }
    } else if (startsWith(line, kCommentStart)) {
      if (!skipComment(file)) {
        return Outcome::kNoMatch;
      }
    } else if (isUnidentifiedHeading(line)) {
      reportMalformed(status, 229, "Bad explanation file. Unidentified section heading !");
      return Outcome::kFailed;
    }
  }
  return Outcome::kNoMatch;
}

void trimLineEnds(std::string& text) {
  const size_t last = text.find_last_not_of("\r\n");
  text.erase(last == std::string::npos ? 0 : last + 1);
}

bool hasExplanationExtension(const char* name) {
  const char* dot = std::strrchr(name, '.');
  return dot != nullptr && (std::strcmp(dot + 1, "txt") == 0 || std::strcmp(dot + 1, "err") == 0);
}

void reportFileInfoFailure(koerr::Status& status, int error, const std::string& path) {
  koerr::Report report(status, koerr::koapalerr_resourceNotFound, kFile, 96);
  addErrnoDetails(report, error);
  report.open("koxlator_debug").add("koxlator", "get file info failed").add("path", path).close();
}

}  // namespace

std::string languageName(uint32_t language, koerr::Status& status) {
  if (language >= kLanguageCount) {
    koerr::Report(status, koerr::koapalerr_invalidParameter, kFile, 43)
        .open("koxlator_debug")
        .add("gxerrorsparser", "invalid language")
        .addUInt("lang", language)
        .close();
    return std::string();
  }
  return kLanguages[language];
}

void errorsDirectory(std::string& directory, koerr::Status& status) {
  kosysq::sharedDataDirectory(directory, status);
  directory += "/errors";
}

void lookupExplanation(const std::string& directory, int32_t code, uint32_t language,
                       std::string& text, koerr::Status& status) {
  text.clear();
  if (status.code < 0) {
    return;
  }
  const std::string subdirectory = languageName(language, status);
  if (status.code < 0) {
    return;
  }
  searchDirectory(directory + "/" + subdirectory, code, text, status);
  if (status.code >= 0 && text.empty()) {
    searchDirectory(directory, code, text, status);
  }
}

void searchDirectory(const std::string& directory, int32_t code, std::string& text,
                     koerr::Status& status) {
  std::unique_ptr<Directory> listing = Directory::open(directory, status);
  if (!listing) {
    return;
  }
  std::string path;
  while (const char* name = listing->next()) {
    if (std::strcmp(name, ".") == 0 || std::strcmp(name, "..") == 0) {
      continue;
    }
    path.assign(directory).append("/").append(name);
    bool regular = false;
    int error = ENAMETOOLONG;
    if (std::strlen(name) >= kMaxNameLength || path.size() >= kMaxPathLength ||
        !queryRegularFile(path, regular, error)) {
      reportFileInfoFailure(status, error, path);
      return;
    }
    if (!regular || !hasExplanationExtension(name)) {
      continue;
    }
    readExplanationFile(path, code, text, status);
    if (status.code < 0 || !text.empty()) {
      return;
    }
  }
}

void readExplanationFile(const std::string& path, int32_t code, std::string& text,
                         koerr::Status& status) {
  text.clear();
  if (status.code < 0) {
    return;
  }
  LineFile file;
  if (!file.open(path)) {
    koerr::Report(status, koerr::koapalerr_resourceNotFound, kFile, 148)
        .open("koxlator_debug")
        .add("debug", "Could not open status explanations file")
        .add("path", path)
        .close();
    return;
  }
  // Files of another kind are skipped without a word.
  const char* line = file.readLine();
  if (line == nullptr || !startsWith(line, kHeader)) {
    return;
  }
  line = file.readLine();
  if (line == nullptr || !startsWith(line, kDocumentStart)) {
    return;
  }
  if (scanEntries(file, file.readLine(), code, text, status) == Outcome::kMatched) {
    trimLineEnds(text);
  }
  if (status.code < 0) {
    text.clear();
  }
}

}  // namespace koxlator
