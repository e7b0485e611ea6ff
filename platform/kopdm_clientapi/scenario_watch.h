// Notices edits of the scenario file without costing the calls anything: a
// thread sleeps on an inotify watch of the file's directory (editors often
// replace a file by renaming a new one over it) and runs a callback when the
// file was written, replaced, removed or touched.
//
// Thread-safety: the callback runs on the watch's own thread.
#ifndef KOPDM_CLIENTAPI_SCENARIO_WATCH_H_
#define KOPDM_CLIENTAPI_SCENARIO_WATCH_H_

#include <functional>
#include <string>
#include <thread>

namespace kopdmsim {

class ScenarioWatch {
 public:
  using OnChange = std::function<void()>;

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
  bool concernsFile(const char* events, long length) const;

  std::string name_;
  OnChange onChange_;
  int inotifyFd_ = -1;
  int stopFd_ = -1;
  std::string problem_;
  std::thread thread_;
};

}  // namespace kopdmsim

#endif  // KOPDM_CLIENTAPI_SCENARIO_WATCH_H_
