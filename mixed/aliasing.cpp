// Gram-Schmidt with every projection made twice, which leaves nothing but rounding behind: L. Giraud, J. Langou,
// M. Rozloznik, J. van den Eshof, "Rounding error analysis of the classical Gram-Schmidt orthogonalization process",
// Numer. Math. 101 (2005) 87-100.
#include "mixed/aliasing.hpp"

#include <algorithm>
#include <cmath>
#include <numeric>

namespace sm::mixed {
namespace {

// What is left of a column, relative to the column, when it counts as nothing. Squares and fourth powers of years stay
// above it, sums of columns with 15 digits below.
constexpr double kNothing = 1e-10;
constexpr double kSlack = 1e-11;
constexpr int kLargestDenominator = 60;

using Vector = std::vector<double>;

double dot(const Vector& a, const Vector& b) { return std::inner_product(a.begin(), a.end(), b.begin(), 0.0); }
double norm(const Vector& a) { return std::sqrt(dot(a, a)); }

void subtract(double factor, const Vector& b, Vector& a) {
  for (std::size_t i = 0; i < a.size(); ++i) a[i] -= factor * b[i];
}

// The nearest fraction of small denominator, when there is one that rounding explains.
double tidy(double value) {
  for (int q = 1; q <= kLargestDenominator; ++q) {
    const double p = std::round(value * q);
    if (std::fabs(value * q - p) <= 1e-8 * std::max(1.0, std::fabs(value)) && std::fabs(p) < 1e6) return p / q;
  }
  return value;
}

class Elimination {
 public:
  Elimination(const FixedDesign& design, const Vector& weights) : x_(design.x), weights_(weights) {}

  void run(FixedDesign& design) {
    for (std::int64_t j = 0; j < x_.cols(); ++j) take(j);
    design.kept = std::move(kept_);
    design.aliased = std::move(aliased_);
    const std::size_t rank = design.kept.size();
    design.dependence.assign(rank * design.aliased.size(), 0.0);
    for (std::size_t a = 0; a < design.aliased.size(); ++a) {
      std::copy(dependences_[a].begin(), dependences_[a].end(),
                design.dependence.begin() + static_cast<std::ptrdiff_t>(a * rank));
    }
  }

 private:
  // A column, times the square roots of the weights.
  Vector column(std::int64_t j) const {
    Vector values(static_cast<std::size_t>(x_.rows), 0.0);
    add_column(1.0, j, values);
    return values;
  }

  void add_column(double factor, std::int64_t j, Vector& values) const {
    for (auto p = static_cast<std::size_t>(x_.start[static_cast<std::size_t>(j)]);
         p < static_cast<std::size_t>(x_.start[static_cast<std::size_t>(j) + 1]); ++p) {
      const auto row = static_cast<std::size_t>(x_.row[p]);
      values[row] += factor * x_.value[p] * (weights_.empty() ? 1.0 : std::sqrt(weights_[row]));
    }
  }

  // Projections of `values` on the directions so far, which are taken off it.
  Vector project(Vector& values) const {
    Vector parts(directions_.size(), 0.0);
    for (int pass = 0; pass < 2; ++pass) {
      for (std::size_t k = 0; k < directions_.size(); ++k) {
        const double part = dot(directions_[k], values);
        subtract(part, directions_[k], values);
        parts[k] += part;
      }
    }
    return parts;
  }

  void take(std::int64_t j) {
    Vector left = column(j);
    const double size = norm(left);
    Vector parts = project(left);
    const double rest = norm(left);
    if (rest <= kNothing * size) {
      aliased_.push_back(j);
      dependences_.push_back(dependence(j, size, parts));
      return;
    }
    kept_.push_back(j);
    sizes_.push_back(size);
    for (double& value : left) value /= rest;
    directions_.push_back(std::move(left));
    parts.push_back(rest);
    triangle_.push_back(std::move(parts));
  }

  // R b = parts, R the triangle whose columns are the projections of the kept columns.
  Vector solve(Vector parts) const {
    for (std::size_t k = parts.size(); k-- > 0;) {
      parts[k] /= triangle_[k][k];
      for (std::size_t i = 0; i < k; ++i) parts[i] -= triangle_[k][i] * parts[k];
    }
    return parts;
  }

  Vector residual(std::int64_t j, const Vector& b) const {
    Vector left = column(j);
    for (std::size_t k = 0; k < b.size(); ++k) {
      if (b[k] != 0.0) add_column(-b[k], kept_[k], left);
    }
    return left;
  }

  Vector dependence(std::int64_t j, double size, const Vector& parts) const {
    Vector b = solve(parts);
    if (size == 0.0) return Vector(b.size(), 0.0);
    Vector left = residual(j, b);
    const Vector correction = solve(project(left));
    for (std::size_t k = 0; k < b.size(); ++k) b[k] += correction[k];
    for (std::size_t k = 0; k < b.size(); ++k) {
      if (std::fabs(b[k]) * sizes_[k] <= kNothing * size) b[k] = 0.0;
    }
    // Fractions, if the column is met by them as well as by what was computed.
    Vector clean = b;
    for (double& value : clean) value = tidy(value);
    const double before = norm(residual(j, b));
    return norm(residual(j, clean)) <= std::max(10.0 * before, kSlack * size) ? clean : b;
  }

  const SparseColumns& x_;
  const Vector& weights_;
  std::vector<std::int64_t> kept_;
  std::vector<std::int64_t> aliased_;
  std::vector<Vector> dependences_;
  std::vector<Vector> directions_;  // orthonormal
  std::vector<Vector> triangle_;    // column k: the parts of kept column k
  Vector sizes_;
};

}  // namespace

void find_aliased(FixedDesign& design, const std::vector<double>& weights) { Elimination(design, weights).run(design); }

}  // namespace sm::mixed
