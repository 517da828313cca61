// The two roads to the aliased columns of X, and what they share.
#pragma once

#include <cstdint>
#include <limits>
#include <vector>

#include "mixed/model.hpp"

namespace sm::mixed {

// What is left of a column, relative to the column, when it counts as nothing. Squares and fourth powers of years stay
// above it, sums of columns with 15 digits below.
constexpr double kNothing = 1e-10;
// What rounding may leave of a combination of columns, relative to the sum of the lengths of its parts: more than the
// above where the columns nearly cancel.
constexpr double kRounding = 16.0 * std::numeric_limits<double>::epsilon();

// The columns of X times the square roots of the weights.
class WeightedColumns {
 public:
  WeightedColumns(const SparseColumns& x, const std::vector<double>& weights);

  std::int64_t rows() const { return x_.rows; }
  std::int64_t cols() const { return x_.cols(); }
  std::int64_t entries(std::int64_t j) const;
  double norm(std::int64_t j) const;
  std::vector<double> column(std::int64_t j) const;
  void add(double factor, std::int64_t j, std::vector<double>& values) const;

  // visit(row, value) for the entries of a column.
  template <class Visit>
  void for_each(std::int64_t j, Visit&& visit) const {
    const auto at = static_cast<std::size_t>(j);
    for (auto p = static_cast<std::size_t>(x_.start[at]); p < static_cast<std::size_t>(x_.start[at + 1]); ++p) {
      const auto row = static_cast<std::size_t>(x_.row[p]);
      visit(row, x_.value[p] * (roots_.empty() ? 1.0 : roots_[row]));
    }
  }

 private:
  const SparseColumns& x_;
  std::vector<double> roots_;
};

// Which columns are kept, and the others by these: aliased column a is the sum of dependence[a][k] times kept column k.
struct Dependences {
  std::vector<std::int64_t> kept;
  std::vector<std::int64_t> aliased;
  std::vector<std::vector<double>> dependence;
};

// Gram-Schmidt on the columns themselves: rows x columns numbers of memory, times columns of work.
Dependences dense_dependences(const WeightedColumns& x);

// By the normal equations of columns that are orthogonal by groups, and the columns themselves where those are in
// doubt: memory and work that many dummies allow. `term` of each column.
Dependences sparse_dependences(const WeightedColumns& x, const std::vector<std::int64_t>& term);

// From vectors with X v = 0, one for each dependence: they are reduced until each has a last column of its own, which
// is aliased. `sizes` of the columns of X, to tell rounding.
Dependences last_columns(std::vector<std::vector<double>> null, const std::vector<double>& sizes);

// Exact zeros and small fractions in place of what rounding made of them, where the columns bear that out.
void tidy(const WeightedColumns& x, Dependences& found);

}  // namespace sm::mixed
