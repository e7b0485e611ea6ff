// Notices edits of the scenario file without costing the calls anything: a
// thread sleeps on an inotify watch of the file's directory (editors often
// replace a file by renaming a new one over it) and runs a callback when the
// file was replaced, removed or touched, or when a writer closed it. A file
// being written in place is left alone from its first change until its
// writer closes it, so the callback never sees it half-written. After
// reading, the callback asks whether the file changed meanwhile, and whether
// any program has it open: the kernel reports a writer's opening before its
// truncation takes effect, but the truncation itself a moment after, so a
// file read empty or cut short while someone has it open may be a write
// just begun.
//
// Thread-safety: the callback runs on the watch's own thread.
#ifndef KOPDM_CLIENTAPI_SCENARIO_WATCH_H_
#define KOPDM_CLIENTAPI_SCENARIO_WATCH_H_

#include <cstdint>
#include <functional>
#include <string>
#include <thread>

namespace kopdmsim {

class ScenarioWatch {
 public:
  // What the callback may ask after reading the file.
  struct Settling {
    // True when nothing changed the file since the callback began.
    std::function<bool()> unchanged;
    // True when no program has the file open (the callback's own reads,
    // once closed, aside).
    std::function<bool()> closedEverywhere;

    // Whether what the callback read may be served: nothing changed the file
    // meanwhile (nor, by `sameAsRead`, anything the callback looks at
    // itself), and a file that did not read well has stayed closed and
    // unchanged for a moment, since it may be a write just begun.
    bool keep(bool readWell, const std::function<bool()>& sameAsRead) const;
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
  void run();
  // Reads every queued event; true when any changed the file.
  bool drainEvents();
  // Takes one event of the file into the flags; true when it changed it.
  bool apply(uint32_t mask);


  std::string name_;
  OnChange onChange_;
  int inotifyFd_ = -1;
  int stopFd_ = -1;
  std::string problem_;
  // Used by the watch's thread only.
  bool writing_ = false;  // changed in place and not yet closed by its writer
  bool pending_ = false;  // to be read again once settled
  long opened_ = 0;       // openings of the file not yet closed
  std::thread thread_;
};

}  // namespace kopdmsim

#endif  // KOPDM_CLIENTAPI_SCENARIO_WATCH_H_
