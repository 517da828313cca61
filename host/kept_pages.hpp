// Pages of large blocks: taken from the system, kept for a while when a block is freed, and handed out again.
//
// The first touch of a page costs a fault, about a microsecond for each 4 KiB: more than many a job does with them. So
// freed pages of moderate size wait for the next request, as in allocators of C libraries.
#pragma once

#include <cstdint>

namespace sm::host {

struct Pages {
  void* start;  // null: none
  std::uint64_t span;
};

class KeptPages {
 public:
  static constexpr std::uint64_t kPage = 4096;
  static constexpr std::uint32_t kMostSpans = 64;
  static constexpr std::uint64_t kUsualLimit = std::uint64_t{64} << 20;
  // Beyond this many zeros fresh pages are the better ones: much of what is asked for may never be touched.
  static constexpr std::uint64_t kMostZeroed = (std::uint64_t{4} << 20) + kPage;

  // Bytes of blocks that are kept from now on, without the page in front of each. Blocks of more than half of that go
  // back to the system at once.
  void set_limit(std::uint64_t bytes);
  // At least `span` bytes, of zeros if so asked. Huge pages begin with the second page, if there are any.
  Pages take(std::uint64_t span, bool zero);
  // Keeps them, or gives them or older ones back to the system.
  void give(Pages pages);
  void release(Pages pages);
  // False when there was nothing to give back.
  bool trim();

 private:
  Pages take_kept(std::uint64_t span);
  [[nodiscard]] std::uint64_t most() const { return limit_ + kMostSpans * kPage; }
  void forget(std::uint32_t place);
  void drop_oldest();

  Pages kept_[kMostSpans];  // the oldest first
  std::uint32_t count_;
  std::uint64_t bytes_;
  std::uint64_t limit_;
};

}  // namespace sm::host
