// Cutting the rows of U into blocks.
#include "cholesky/blocks.hpp"

#include <algorithm>

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
