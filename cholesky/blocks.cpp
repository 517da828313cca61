// Cutting the rows of U into blocks.
#include "cholesky/blocks.hpp"

#include <algorithm>
#include <bit>
#include <cmath>
#include <cstdint>

namespace sm {

void Blocks::find() {
  for (i64 first = 0; first < a_.n;) {
    i64 end = first + 1;
    while (end < a_.n && continues(end - 1)) ++end;
    cut(first, end);
    first = end;
  }
}

// Blocks of about the same width, none wider than the limit.
void Blocks::cut(i64 first, i64 end) {
  const i64 pieces = (end - first + kMostBlockRows - 1) / kMostBlockRows;
  const i64 even = (end - first + pieces - 1) / pieces;
  const i64 width = pieces == 1 ? even : (even + 7) / 8 * 8;
  for (i64 k = first; k < end; k += width) {
    a_.position[k] = std::min(width, end - k);
    a_.jl[k] = -1;
    for (i64 row = k + 1; row < std::min(k + width, end); ++row) a_.jl[row] = -2 - k;
  }
}

// Entries that are left of the source, and their multipliers. The largest is found by its bits, whose order is that of
// magnitudes, with NaN behind infinity: no addition waits for the one before.
bool Blocks::is_finite(const Source& s) const {
  constexpr std::uint64_t kMagnitude = ~std::uint64_t{0} >> 1;
  const double* row = s.value + s.done;
  for (i64 r = 0; r < s.width; row += s.step - r, ++r) {
    std::uint64_t most = 0;
    for (i64 j = 0; j < s.count - s.done; ++j) {
      most = std::max(most, std::bit_cast<std::uint64_t>(row[j]) & kMagnitude);
    }
    const double largest = std::bit_cast<double>(most);
    if (!std::isfinite(largest) || !std::isfinite(largest * s.pivot[r])) return false;
  }
  return true;
}

void Blocks::await_behind_leader(const SourceGroup& group) const {
  i64 last = group.leader().first;
  for (const Source* s = group.begin() + 1; s < group.end(); ++s) {
    if (s->done == s->count) continue;
    a_.position[s->first] = word_of(*s, kFollows);
    a_.jl[s->first] = a_.jl[last];
    a_.jl[last] = s->first;
    last = s->first;
  }
}

void Blocks::follow(const SourceGroup& group, Followers& followers) const {
  for (const Source& s : group) {
    if (s.done == s.count) continue;
    a_.position[s.first] = word_of(s, kFollows);
    a_.jl[s.first] = followers.first;
    followers.first = s.first;
    if (followers.last < 0) followers.last = s.first;
    followers.rows += s.width;
  }
}

}  // namespace sm
