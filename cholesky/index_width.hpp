// How wide the words are in which a step keeps indices for itself: half words where they reach, which a random walk
// finds in half the memory. Tests force either.
#pragma once

#include <cstdint>
#include <limits>

#include "frame/core.hpp"

namespace sm {

enum class IndexWidth { half, whole };

template <class Half>
constexpr IndexWidth width_for(i64 largest) {
  return largest <= i64{std::numeric_limits<Half>::max()} ? IndexWidth::half : IndexWidth::whole;
}

}  // namespace sm
