#include "cholesky/inverse_fronts.hpp"

#include <algorithm>

#include "cholesky/search.hpp"

namespace sm {

const Front* FrontStack::find(i64 parent) {
  while (count_ > 0 && (parent < 0 || fronts_[count_ - 1].block < parent)) {
    --count_;
    used_ -= fronts_[count_].taken * fronts_[count_].taken;
    columns_used_ -= fronts_[count_].taken;
  }
  return count_ > 0 && fronts_[count_ - 1].block == parent ? fronts_ + count_ - 1 : nullptr;
}

bool FrontStack::open(i64 order, Front& front) {
  const i64 step = step_of(order);
  if (!has_place() || capacity_ - used_ < step * step || kMostFrontColumns - columns_used_ < step) return false;
  const i64 before = step - order;
  front = {-1, {values_ + used_ + before * (step + 1), step}, columns_ + columns_used_ + before, order, before, step};
  return true;
}

Front FrontStack::grown(const Front& front, i64 width) {
  return {-1,
          {front.z.first - width * (front.z.step + 1), front.z.step},
          front.column - width,
          front.order + width,
          front.room - width,
          0};
}

// A new front moves to where the one that it replaces was.
void FrontStack::keep(Front& front, i64 block, bool in_place) {
  front.block = block;
  const i64 freed = in_place ? fronts_[--count_].taken : 0;
  if (front.taken == 0) {
    front.taken = freed;
  } else {
    if (freed > 0) {
      const Square from = front.z;
      front.z.first -= freed * freed;
      for (i64 i = 0; i < front.order; ++i) std::copy_n(from.row(i), front.order, front.z.row(i));
      front.column = std::copy_n(front.column, front.order, front.column - freed) - front.order;
    }
    used_ += front.taken * front.taken - freed * freed;
    columns_used_ += front.taken - freed;
  }
  fronts_[count_++] = front;
}

// Neither way branches on what is read. A few columns are looked for one by one, which searches do side by side.
void find_places(const Front& front, const i64* column, i64 count, i64* place) {
  constexpr i64 kMany = 8;
  if (count == 0) return;
  if (count * kMany < front.order) {
    for (i64 j = 0; j < count; ++j) place[j] = find_column(front.column, front.order, column[j]);
    return;
  }
  i64 j = 0;
  for (i64 at = 0; j < count; ++at) {
    place[j] = at;
    j += front.column[at] == column[j] ? 1 : 0;
  }
}

}  // namespace sm
