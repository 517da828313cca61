// Symmetric matrices in compressed rows that no call would make, and the plain road of their product.
#pragma once

#include <algorithm>
#include <set>
#include <vector>

#include "forms/lines.hpp"
#include "forms/passes.hpp"
#include "support/random_matrices.hpp"

namespace sm::test {

// Columns of each row, in the order of the storage, with random values.
class Compressed {
 public:
  Compressed(Random& random, const std::vector<std::vector<std::int64_t>>& columns, bool ascending = true) {
    start_.push_back(0);
    for (const auto& row : columns) {
      col_.insert(col_.end(), row.begin(), row.end());
      start_.push_back(static_cast<std::int64_t>(col_.size()));
    }
    value_ = random.vector(static_cast<std::int64_t>(col_.size()));
    record_.rows = record_.cols = static_cast<std::int64_t>(columns.size());
    record_.state = ascending ? SM_STATE_CLOSED : SM_STATE_REORDERED;
    record_.row_start = start_.data();
    record_.col_index = col_.data();
    record_.nz_values = value_.data();
  }
  Compressed(const Compressed&) = delete;
  Compressed& operator=(const Compressed&) = delete;

  UpperRows rows() { return UpperRows(record_); }
  std::int64_t n() const { return record_.rows; }
  std::vector<double>& values() { return value_; }

  // y + A x for `count` vectors.
  std::vector<double> plain(const std::vector<double>& x, std::vector<double> y, std::int64_t count = 1) {
    for (std::int64_t v = 0; v < count; ++v) add_product(rows(), x.data() + v * n(), y.data() + v * n());
    return y;
  }

 private:
  SmMatrix record_{};
  std::vector<std::int64_t> start_, col_;
  std::vector<double> value_;
};

using Pattern = std::vector<std::vector<std::int64_t>>;

// Row i holds i and i + d for the distances, where that is a column.
inline Pattern stencil(std::int64_t n, const std::vector<std::int64_t>& distances) {
  Pattern rows;
  for (std::int64_t i = 0; i < n; ++i) {
    rows.push_back({i});
    for (const std::int64_t d : distances) {
      if (i + d < n) rows.back().push_back(i + d);
    }
  }
  return rows;
}

inline Pattern plane(std::int64_t width, std::int64_t height) {
  Pattern rows = stencil(width * height, {1, width});
  for (std::int64_t i = width - 1; i + 1 < width * height; i += width) rows[i].erase(rows[i].begin() + 1);
  return rows;
}

// About `entries` columns a row; some rows are empty, some have no diagonal, some are full.
inline Pattern scattered(Random& random, std::int64_t n, std::int64_t entries) {
  Pattern rows;
  for (std::int64_t i = 0; i < n; ++i) {
    std::set<std::int64_t> row;
    for (std::int64_t k = random.below(2 * entries + 1); k > 0; --k) row.insert(i + random.below(n - i));
    if (random.chance(90)) row.insert(i);
    if (random.chance(5)) row.clear();
    if (random.chance(2)) {
      for (std::int64_t j = i; j < n; ++j) row.insert(j);
    }
    rows.emplace_back(row.begin(), row.end());
  }
  return rows;
}

// Rows of a pedigree: most have their diagonal only, others up to 40 entries in any order of lengths, few very many;
// here and there one is empty or has no diagonal.
inline Pattern pedigree(Random& random, std::int64_t n) {
  Pattern rows;
  for (std::int64_t i = 0; i < n; ++i) {
    std::set<std::int64_t> row;
    std::int64_t length = random.chance(55) ? 0 : random.below(random.chance(80) ? 10 : 41);
    if (random.below(200) == 0) length = 300;
    for (; length > 0; --length) row.insert(i + random.below(n - i));
    if (random.chance(97)) row.insert(i);
    if (random.chance(1)) row.clear();
    rows.emplace_back(row.begin(), row.end());
  }
  return rows;
}

// Stencil rows of changing distances, with rows of another kind between them.
inline Pattern patched(Random& random, std::int64_t n) {
  Pattern rows = scattered(random, n, 2);
  for (std::int64_t i = random.below(20); i < n;) {
    std::set<std::int64_t> distances;
    for (std::int64_t k = random.below(12); k > 0; --k) distances.insert(1 + random.below(1 + n / 8));
    const std::int64_t end = std::min(n, i + 1 + random.below(120));
    for (; i < end; ++i) {
      rows[i] = {i};
      for (const std::int64_t d : distances) {
        if (i + d < n) rows[i].push_back(i + d);
      }
    }
    i += random.below(3);
  }
  // Here and there a row that is as long as its neighbours and yet does not continue them.
  for (std::int64_t k = random.below(4); k > 0; --k) {
    auto& row = rows[random.below(n)];
    if (row.size() > 1 && row.back() + 1 < n) ++row.back();
  }
  return rows;
}

// The same pairs with either index in front, in any order behind the diagonal.
inline Pattern reordered(Random& random, const Pattern& pattern) {
  Pattern rows(pattern.size());
  for (std::size_t i = 0; i < pattern.size(); ++i) {
    for (const std::int64_t j : pattern[i]) {
      const auto own = static_cast<std::int64_t>(i);
      if (j == own) {
        rows[i].insert(rows[i].begin(), own);
      } else if (random.chance(50)) {
        rows[i].push_back(j);
      } else {
        rows[static_cast<std::size_t>(j)].push_back(own);
      }
    }
  }
  return rows;
}

}  // namespace sm::test
