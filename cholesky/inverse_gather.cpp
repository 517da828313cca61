// Collecting dense parts of Z from its rows.
#include <algorithm>

#include "cholesky/inverse_work.hpp"

namespace sm {

// Subscripts ascend: a column is at most as far behind the one before it as their difference, which is where it is
// when neighbours stay neighbours.
void find_places(const Block& b, const i64* column, i64 begin, i64 end, i64* place) {
  const i64 behind = b.first + b.width;
  i64 j = begin;
  for (; j < end && column[j] < behind; ++j) *place++ = column[j] - b.first;
  i64 at = -1;
  i64 last = behind - 1;
  for (; j < end; ++j) {
    const i64 farthest = std::min(at + (column[j] - last), b.tail_length() - 1);
    if (b.tail[farthest] == column[j]) {
      at = farthest;
    } else {
      at = std::lower_bound(b.tail + at + 1, b.tail + farthest, column[j]) - b.tail;
    }
    last = column[j];
    *place++ = b.width + at;
  }
}

void gather(const InverseRows& z, const DensePart& part, const Square& out, i64* place) {
  const bool symmetric = part.begin == part.from;
  for (i64 i = part.begin; i < part.end;) {
    const Block b = z.at(z.tree.block_of(part.column[i]));
    const i64 first = symmetric ? i + 1 : part.from;
    find_places(b, part.column, first, part.to, place + (first - part.from));
    const i64 count = part.to - part.from;
    // Places that follow each other stay so for all rows of the block: none of them is left of a row's own.
    const bool in_one_run = first < part.to && place[count - 1] - place[first - part.from] == part.to - 1 - first;
    for (; i < part.end && part.column[i] < b.first + b.width; ++i) {
      const double* from = b.row(part.column[i] - b.first);
      double* to = out.row(i - part.begin);
      const i64 begin = symmetric ? i + 1 - part.from : 0;
      if (in_one_run && begin < count) {
        std::copy_n(from + place[begin], count - begin, to + begin);
      } else {
        // Most of the elements are in cache lines of their own: those of the next row are under way meanwhile.
        const bool more = i + 1 < part.end && part.column[i + 1] < b.first + b.width;
        const double* next = more ? b.row(part.column[i + 1] - b.first) : from;
        for (i64 j = begin; j < count; ++j) {
          __builtin_prefetch(next + place[j]);
          to[j] = from[place[j]];
        }
      }
      if (!symmetric) continue;
      const i64 own = i - part.from;
      to[own] = z.diag[part.column[i]];
      for (i64 j = own + 1; j < count; ++j) out.row(j)[own] = to[j];
    }
  }
}

}  // namespace sm
