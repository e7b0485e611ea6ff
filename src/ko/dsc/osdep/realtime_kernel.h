// Whether the running kernel is a real-time one, read from the kernel's flag
// file. The mutexes ask this to choose priority inheritance.
//
// Thread-safety: isRealtime() may be called from any number of threads; the
// file is read at most once per object.
#ifndef QUILLON_KO_DSC_OSDEP_REALTIME_KERNEL_H_
#define QUILLON_KO_DSC_OSDEP_REALTIME_KERNEL_H_

#include <mutex>
#include <string>

namespace ko::dsc::osdep {

class RealtimeKernel {
 public:
  // Reads `flagPath` on first demand.
  explicit RealtimeKernel(std::string flagPath);
  RealtimeKernel(const RealtimeKernel&) = delete;
  RealtimeKernel& operator=(const RealtimeKernel&) = delete;

  // The one object over "/sys/kernel/realtime" that the whole process shares.
  static const RealtimeKernel& system();

  // True exactly when the flag file opened, one byte was read and it is '1';
  // the first answer is kept for the object's lifetime.
  bool isRealtime() const;

 private:
  std::string flagPath_;
  mutable std::once_flag once_;
  mutable bool realtime_ = false;
};

}  // namespace ko::dsc::osdep

#endif  // QUILLON_KO_DSC_OSDEP_REALTIME_KERNEL_H_
