#include "mixed/null_space.hpp"

#include <Eigen/Dense>

namespace sm::mixed {
namespace {

constexpr double kDependent = 1e-10;  // of squared lengths
// Pivots below this part of their row's diagonal are hardly more than rounding. Larger ones are real, however small.
constexpr double kNoPivot = 1e-13;

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// Null vectors of a precision that are 1 at one of its null rows and 0 at the others.
Eigen::MatrixXd unit_null_vectors(const Precision& precision) {
  const Eigen::Map<const Eigen::MatrixXd> basis(precision.null_basis.data(), precision.order, precision.nullity);
  Eigen::MatrixXd rows(precision.nullity, precision.nullity);
  for (Eigen::Index r = 0; r < rows.rows(); ++r) rows.row(r) = basis.row(precision.null_rows[at(r)]);
  return basis * rows.inverse();
}

// What the fixed effects leave of the columns of `view`.
void take_fixed_effects_out(const ScaledDesign& design, Equations& equations, std::vector<std::vector<double>>& view) {
  Factors none;
  for (const DesignTerm& term : design.terms()) none.emplace_back(at(term.k * term.k), 0.0);
  if (!equations.factor(none, {})) return;
  for (std::vector<double>& column : view) {
    for (int pass = 0; pass < 2; ++pass) {
      std::vector<double> weighted = column;
      design.weigh(weighted);
      std::vector<double> right = design.transposed_product(weighted);
      std::fill(right.begin(), right.begin() + design.random_count(), 0.0);
      design.subtract_product(equations.solve(right), column);
    }
  }
}

double dot(const ScaledDesign& design, const std::vector<double>& a, const std::vector<double>& b) {
  double sum = 0.0;
  for (std::size_t i = 0; i < a.size(); ++i) sum += design.weight(i) * a[i] * b[i];
  return sum;
}

double precision_diagonal(const DesignTerm& term, std::int64_t unknown) {
  const std::size_t row = at((unknown - term.first) / term.k);
  const Precision& precision = *term.precision;
  double diagonal = 0.0;
  for (auto p = at(precision.row_start[row]); p < at(precision.row_start[row + 1]); ++p) {
    if (at(precision.col[p]) == row) diagonal = precision.value[p];
  }
  return diagonal;
}

}  // namespace

NullSpace::NullSpace(const ScaledDesign& design, Equations& equations, Part part) : design_(design) {
  std::vector<std::vector<double>> view;  // Z~ times the null vectors
  for (std::size_t t = 0; t < design.terms().size(); ++t) {
    const DesignTerm& term = design.terms()[t];
    if (!term.precision || term.precision->nullity == 0) continue;
    const Eigen::MatrixXd vectors = unit_null_vectors(*term.precision);
    for (std::size_t r = 0; r < at(term.precision->nullity); ++r) {
      const std::size_t first = unknowns_.size();
      for (std::size_t c = 0; c < at(term.k); ++c) {
        unknowns_.push_back(
            {term.first + term.precision->null_rows[r] * term.k + static_cast<std::int64_t>(c), t, c, first});
        std::vector<double> column(at(design.rows()));
        for (std::size_t i = 0; i < column.size(); ++i) {
          column[i] = vectors((*term.level)[i], static_cast<Eigen::Index>(r)) * term.z[i * at(term.k) + c];
        }
        view.push_back(std::move(column));
      }
    }
  }
  if (view.empty()) return;
  std::vector<double> length;
  length.reserve(view.size());
  for (const std::vector<double>& column : view) length.push_back(dot(design, column, column));
  if (part == Part::all) take_fixed_effects_out(design, equations, view);
  const auto count = static_cast<Eigen::Index>(view.size());
  Eigen::MatrixXd scaled(count, count);
  for (std::size_t j = 0; j < view.size(); ++j) {
    for (std::size_t i = 0; i < view.size(); ++i) {
      gram_.push_back(dot(design, view[i], view[j]));
      const double size = std::sqrt(length[i] * length[j]);
      scaled(static_cast<Eigen::Index>(i), static_cast<Eigen::Index>(j)) = size > 0.0 ? gram_.back() / size : 0.0;
    }
  }
  const Eigen::VectorXd values = Eigen::SelfAdjointEigenSolver<Eigen::MatrixXd>(scaled).eigenvalues();
  for (const double value : values) rank_ += value > kDependent ? 1 : 0;
}

// The largest pivots of T'HT, H the cross products of the data's view, are those that stay. Where T is nearly singular
// the least of them are rounding in the equations, and go.
std::vector<std::int64_t> NullSpace::superfluous(const Factors& factors) const {
  const auto count = static_cast<Eigen::Index>(unknowns_.size());
  Eigen::MatrixXd factor = Eigen::MatrixXd::Zero(count, count);
  for (std::size_t j = 0; j < unknowns_.size(); ++j) {
    const Unknown& unknown = unknowns_[j];
    const std::size_t k = at(design_.terms()[unknown.term].k);
    for (std::size_t a = 0; a < k; ++a) {
      factor(static_cast<Eigen::Index>(unknown.first + a), static_cast<Eigen::Index>(j)) =
          factors[unknown.term][unknown.coef * k + a];
    }
  }
  const Eigen::Map<const Eigen::MatrixXd> gram(gram_.data(), count, count);
  Eigen::MatrixXd left = factor.transpose() * gram * factor;
  std::vector<bool> stays(unknowns_.size(), false);
  for (std::size_t step = 0; step < rank_; ++step) {
    Eigen::Index best = -1;
    for (Eigen::Index i = 0; i < count; ++i) {
      if (!stays[at(i)] && (best < 0 || left(i, i) > left(best, best))) best = i;
    }
    const Unknown& unknown = unknowns_[at(best)];
    const double diagonal = precision_diagonal(design_.terms()[unknown.term], unknown.place);
    if (left(best, best) <= kNoPivot * diagonal) break;
    stays[at(best)] = true;
    if (!(left(best, best) > 0.0)) continue;
    const Eigen::VectorXd column = left.col(best);
    left -= column * column.transpose() / column(best);
  }
  std::vector<std::int64_t> rows;
  for (std::size_t i = 0; i < unknowns_.size(); ++i) {
    if (!stays[i]) rows.push_back(unknowns_[i].place);
  }
  return rows;
}

}  // namespace sm::mixed
