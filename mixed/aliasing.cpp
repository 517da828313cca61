// Modified Gram-Schmidt, whose triangle is as good as that of Householder's: A. Bjorck, "Solving linear least squares
// problems by Gram-Schmidt orthogonalization", BIT 7 (1967) 1-21. A column that its projections have made much shorter is
// projected once more: J. W. Daniel, W. B. Gragg, L. Kaufman, G. W. Stewart, "Reorthogonalization and stable algorithms
// for updating the Gram-Schmidt QR factorization", Math. Comp. 30 (1976) 772-795. What is left of a column tells whether
// it depends on those before; that all directions are orthogonal to the last digit is not needed for it.
#include "mixed/aliasing.hpp"

#include <algorithm>
#include <array>
#include <cmath>

#include "mixed/alias_roads.hpp"
#include "mixed/vectors.hpp"

namespace sm::mixed {
namespace {

constexpr double kSlack = 1e-11;
constexpr double kDoubtful = 1e-4;  // what is left of a column when it is looked at twice
constexpr double kShortened = 0.7;  // what is left of a column when it is projected twice
constexpr int kLargestDenominator = 60;
constexpr double kSmallPart = 1e-8;  // of a null vector: rounding
// Beyond these the columns are not held as a dense array.
constexpr double kMostNumbers = 2e7;
constexpr double kMostWork = 3e8;

using Vector = std::vector<double>;

void subtract(double factor, const Vector& b, Vector& a) {
  for (std::size_t i = 0; i < a.size(); ++i) a[i] -= factor * b[i];
}

// Both in one pass: a -= factor * b, and then the product of a with c.
double subtract_and_multiply(double factor, const Vector& b, Vector& a, const Vector& c) {
  double sum = 0.0;
  for (std::size_t i = 0; i < a.size(); ++i) {
    a[i] -= factor * b[i];
    sum += c[i] * a[i];
  }
  return sum;
}

// The nearest fraction of small denominator, when there is one that rounding explains.
double nearest_fraction(double value) {
  for (int q = 1; q <= kLargestDenominator; ++q) {
    const double p = std::round(value * q);
    if (std::fabs(value * q - p) <= std::min(1e-8 * std::max(1.0, std::fabs(value)), 1e-3)) return p / q;
  }
  return value;
}

// The norm of column j less a combination of the kept ones, at the cost of the entries of those that take part.
class Residual {
 public:
  explicit Residual(const WeightedColumns& x) : x_(x), work_(static_cast<std::size_t>(x.rows()), 0.0) {}

  double norm(std::int64_t j, const std::vector<std::int64_t>& kept, const Vector& b) {
    x_.add(1.0, j, work_);
    for (std::size_t k = 0; k < b.size(); ++k) {
      if (b[k] != 0.0) x_.add(-b[k], kept[k], work_);
    }
    double sum = take(j);
    for (std::size_t k = 0; k < b.size(); ++k) {
      if (b[k] != 0.0) sum += take(kept[k]);
    }
    return std::sqrt(sum);
  }

 private:
  double take(std::int64_t j) {
    double sum = 0.0;
    x_.for_each(j, [&](std::size_t row, double) {
      sum += work_[row] * work_[row];
      work_[row] = 0.0;
    });
    return sum;
  }

  const WeightedColumns& x_;
  Vector work_;
};

// A few columns side by side, so that the sums of one need not wait for each other.
class ColumnGroup {
 public:
  static constexpr std::size_t kColumns = 4;
  using Parts = std::array<double, kColumns>;

  // Columns from `first` on, zeros past the last.
  ColumnGroup(const WeightedColumns& x, std::int64_t first) : values_(static_cast<std::size_t>(x.rows())) {
    for (std::size_t c = 0; c < kColumns && first + static_cast<std::int64_t>(c) < x.cols(); ++c) {
      x.for_each(first + static_cast<std::int64_t>(c),
                 [&](std::size_t row, double value) { values_[row][c] += value; });
    }
  }

  // Takes the projections on the directions off, one after the other, and answers them.
  std::vector<Parts> project(const std::vector<Vector>& directions) {
    std::vector<Parts> parts(directions.size());
    if (directions.empty()) return parts;
    const std::size_t last = directions.size() - 1;
    Parts part{};
    for (std::size_t i = 0; i < values_.size(); ++i) {
      for (std::size_t c = 0; c < kColumns; ++c) part[c] += directions[0][i] * values_[i][c];
    }
    for (std::size_t k = 0; k < last; ++k) {
      parts[k] = part;
      part = subtract_and_multiply(part, directions[k], directions[k + 1]);
    }
    parts[last] = part;
    for (std::size_t i = 0; i < values_.size(); ++i) {
      for (std::size_t c = 0; c < kColumns; ++c) values_[i][c] -= part[c] * directions[last][i];
    }
    return parts;
  }

  Vector column(std::size_t c) const {
    Vector values(values_.size());
    for (std::size_t i = 0; i < values.size(); ++i) values[i] = values_[i][c];
    return values;
  }

 private:
  Parts subtract_and_multiply(const Parts& factors, const Vector& b, const Vector& next) {
    Parts sums{};
    for (std::size_t i = 0; i < values_.size(); ++i) {
      Parts& row = values_[i];
      for (std::size_t c = 0; c < kColumns; ++c) {
        row[c] -= factors[c] * b[i];
        sums[c] += next[i] * row[c];
      }
    }
    return sums;
  }

  std::vector<Parts> values_;  // of a row
};

class GramSchmidt {
 public:
  explicit GramSchmidt(const WeightedColumns& x) : x_(x) {}

  Dependences run() {
    constexpr auto kColumns = static_cast<std::int64_t>(ColumnGroup::kColumns);
    for (std::int64_t first = 0; first < x_.cols(); first += kColumns) {
      ColumnGroup group(x_, first);
      const std::vector<ColumnGroup::Parts> shared = group.project(directions_);
      for (std::int64_t c = 0; c < kColumns && first + c < x_.cols(); ++c) {
        Vector parts;
        for (const ColumnGroup::Parts& part : shared) parts.push_back(part[static_cast<std::size_t>(c)]);
        take(first + c, group.column(static_cast<std::size_t>(c)), std::move(parts));
      }
    }
    for (Vector& dependence : found_.dependence) dependence.resize(found_.kept.size(), 0.0);
    return std::move(found_);
  }

 private:
  // Takes the projections of `values` on the directions from `first` on off it, and adds them to the parts.
  void project(std::size_t first, Vector& values, Vector& parts) const {
    const std::size_t count = directions_.size();
    parts.resize(count, 0.0);
    if (first == count) return;
    double part = dot(directions_[first], values);
    for (std::size_t k = first; k + 1 < count; ++k) {
      parts[k] += part;
      part = subtract_and_multiply(part, directions_[k], values, directions_[k + 1]);
    }
    parts[count - 1] += part;
    subtract(part, directions_[count - 1], values);
  }

  // Column j: what the directions that were there when its group was begun have left of it, and its parts in them.
  void take(std::int64_t j, Vector left, Vector parts) {
    const double size = x_.norm(j);
    project(parts.size(), left, parts);
    double rest = norm(left);
    if (rest <= kShortened * size) {
      project(0, left, parts);
      rest = norm(left);
    }
    if (rest <= kDoubtful * size) {
      Vector b = dependence(j, parts);
      if (rest <= kNothing * size + kRounding * sum_of_lengths(b)) {
        found_.aliased.push_back(j);
        found_.dependence.push_back(std::move(b));
        return;
      }
    }
    sizes_.push_back(size);
    found_.kept.push_back(j);
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

  Vector dependence(std::int64_t j, Vector parts) const {
    Vector b = solve(std::move(parts));
    Vector left = x_.column(j);
    for (std::size_t k = 0; k < b.size(); ++k) x_.add(-b[k], found_.kept[k], left);
    Vector correction;
    for (int pass = 0; pass < 2; ++pass) project(0, left, correction);
    correction = solve(std::move(correction));
    for (std::size_t k = 0; k < b.size(); ++k) b[k] += correction[k];
    return b;
  }

  double sum_of_lengths(const Vector& b) const {
    double sum = 0.0;
    for (std::size_t k = 0; k < b.size(); ++k) sum += std::fabs(b[k]) * sizes_[k];
    return sum;
  }

  const WeightedColumns& x_;
  Dependences found_;
  Vector sizes_;                    // of the kept columns
  std::vector<Vector> directions_;  // of length one, orthogonal but for rounding
  std::vector<Vector> triangle_;    // column k: the parts of kept column k
};

}  // namespace

WeightedColumns::WeightedColumns(const SparseColumns& x, const std::vector<double>& weights) : x_(x) {
  roots_.reserve(weights.size());
  for (const double weight : weights) roots_.push_back(std::sqrt(weight));
}

std::int64_t WeightedColumns::entries(std::int64_t j) const {
  return x_.start[static_cast<std::size_t>(j) + 1] - x_.start[static_cast<std::size_t>(j)];
}

double WeightedColumns::norm(std::int64_t j) const {
  double sum = 0.0;
  for_each(j, [&](std::size_t, double value) { sum += value * value; });
  return std::sqrt(sum);
}

std::vector<double> WeightedColumns::column(std::int64_t j) const {
  Vector values(static_cast<std::size_t>(x_.rows), 0.0);
  add(1.0, j, values);
  return values;
}

void WeightedColumns::add(double factor, std::int64_t j, std::vector<double>& values) const {
  for_each(j, [&](std::size_t row, double value) { values[row] += factor * value; });
}

Dependences dense_dependences(const WeightedColumns& x) { return GramSchmidt(x).run(); }

Dependences last_columns(std::vector<std::vector<double>> null, const std::vector<double>& sizes) {
  for (Vector& vector : null) {
    double largest = 0.0;
    for (std::size_t j = 0; j < vector.size(); ++j) largest = std::max(largest, std::fabs(vector[j] *= sizes[j]));
    for (double& value : vector) value /= largest;
  }
  std::vector<std::int64_t> pivot(null.size(), -1);
  for (std::size_t j = sizes.size(); j-- > 0;) {
    std::size_t best = null.size();
    for (std::size_t v = 0; v < null.size(); ++v) {
      if (pivot[v] >= 0 || std::fabs(null[v][j]) <= kSmallPart) continue;
      if (best == null.size() || std::fabs(null[v][j]) > std::fabs(null[best][j])) best = v;
    }
    if (best == null.size()) continue;
    pivot[best] = static_cast<std::int64_t>(j);
    const double value = null[best][j];
    for (double& part : null[best]) part /= value;
    for (std::size_t v = 0; v < null.size(); ++v) {
      const double part = null[v][j];
      if (v == best || part == 0.0) continue;
      for (std::size_t k = 0; k <= j; ++k) null[v][k] -= part * null[best][k];
      null[v][j] = 0.0;
    }
  }
  Dependences found;
  for (std::size_t j = 0; j < sizes.size(); ++j) {
    const bool aliased = std::find(pivot.begin(), pivot.end(), static_cast<std::int64_t>(j)) != pivot.end();
    (aliased ? found.aliased : found.kept).push_back(static_cast<std::int64_t>(j));
  }
  for (const std::int64_t a : found.aliased) {
    const Vector& vector = null[static_cast<std::size_t>(std::find(pivot.begin(), pivot.end(), a) - pivot.begin())];
    Vector dependence;
    for (const std::int64_t k : found.kept) {
      const auto at = static_cast<std::size_t>(k);
      dependence.push_back(-vector[at] * sizes[static_cast<std::size_t>(a)] / sizes[at]);
    }
    found.dependence.push_back(std::move(dependence));
  }
  return found;
}

void tidy(const WeightedColumns& x, Dependences& found) {
  Residual residual(x);
  Vector sizes;
  for (const std::int64_t k : found.kept) sizes.push_back(x.norm(k));
  for (std::size_t a = 0; a < found.aliased.size(); ++a) {
    Vector& b = found.dependence[a];
    const double size = x.norm(found.aliased[a]);
    double felt = kNothing * size;
    for (std::size_t k = 0; k < b.size(); ++k) felt += kRounding * std::fabs(b[k]) * sizes[k];
    for (std::size_t k = 0; k < b.size(); ++k) {
      if (std::fabs(b[k]) * sizes[k] <= felt) b[k] = 0.0;
    }
    Vector clean = b;
    for (double& value : clean) value = nearest_fraction(value);
    if (clean == b) continue;
    const double after = residual.norm(found.aliased[a], found.kept, clean);
    if (after <= kSlack * size || after <= 10.0 * residual.norm(found.aliased[a], found.kept, b)) b = std::move(clean);
  }
}

void find_aliased(FixedDesign& design, const std::vector<double>& weights) {
  const WeightedColumns x(design.x, weights);
  const double numbers = static_cast<double>(x.rows()) * static_cast<double>(x.cols());
  const bool small = numbers <= kMostNumbers && numbers * static_cast<double>(x.cols()) <= kMostWork;
  Dependences found = small ? dense_dependences(x) : sparse_dependences(x, design.term);
  tidy(x, found);
  design.kept = std::move(found.kept);
  design.aliased = std::move(found.aliased);
  design.dependence.clear();
  for (const Vector& dependence : found.dependence) {
    design.dependence.insert(design.dependence.end(), dependence.begin(), dependence.end());
  }
}

}  // namespace sm::mixed
