// Memory that is in use before a run is timed.
//
// A virtual machine may give memory that nobody uses back to its host within a second, and get it again, page by page,
// only when it is touched: at seconds a gigabyte, which would fall on whoever takes most of its memory anew.
#pragma once

namespace sm::bench {

// "VmHWM" (the peak) or "VmRSS" of the process in bytes; 0 when the system does not say.
double resident(const char* what);
// The peak is what is in use now from here on. False when the system does not allow it.
bool forget_peak();

class WarmMemory {
 public:
  // Touches as much free memory as a run has needed so far.
  void before_run();
  void after_run();

 private:
  double begin_ = 0.0;
  double most_ = 0.0;
};

}  // namespace sm::bench
