// Ctrl-C as a wish to stop: long work looks now and then, keeps what it has, and ends in order.
#pragma once

namespace sm::cli {

// While it lives, the first SIGINT is only noted; a second one ends the process as ever.
class InterruptWatch {
 public:
  InterruptWatch();
  ~InterruptWatch();
  InterruptWatch(const InterruptWatch&) = delete;
  InterruptWatch& operator=(const InterruptWatch&) = delete;

  static bool interrupted();
};

}  // namespace sm::cli
