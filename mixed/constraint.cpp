#include "mixed/constraint.hpp"

#include "mixed/dense.hpp"

namespace sm::mixed {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// What the unit vector of a dropped row loses on its way through C and C^-.
Dense null_vectors(Equations& equations) {
  const std::vector<std::int64_t>& dropped = equations.dropped();
  const std::size_t order = at(equations.order());
  const auto count = static_cast<std::int64_t>(dropped.size());
  Dense vectors(order * dropped.size(), 0.0);
  for (std::size_t v = 0; v < dropped.size(); ++v) vectors[v * order + at(dropped[v])] = 1.0;
  const Dense there_and_back = equations.solve(equations.product(vectors, count), count);
  for (std::size_t i = 0; i < vectors.size(); ++i) vectors[i] -= there_and_back[i];
  return vectors;
}

Dense beside(Dense left, const Dense& right) {
  left.insert(left.end(), right.begin(), right.end());
  return left;
}

}  // namespace

Constraint::Constraint(const ScaledDesign& design) {
  for (const DesignTerm& term : design.terms()) {
    if (!term.precision || term.precision->nullity == 0) continue;
    const Precision& precision = *term.precision;
    const auto order = at(precision.order);
    for (std::size_t v = 0; v < at(precision.nullity); ++v) {
      const double* const vector = &precision.null_basis[v * order];
      for (std::size_t c = 0; c < at(term.k); ++c) {
        vectors_.push_back({at(term.first) + c, at(term.k), {vector, vector + order}});
      }
    }
  }
}

std::vector<double> Constraint::products(std::span<const double> x) const {
  std::vector<double> result;
  for (const NullVector& vector : vectors_) {
    double sum = 0.0;
    for (std::size_t l = 0; l < vector.value.size(); ++l) sum += vector.value[l] * x[vector.first + l * vector.stride];
    result.push_back(sum);
  }
  return result;
}

// Solutions are C^- b + V a + C^- A c, V the null vectors of C, one for each dropped row. With P = A'V and S = A'C^-A,
// c in the complement Q of the range of P, the constraint is [P SQ] (a, c) = -A'C^- b, and the determinant of C on the
// vectors that obey it is that of the accepted pivots times |P'P| |Q'SQ|.
void Constraint::prepare(Equations& equations) {
  if (empty()) return;
  order_ = at(equations.order());
  const std::size_t count = vectors_.size();
  Dense a(order_ * count, 0.0);
  for (std::size_t v = 0; v < count; ++v) {
    const NullVector& vector = vectors_[v];
    for (std::size_t l = 0; l < vector.value.size(); ++l) {
      a[v * order_ + vector.first + l * vector.stride] = vector.value[l];
    }
  }
  const auto products_with = [&](const Dense& x) {
    Dense result;
    for (std::size_t first = 0; first < x.size(); first += order_) {
      result = beside(std::move(result), products({&x[first], order_}));
    }
    return result;
  };
  inverse_ = equations.solve(a, static_cast<std::int64_t>(count));
  between_ = products_with(inverse_);
  const Dense null = null_vectors(equations);
  const Dense p = products_with(null);

  const std::size_t dropped = p.size() / count;
  const std::size_t left = count - dropped;
  const Dense q = complement(p, count, dropped);
  const Dense moves = beside(null, product(inverse_, q, order_, count, left));
  const Dense between_q = product(between_, q, count, count, left);
  const Dense across = beside(p, between_q);
  shift_ = product(moves, inverse_of(across, count), order_, count, count);
  log_det_ = log_abs_det(product(transposed(p, count, dropped), p, dropped, count, dropped), dropped) +
             log_abs_det(product(transposed(q, count, left), between_q, left, count, left), left);
}

void Constraint::apply(std::span<double> solutions) const {
  if (empty()) return;
  for (std::size_t first = 0; first < solutions.size(); first += order_) {
    const std::span<double> x = solutions.subspan(first, order_);
    const std::vector<double> product = products(x);
    for (std::size_t v = 0; v < product.size(); ++v) {
      for (std::size_t i = 0; i < order_; ++i) x[i] -= shift_[v * order_ + i] * product[v];
    }
  }
}

void Constraint::apply_transposed(std::span<double> right) const {
  if (empty()) return;
  for (std::size_t first = 0; first < right.size(); first += order_) {
    std::vector<double> products;
    for (std::size_t v = 0; v < vectors_.size(); ++v) {
      double sum = 0.0;
      for (std::size_t i = 0; i < order_; ++i) sum += shift_[v * order_ + i] * right[first + i];
      products.push_back(sum);
    }
    for (std::size_t v = 0; v < vectors_.size(); ++v) {
      const NullVector& vector = vectors_[v];
      for (std::size_t l = 0; l < vector.value.size(); ++l) {
        right[first + vector.first + l * vector.stride] -= vector.value[l] * products[v];
      }
    }
  }
}

double Constraint::covariance(std::size_t i, std::size_t j) const {
  double sum = 0.0;
  const std::size_t count = vectors_.size();
  for (std::size_t v = 0; v < count; ++v) {
    sum -= shift_[v * order_ + i] * inverse_[v * order_ + j] + inverse_[v * order_ + i] * shift_[v * order_ + j];
    for (std::size_t u = 0; u < count; ++u) {
      sum += shift_[v * order_ + i] * between_[u * count + v] * shift_[u * order_ + j];
    }
  }
  return sum;
}

}  // namespace sm::mixed
