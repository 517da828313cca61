// The null vectors of X: from the normal equations of its columns, which are orthogonal by groups; what these leave in
// doubt is decided on the columns themselves, by iterative refinement of the residual (A. Bjorck, "Numerical Methods
// for Least Squares Problems", SIAM 1996, section 6.6).
#include <Eigen/Core>
#include <algorithm>
#include <cmath>
#include <unordered_map>

#include "mixed/alias_groups.hpp"
#include "mixed/alias_roads.hpp"
#include "mixed/error.hpp"
#include "mixed/vectors.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

using Vector = std::vector<double>;
using Matrix = Eigen::MatrixXd;

// Of a column of norm 1, what the normal equations must leave for them to be believed.
constexpr double kDoubtful = 1e-6;
constexpr Eigen::Index kPanel = 64;
constexpr std::int64_t kBlockRows = 512;
constexpr std::int64_t kMostDense = 8000;
constexpr int kRefinements = 3;
constexpr double kUnfelt = 1e-14;

// Columns without a row in common, whose normal equations are diagonal: those of the largest such term.
std::vector<std::int64_t> disjoint_columns(const std::vector<GroupedColumn>& columns,
                                           const std::vector<std::int64_t>& term, std::int64_t rows) {
  std::vector<std::int64_t> best;
  std::vector<std::int64_t> mark(static_cast<std::size_t>(rows), -1);
  for (std::size_t begin = 0; begin < columns.size();) {
    std::size_t end = begin;
    while (end < columns.size() && term[end] == term[begin]) ++end;
    std::vector<std::int64_t> own;
    for (std::size_t j = begin; j < end; ++j) {
      if (columns[j].dense || columns[j].nothing) continue;
      bool apart = true;
      columns[j].for_each(
          [&](std::size_t row, double) { apart = apart && mark[row] != static_cast<std::int64_t>(begin); });
      if (!apart) continue;
      columns[j].for_each([&](std::size_t row, double) { mark[row] = static_cast<std::int64_t>(begin); });
      own.push_back(static_cast<std::int64_t>(j));
    }
    if (own.size() > best.size()) best = std::move(own);
    begin = end;
  }
  return best;
}

// Cholesky of Z'Z with the disjoint columns first, whose part is the identity. Columns for which nothing much is left
// are passed over, and counted as doubtful.
class NormalEquations {
 public:
  NormalEquations(const std::vector<GroupedColumn>& columns, const std::vector<std::int64_t>& term, std::int64_t rows)
      : columns_(columns), place_(columns.size(), -1) {
    first_ = disjoint_columns(columns, term, rows);
    for (std::size_t d = 0; d < first_.size(); ++d) place_[static_cast<std::size_t>(first_[d])] = -2;
    for (std::size_t j = 0; j < columns.size(); ++j) {
      if (place_[j] == -2 || columns[j].nothing) continue;
      place_[j] = static_cast<std::int64_t>(rest_.size());
      rest_.push_back(static_cast<std::int64_t>(j));
    }
    if (static_cast<std::int64_t>(rest_.size()) > kMostDense) {
      throw ModelError(
          {.what = "the fixed part has " + count_of(static_cast<std::int64_t>(columns.size()), "column"),
           .expected = "no more than " + std::to_string(kMostDense) + " besides those of the largest factor",
           .advice = "make a factor of many levels a random term"});
    }
    gather(rows);
    eliminate_first();
    factor();
  }

  const std::vector<std::int64_t>& doubtful() const { return doubtful_; }

  // b with Z b nearest to a vector of which `products` are the products with all columns; 0 for the doubtful ones.
  Vector solve(const Vector& products) const {
    const auto m = static_cast<Eigen::Index>(rest_.size());
    Eigen::VectorXd right(m);
    for (Eigen::Index i = 0; i < m; ++i) right[i] = products[column(i)];
    for (std::size_t d = 0; d < first_.size(); ++d) {
      const double own = products[static_cast<std::size_t>(first_[d])];
      for (const auto& [i, value] : links_[d]) right[i] -= value * own;
    }
    for (Eigen::Index j = 0; j < m; ++j) {
      right[j] = passed_[static_cast<std::size_t>(j)] ? 0.0 : right[j] / s_(j, j);
      if (right[j] != 0.0) right.tail(m - j - 1) -= right[j] * s_.col(j).tail(m - j - 1);
    }
    return back(right, [&](std::size_t d) { return products[static_cast<std::size_t>(first_[d])]; });
  }

  // The same for a doubtful column, by what was computed of it before it was passed over.
  Vector solve_for(std::int64_t doubtful) const {
    const auto m = static_cast<Eigen::Index>(rest_.size());
    const auto own = static_cast<Eigen::Index>(place_[static_cast<std::size_t>(doubtful)]);
    Eigen::VectorXd right = Eigen::VectorXd::Zero(m);
    right.head(own) = s_.row(own).head(own).transpose();
    return back(right, [&](std::size_t d) {
      const auto link = std::lower_bound(links_[d].begin(), links_[d].end(), own,
                                         [](const auto& entry, Eigen::Index i) { return entry.first < i; });
      return link != links_[d].end() && link->first == own ? link->second : 0.0;
    });
  }

 private:
  std::size_t column(Eigen::Index i) const { return static_cast<std::size_t>(rest_[static_cast<std::size_t>(i)]); }

  // L' b = right, then the disjoint columns; `product` of each of those with what is to be met.
  template <class Product>
  Vector back(Eigen::VectorXd& right, Product product) const {
    const auto m = static_cast<Eigen::Index>(rest_.size());
    for (Eigen::Index j = m; j-- > 0;) {
      if (!passed_[static_cast<std::size_t>(j)]) {
        right[j] = (right[j] - s_.col(j).tail(m - j - 1).dot(right.tail(m - j - 1))) / s_(j, j);
      }
    }
    Vector b(columns_.size(), 0.0);
    for (Eigen::Index i = 0; i < m; ++i) b[column(i)] = right[i];
    for (std::size_t d = 0; d < first_.size(); ++d) {
      double own = product(d);
      for (const auto& [i, value] : links_[d]) own -= value * right[i];
      b[static_cast<std::size_t>(first_[d])] = own;
    }
    return b;
  }

  // The products of the rest among themselves, by blocks of rows: of the dense columns as a matrix, of the others entry
  // by entry.
  void gather(std::int64_t rows) {
    const auto m = static_cast<Eigen::Index>(rest_.size());
    s_ = Matrix::Zero(m, m);
    std::vector<Eigen::Index> dense;
    std::vector<std::size_t> next(rest_.size(), 0);
    for (Eigen::Index i = 0; i < m; ++i) {
      if (columns_[column(i)].dense) dense.push_back(i);
    }
    const auto wide = static_cast<Eigen::Index>(dense.size());
    Matrix dense_products = Matrix::Zero(wide, wide);
    std::vector<std::vector<std::pair<Eigen::Index, double>>> entries(static_cast<std::size_t>(kBlockRows));
    for (std::int64_t begin = 0; begin < rows; begin += kBlockRows) {
      const std::int64_t count = std::min(kBlockRows, rows - begin);
      Matrix block(wide, count);
      for (Eigen::Index d = 0; d < wide; ++d) {
        const Vector& value = columns_[column(dense[static_cast<std::size_t>(d)])].value;
        for (Eigen::Index r = 0; r < count; ++r) block(d, r) = value[static_cast<std::size_t>(begin + r)];
      }
      dense_products.noalias() += block * block.transpose();
      collect(begin, count, next, entries);
      for (Eigen::Index r = 0; r < count; ++r) {
        const auto& row = entries[static_cast<std::size_t>(r)];
        for (std::size_t a = 0; a < row.size(); ++a) {
          for (std::size_t b = 0; b <= a; ++b) s_(row[a].first, row[b].first) += row[a].second * row[b].second;
          for (Eigen::Index d = 0; d < wide; ++d) {
            const Eigen::Index i = dense[static_cast<std::size_t>(d)];
            s_(std::max(i, row[a].first), std::min(i, row[a].first)) += row[a].second * block(d, r);
          }
        }
      }
    }
    for (Eigen::Index a = 0; a < wide; ++a) {
      for (Eigen::Index b = 0; b <= a; ++b) {
        s_(dense[static_cast<std::size_t>(a)], dense[static_cast<std::size_t>(b)]) = dense_products(a, b);
      }
    }
  }

  // The entries of the sparse columns in a block of rows, columns ascending.
  void collect(std::int64_t begin, std::int64_t count, std::vector<std::size_t>& next,
               std::vector<std::vector<std::pair<Eigen::Index, double>>>& entries) const {
    for (auto& row : entries) row.clear();
    for (std::size_t i = 0; i < rest_.size(); ++i) {
      const GroupedColumn& source = columns_[static_cast<std::size_t>(rest_[i])];
      if (source.dense) continue;
      while (next[i] < source.row.size() && source.row[next[i]] < begin + count) {
        entries[static_cast<std::size_t>(source.row[next[i]] - begin)].emplace_back(static_cast<Eigen::Index>(i),
                                                                                    source.value[next[i]]);
        ++next[i];
      }
    }
  }

  // Their products with each of the disjoint columns, and what that leaves.
  void eliminate_first() {
    std::vector<std::vector<std::pair<Eigen::Index, double>>> of_row = rows_of_rest();
    std::vector<Eigen::Index> dense;
    for (std::size_t i = 0; i < rest_.size(); ++i) {
      if (columns_[static_cast<std::size_t>(rest_[i])].dense) dense.push_back(static_cast<Eigen::Index>(i));
    }
    links_.resize(first_.size());
    Vector sum(rest_.size(), 0.0);
    std::vector<char> met(rest_.size(), 0);
    for (std::size_t d = 0; d < first_.size(); ++d) {
      std::vector<Eigen::Index> touched = dense;
      columns_[static_cast<std::size_t>(first_[d])].for_each([&](std::size_t row, double value) {
        for (const Eigen::Index i : dense) sum[static_cast<std::size_t>(i)] += value * columns_[column(i)].value[row];
        for (const auto& [i, other] : of_row[row]) {
          if (!met[static_cast<std::size_t>(i)]) touched.push_back(i);
          met[static_cast<std::size_t>(i)] = 1;
          sum[static_cast<std::size_t>(i)] += value * other;
        }
      });
      std::sort(touched.begin(), touched.end());
      for (const Eigen::Index i : touched) {
        links_[d].emplace_back(i, sum[static_cast<std::size_t>(i)]);
        sum[static_cast<std::size_t>(i)] = 0.0;
        met[static_cast<std::size_t>(i)] = 0;
      }
      for (std::size_t b = 0; b < links_[d].size(); ++b) {
        for (std::size_t a = b; a < links_[d].size(); ++a) {
          s_(links_[d][a].first, links_[d][b].first) -= links_[d][a].second * links_[d][b].second;
        }
      }
    }
  }

  std::vector<std::vector<std::pair<Eigen::Index, double>>> rows_of_rest() const {
    std::size_t rows = 0;
    for (const std::int64_t j : first_) {
      const auto& row = columns_[static_cast<std::size_t>(j)].row;
      if (!row.empty()) rows = std::max(rows, static_cast<std::size_t>(row.back()) + 1);
    }
    std::vector<std::vector<std::pair<Eigen::Index, double>>> of_row(rows);
    for (std::size_t i = 0; i < rest_.size(); ++i) {
      const GroupedColumn& source = columns_[static_cast<std::size_t>(rest_[i])];
      if (source.dense) continue;
      source.for_each([&](std::size_t row, double value) {
        if (row < rows) of_row[row].emplace_back(static_cast<Eigen::Index>(i), value);
      });
    }
    return of_row;
  }

  // By panels; a doubtful column becomes one of zeros.
  void factor() {
    const Eigen::Index m = s_.rows();
    passed_.assign(static_cast<std::size_t>(m), 0);
    for (Eigen::Index begin = 0; begin < m; begin += kPanel) {
      const Eigen::Index end = std::min(begin + kPanel, m);
      for (Eigen::Index j = begin; j < end; ++j) {
        for (Eigen::Index k = begin; k < j; ++k) s_.col(j).tail(m - j) -= s_(j, k) * s_.col(k).tail(m - j);
        if (s_(j, j) > kDoubtful) {
          s_.col(j).tail(m - j) /= std::sqrt(s_(j, j));
        } else {
          passed_[static_cast<std::size_t>(j)] = 1;
          doubtful_.push_back(rest_[static_cast<std::size_t>(j)]);
          s_.col(j).tail(m - j).setZero();
        }
      }
      if (end == m) break;
      const auto panel = s_.block(end, begin, m - end, end - begin);
      const Matrix copy = panel;
      s_.bottomRightCorner(m - end, m - end).selfadjointView<Eigen::Lower>().rankUpdate(copy, -1.0);
    }
  }

  const std::vector<GroupedColumn>& columns_;
  std::vector<std::int64_t> first_;  // disjoint
  std::vector<std::int64_t> rest_;
  std::vector<std::int64_t> place_;
  std::vector<std::vector<std::pair<Eigen::Index, double>>> links_;  // of each of the first: products with the rest
  Matrix s_;                                                         // lower triangle
  std::vector<char> passed_;
  std::vector<std::int64_t> doubtful_;
};

class NullSpace {
 public:
  NullSpace(const WeightedColumns& x, const std::vector<std::int64_t>& term)
      : rows_(x.rows()), columns_(group_columns(x)), equations_(columns_, term, rows_) {}

  // Vectors with X v = 0, one for each dependence.
  std::vector<Vector> run() {
    std::vector<Vector> found;
    for (std::size_t j = 0; j < columns_.size(); ++j) {
      if (!columns_[j].nothing) continue;
      found.emplace_back(columns_.size(), 0.0);
      found.back()[j] = 1.0;
    }
    for (const std::int64_t j : equations_.doubtful()) {
      Vector left;
      Vector combination = residual(static_cast<std::size_t>(j), left);
      const double rest = norm(left);
      const GroupedColumn& column = columns_[static_cast<std::size_t>(j)];
      double rounding = 0.0;
      for (std::size_t k = 0; k < columns_.size(); ++k) rounding += std::fabs(combination[k]) * columns_[k].noise;
      if (rest <= kNothing * column.size / column.scale + rounding) {
        found.push_back(std::move(combination));
        continue;
      }
      for (double& value : left) value /= rest;
      for (double& value : combination) value /= rest;
      directions_.push_back(std::move(left));
      combinations_.push_back(std::move(combination));
    }
    for (Vector& vector : found) by_columns_of_x(vector);
    return found;
  }

 private:
  // What is left of column j behind the believed ones and the directions so far, and how it is made of all columns.
  Vector residual(std::size_t j, Vector& left) const {
    left.assign(static_cast<std::size_t>(rows_), 0.0);
    columns_[j].for_each([&](std::size_t row, double value) { left[row] += value; });
    Vector combination(columns_.size(), 0.0);
    combination[j] = 1.0;
    for (int pass = 0; pass < kRefinements; ++pass) {
      const Vector b =
          pass == 0 ? equations_.solve_for(static_cast<std::int64_t>(j)) : equations_.solve(products(left));
      for (std::size_t k = 0; k < b.size(); ++k) {
        if (std::fabs(b[k]) <= kUnfelt) continue;
        columns_[k].for_each([&](std::size_t row, double value) { left[row] -= b[k] * value; });
        combination[k] -= b[k];
      }
      for (std::size_t d = 0; d < directions_.size(); ++d) {
        const double part = dot(directions_[d], left);
        for (std::size_t i = 0; i < left.size(); ++i) left[i] -= part * directions_[d][i];
        for (std::size_t k = 0; k < combination.size(); ++k) combination[k] -= part * combinations_[d][k];
      }
      if (norm(left) * columns_[j].scale <= kNothing / 100.0 * columns_[j].size) break;
    }
    return combination;
  }

  Vector products(const Vector& values) const {
    Vector products;
    products.reserve(columns_.size());
    for (const GroupedColumn& column : columns_) {
      double product = 0.0;
      column.for_each([&](std::size_t row, double value) { product += value * values[row]; });
      products.push_back(product);
    }
    return products;
  }

  // Z v = X w: column j of Z is (column j of X - the shares of those before it) / scale.
  void by_columns_of_x(Vector& vector) const {
    for (std::size_t j = columns_.size(); j-- > 0;) {
      vector[j] /= columns_[j].scale;
      for (const auto& [k, share] : columns_[j].shares) vector[static_cast<std::size_t>(k)] -= share * vector[j];
    }
  }

  std::int64_t rows_;
  std::vector<GroupedColumn> columns_;
  NormalEquations equations_;
  std::vector<Vector> directions_;    // orthonormal, behind the believed columns
  std::vector<Vector> combinations_;  // of the columns, which make them
};

}  // namespace

Dependences sparse_dependences(const WeightedColumns& x, const std::vector<std::int64_t>& term) {
  Vector sizes;
  for (std::int64_t j = 0; j < x.cols(); ++j) {
    const double size = x.norm(j);
    sizes.push_back(size > 0.0 ? size : 1.0);
  }
  return last_columns(NullSpace(x, term).run(), sizes);
}

}  // namespace sm::mixed
