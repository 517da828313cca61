// Complete rows of the caller's matrix, whatever its storage: what a stored triangle leaves out is read from the
// mirrored place. In a matrix that has not been reordered their columns ascend.
#pragma once

#include <type_traits>

#include "frame/memory.hpp"
#include "store/views.hpp"

namespace sm {

// For the views in which every element of a row can be found.
//   row(i, f)   f(j, value) for the stored elements of row i
//   is_full     every row has an entry in every column
template <class View>
class CompleteRows {
 public:
  static constexpr bool is_full = View::one_triangle || std::is_same_v<View, FullArray>;

  explicit CompleteRows(const View& view) : view_(view) {}
  [[nodiscard]] SmStatus take(MemoryPool*) { return SM_OK; }

  template <class F>
  void row(i64 i, F&& f) const {
    if constexpr (View::one_triangle) {
      for (i64 j = 0; j < i; ++j) f(j, *view_.find(j, i));
    }
    view_.row(i, [&](i64 j, double v) { f(j, v); });
  }

 private:
  View view_;
};

// Compressed rows of a triangle, with a list of each column's entries beside them: in any order of the stored rows.
template <>
class CompleteRows<UpperRows> {
 public:
  static constexpr bool is_full = false;

  explicit CompleteRows(const UpperRows& view) : view_(view) {}

  [[nodiscard]] SmStatus take(MemoryPool* pool) {
    SM_TRY(start_.take(pool, view_.rows + 2, Fill::zero));
    i64* start = start_.data();
    view_.entries([&](i64 i, i64 j, double) { start[j + 2] += i != j; });
    for (i64 j = 0; j <= view_.rows; ++j) start[j + 1] += start[j];
    const i64 count = start[view_.rows + 1];
    SM_TRY(index_.take(pool, count));
    SM_TRY(values_.take(pool, count));
    // start[j + 1] runs from where list j begins to where it ends, which is where list j + 1 begins.
    view_.entries([&](i64 i, i64 j, double v) {
      if (i == j) return;
      const i64 slot = start[j + 1]++;
      index_.data()[slot] = i;
      values_.data()[slot] = v;
    });
    return SM_OK;
  }

  template <class F>
  void row(i64 i, F&& f) {
    for (i64 p = start_.data()[i]; p < start_.data()[i + 1]; ++p) f(index_.data()[p], values_.data()[p]);
    view_.row(i, [&](i64 j, double v) { f(j, v); });
  }

 private:
  UpperRows view_;
  Scratch<i64> start_;
  Scratch<i64> index_;
  Scratch<double> values_;
};

// Calls f(rows) -> SmStatus with the complete rows of a matrix that has entries; what they need comes from `pool`. 101.
template <class F>
SmStatus with_rows(SmMatrix& m, MemoryPool* pool, F&& f) {
  return visit(m, [&]<class View>(const View& view) -> SmStatus {
    CompleteRows<View> rows(view);
    SM_TRY(rows.take(pool));
    return f(rows);
  });
}

// out <- row i, n doubles; whether it has entries.
template <class Rows>
bool scatter_row(Rows& rows, i64 i, double* out, i64 n) {
  bool any = false;
  std::fill_n(out, n, 0.0);
  rows.row(i, [&](i64 j, double v) {
    out[j] = v;
    any = true;
  });
  return any;
}

}  // namespace sm
