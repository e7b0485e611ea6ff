// Where a device keeps its last accepted coherency requirements across
// restarts and crashes: one state file per device, named after its URI, in
// the state directory (KOSDLIB_STATE_DIRECTORY, else the service manager's
// STATE_DIRECTORY; neither set: nothing is kept).
//
// Thread-safety: none; the device serialises saves, and loads happen while
// it is being created.
#ifndef KOSDLIB_SRC_REQUIREMENTS_STORE_H_
#define KOSDLIB_SRC_REQUIREMENTS_STORE_H_

#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "requirements.h"
#include "state_file.h"

namespace kosdlib {

// The state directory the environment names, or "" when none.
std::string stateDirectoryFromEnvironment();

class RequirementsStore {
 public:
  using Log = std::function<void(const std::string& line)>;

  // Null with `*problem` set when the URI cannot name a file.
  static std::unique_ptr<RequirementsStore> open(std::shared_ptr<FileSystemInterface> files,
                                                 const std::string& directory,
                                                 const std::string& uri, std::string* problem);

  // The stored requirements, or none. A file that cannot be read or parsed
  // is moved aside and `log` is told both names; if it cannot be moved, later
  // saves fail rather than overwrite it.
  std::optional<Requirements> load(const Log& log);

  // Makes `requirements` (none: cleared) the stored ones, durably.
  [[nodiscard]] bool save(const Requirements* requirements, FileFailure* failure);

  const std::string& path() const { return file_.path(); }

 private:
  RequirementsStore(std::shared_ptr<FileSystemInterface> files, std::string path);

  StateFile file_;
  std::optional<FileFailure> blocked_;  // why the file may not be replaced
};

}  // namespace kosdlib

#endif  // KOSDLIB_SRC_REQUIREMENTS_STORE_H_
