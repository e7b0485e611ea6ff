// Notices edits of the scenario file without costing the calls anything: a
// thread sleeps on an inotify watch of the file's directory (editors often
// replace a file by renaming a new one over it) and runs a callback when the
// file was replaced, removed or touched, or when a writer closed it. A file
// being written in place is left alone from its first change until its
// writer closes it, so the callback never sees it half-written. After
// reading, the callback asks whether what it read may be served: not when
// the file changed meanwhile; and a file that did not read well, unless it
// was renamed into place whole, only once it has stayed so for a moment with
// nobody holding it open (the kernel reports a writer's opening before its
// truncation takes effect, and the truncation itself a moment after, so a
// file read empty or cut short while someone has it open may be a write
// just begun). A verdict held back that way is sought again when the last
// program closes the file, and in any case within a second.
//
// Thread-safety: the callback runs on the watch's own thread.
#ifndef KOPDM_CLIENTAPI_SCENARIO_WATCH_H_
#define KOPDM_CLIENTAPI_SCENARIO_WATCH_H_

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <thread>

namespace kopdmsim {

class ScenarioWatch {
 public:
  // What the callback may ask after reading the file.
  class Settling {
   public:
    explicit Settling(ScenarioWatch& watch) : watch_(watch) {}
    // Whether what the callback read may be served: nothing changed the
    // file meanwhile (nor, by `sameAsRead`, anything the callback looks at
    // itself), and a file that did not read well has settled (see above).
    // May sleep a moment.
    bool keep(bool readWell, const std::function<bool()>& sameAsRead) const {
      return watch_.settle(readWell, sameAsRead);
    }

   private:
    ScenarioWatch& watch_;
  };
  using OnChange = std::function<void(const Settling&)>;

  ScenarioWatch(const std::string& path, OnChange onChange);
  ScenarioWatch(const ScenarioWatch&) = delete;
  ScenarioWatch& operator=(const ScenarioWatch&) = delete;
  // Stops and joins the thread.
  ~ScenarioWatch();

  // False when the kernel refused the watch (callers then look at the file
  // themselves); `problem` says why.
  bool active() const { return thread_.joinable(); }
  const std::string& problem() const { return problem_; }

 private:
  using Clock = std::chrono::steady_clock;

  void run();
  // Milliseconds until a held-back verdict is sought again; -1: none is.
  int msUntilRetry() const;
  bool settle(bool readWell, const std::function<bool()>& sameAsRead);
  // True when nothing changed the file since the callback began.
  bool unchanged();
  // A read that may not be served while someone has the file open.
  void holdBack();
  // Reads every queued event; true when any changed the file.
  bool drainEvents();
  // Takes one event of the file into the flags; true when it changed it.
  bool apply(uint32_t mask);
  // Closing the last opening ends a write, or what held a verdict back.
  bool closed();

  std::string name_;
  OnChange onChange_;
  int inotifyFd_ = -1;
  int stopFd_ = -1;
  std::string problem_;
  // Used by the watch's thread only.
  bool writing_ = false;   // changed in place and not yet closed by its writer
  bool pending_ = false;   // to be read again once settled
  bool replaced_ = false;  // renamed into place whole, unchanged since
  long opened_ = 0;        // openings of the file not yet closed
  bool heldBack_ = false;  // a verdict waits for the file's last close
  std::optional<Clock::time_point> heldSince_;  // unchanged and held open since
  std::optional<Clock::time_point> retryAt_;    // when a held-back verdict is sought
  std::thread thread_;
};

}  // namespace kopdmsim

#endif  // KOPDM_CLIENTAPI_SCENARIO_WATCH_H_
