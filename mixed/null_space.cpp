#include "mixed/null_space.hpp"

#include <cmath>

namespace sm::mixed {
namespace {

constexpr double kDependent = 1e-10;  // of squared lengths
// Pivots below this part of their row's diagonal are hardly more than rounding. Larger ones are real, however small.
constexpr double kNoPivot = 1e-13;

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// Null vectors of a precision that are 1 at one of its null rows and 0 at the others.
Dense unit_null_vectors(const Precision& precision) {
  const std::size_t order = at(precision.order);
  const std::size_t nullity = at(precision.nullity);
  Dense rows(nullity * nullity);
  for (std::size_t j = 0; j < nullity; ++j) {
    for (std::size_t r = 0; r < nullity; ++r) {
      rows[j * nullity + r] = precision.null_basis[j * order + at(precision.null_rows[r])];
    }
  }
  return product(precision.null_basis, inverse_of(rows, nullity), order, nullity, nullity);
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
    const Dense vectors = unit_null_vectors(*term.precision);
    for (std::size_t r = 0; r < at(term.precision->nullity); ++r) {
      const std::size_t first = unknowns_.size();
      for (std::size_t c = 0; c < at(term.k); ++c) {
        unknowns_.push_back(
            {term.first + term.precision->null_rows[r] * term.k + static_cast<std::int64_t>(c), t, c, first});
        std::vector<double> column(at(design.rows()));
        for (std::size_t i = 0; i < column.size(); ++i) {
          column[i] = vectors[r * at(term.precision->order) + at((*term.level)[i])] * term.z[i * at(term.k) + c];
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
  Dense scaled;
  for (std::size_t j = 0; j < view.size(); ++j) {
    for (std::size_t i = 0; i < view.size(); ++i) {
      gram_.push_back(dot(design, view[i], view[j]));
      const double size = std::sqrt(length[i] * length[j]);
      scaled.push_back(size > 0.0 ? gram_.back() / size : 0.0);
    }
  }
  for (const double value : eigensystem(scaled, view.size()).values) rank_ += value > kDependent ? 1 : 0;
}

// The largest pivots of T'HT, H the cross products of the data's view, are those that stay. Where T is nearly singular
// the least of them are rounding in the equations, and go.
std::vector<std::int64_t> NullSpace::superfluous(const Factors& factors) const {
  const std::size_t count = unknowns_.size();
  Dense factor(count * count, 0.0);
  for (std::size_t j = 0; j < count; ++j) {
    const Unknown& unknown = unknowns_[j];
    const std::size_t k = at(design_.terms()[unknown.term].k);
    for (std::size_t a = 0; a < k; ++a) {
      factor[j * count + unknown.first + a] = factors[unknown.term][unknown.coef * k + a];
    }
  }
  Dense left = multiplied(transposed(factor, count, count), multiplied(gram_, factor, count), count);
  const auto diagonal = [&](std::size_t i) { return left[i * count + i]; };
  std::vector<bool> stays(count, false);
  for (std::size_t step = 0; step < rank_; ++step) {
    std::size_t best = count;
    for (std::size_t i = 0; i < count; ++i) {
      if (!stays[i] && (best == count || diagonal(i) > diagonal(best))) best = i;
    }
    const Unknown& unknown = unknowns_[best];
    if (diagonal(best) <= kNoPivot * precision_diagonal(design_.terms()[unknown.term], unknown.place)) break;
    stays[best] = true;
    const Dense column(&left[best * count], &left[best * count] + count);
    for (std::size_t j = 0; j < count; ++j) {
      for (std::size_t i = 0; i < count; ++i) left[j * count + i] -= column[i] * column[j] / column[best];
    }
  }
  std::vector<std::int64_t> rows;
  for (std::size_t i = 0; i < count; ++i) {
    if (!stays[i]) rows.push_back(unknowns_[i].place);
  }
  return rows;
}

}  // namespace sm::mixed
