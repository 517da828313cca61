// Method: rows of L one after the other, each solved against the columns that the elimination tree says it meets.
// J. W. H. Liu, "The role of elimination trees in sparse factorization", SIAM J. Matrix Anal. Appl. 11 (1990) 134-172.
#include "bench/peers/pivots.hpp"

#include <algorithm>
#include <cmath>
#include <limits>

namespace sm::bench {
namespace {

std::size_t at(int i) { return static_cast<std::size_t>(i); }

struct Entry {
  int index;
  double value;
};
using Lists = std::vector<std::vector<Entry>>;

// Column k: the entries (i, k), i <= k, of the reordered matrix.
Lists reordered(const UpperRows& rows, const std::vector<int>& order) {
  std::vector<int> place(order.size());
  for (std::size_t k = 0; k < order.size(); ++k) place[at(order[k])] = static_cast<int>(k);
  Lists columns(order.size());
  for (int i = 0; i < rows.n; ++i) {
    for (int p = rows.start[at(i)]; p < rows.start[at(i) + 1]; ++p) {
      const int a = place[at(i)];
      const int b = place[at(rows.col[at(p)])];
      columns[at(std::max(a, b))].push_back({std::min(a, b), rows.value[at(p)]});
    }
  }
  return columns;
}

class PlainFactor {
 public:
  explicit PlainFactor(std::size_t n) : below_(n), reciprocal_(n), parent_(n, -1), seen_(n, -1), y_(n) {}

  // The pivot of row k before it is judged, from the column of A that ends in the diagonal.
  double row(int k, const std::vector<Entry>& column) {
    reach_.clear();
    for (const auto& [i, value] : column) {
      y_[at(i)] += value;
      climb(i, k);
    }
    std::sort(reach_.begin(), reach_.end());
    double pivot = y_[at(k)];
    y_[at(k)] = 0.0;
    for (const int i : reach_) {
      const double y = y_[at(i)];
      y_[at(i)] = 0.0;
      for (const auto& [j, l] : below_[at(i)]) y_[at(j)] -= l * y;
      const double l = y * reciprocal_[at(i)];
      pivot -= l * y;
      if (reciprocal_[at(i)] != 0.0) below_[at(i)].push_back({k, l});
    }
    return pivot;
  }
  void accept(int k, double pivot) { reciprocal_[at(k)] = 1.0 / pivot; }

 private:
  // The path from i up to k in the tree, as far as it is new to this row.
  void climb(int i, int k) {
    for (; i != -1 && i < k && seen_[at(i)] != k; i = parent_[at(i)]) {
      seen_[at(i)] = k;
      reach_.push_back(i);
      if (parent_[at(i)] == -1) parent_[at(i)] = k;
    }
  }

  Lists below_;  // columns of L
  std::vector<double> reciprocal_;
  std::vector<int> parent_, seen_, reach_;
  std::vector<double> y_;
};

}  // namespace

PivotMargins pivot_margins(const UpperRows& rows, const std::vector<int>& order, double tolerance) {
  const Lists columns = reordered(rows, order);
  PlainFactor factor(order.size());
  PivotMargins margins{.smallest_accepted = std::numeric_limits<double>::infinity()};
  for (int k = 0; k < rows.n; ++k) {
    const auto& column = columns[at(k)];
    const auto own = std::find_if(column.begin(), column.end(), [k](const Entry& e) { return e.index == k; });
    const double bound = std::fabs(own->value) * tolerance;
    const double pivot = factor.row(k, column);
    if (pivot > bound) {
      factor.accept(k, pivot);
      ++margins.accepted;
      margins.smallest_accepted = std::min(margins.smallest_accepted, pivot / bound);
    } else if (bound > 0.0) {
      margins.largest_dropped = std::max(margins.largest_dropped, std::fabs(pivot) / bound);
    }
  }
  return margins;
}

}  // namespace sm::bench
