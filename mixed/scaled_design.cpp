#include "mixed/scaled_design.hpp"

#include <algorithm>
#include <cmath>

namespace sm::mixed {
namespace {

// A column keeps so little of its length outside the span of others that what is left is rounding.
constexpr long double kNothingLeft = 1e-9L;

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

}  // namespace

std::vector<double> FixedBasis::solve(std::span<const double> transformed) const {
  std::vector<long double> left(transformed.begin(), transformed.end());
  std::vector<double> x(left.size());
  for (std::size_t j = left.size(); j-- > 0;) {
    const long double value = left[j] / norm[j];
    x[j] = static_cast<double>(value);
    for (const Part& part : above[j]) left[at(part.column)] -= part.factor * value;
  }
  return x;
}

std::vector<double> FixedBasis::solve_transposed(std::span<const double> combination) const {
  std::vector<long double> x(combination.begin(), combination.end());
  for (std::size_t j = 0; j < x.size(); ++j) {
    for (const Part& part : above[j]) x[j] -= part.factor * x[at(part.column)];
    x[j] /= norm[j];
  }
  return {x.begin(), x.end()};
}

ScaledDesign::ScaledDesign(const Model& model) : model_(model) {
  for (const RandomTerm& term : model.random) transform_term(term);
  for (const double w : model.weights) log_weights_ += std::log(w);
  transform_fixed();
  store_rows();
}

// Gram and Schmidt on the coefficients' covariates, so that the mean square of each is 1.
void ScaledDesign::transform_term(const RandomTerm& term) {
  DesignTerm made;
  made.k = term.coef_count();
  made.levels = term.level_count();
  made.first = random_count_;
  made.level = &term.level;
  made.precision = term.precision.get();
  random_count_ += made.k * made.levels;
  const auto k = at(made.k);
  const std::size_t n = term.level.size();
  const std::vector<double>& z = term.z;
  made.z.resize(n * k);
  std::vector<long double> basis(k * k, 0.0L);
  std::vector<long double> column(n);
  for (std::size_t c = 0; c < k; ++c) {
    long double before = 0.0L;
    for (std::size_t i = 0; i < n; ++i) {
      column[i] = z[i * k + c];
      before += weight(i) * column[i] * column[i];
    }
    basis[c * k + c] = 1.0L;
    for (std::size_t d = 0; d < c; ++d) {
      long double dot = 0.0L;
      for (std::size_t i = 0; i < n; ++i) dot += weight(i) * made.z[i * k + d] * column[i];
      dot /= static_cast<long double>(n);
      for (std::size_t i = 0; i < n; ++i) column[i] -= dot * made.z[i * k + d];
      for (std::size_t e = 0; e <= d; ++e) basis[c * k + e] -= dot * basis[d * k + e];
    }
    long double after = 0.0L;
    for (std::size_t i = 0; i < n; ++i) after += weight(i) * column[i] * column[i];
    if (after <= kNothingLeft * kNothingLeft * before) {
      after = before;
      std::fill_n(basis.begin() + static_cast<std::ptrdiff_t>(c * k), k, 0.0L);
      basis[c * k + c] = 1.0L;
      for (std::size_t i = 0; i < n; ++i) column[i] = z[i * k + c];
    }
    const long double scale = after > 0.0L ? std::sqrt(static_cast<long double>(n) / after) : 1.0L;
    for (std::size_t e = 0; e <= c; ++e) basis[c * k + e] *= scale;
    for (std::size_t i = 0; i < n; ++i) made.z[i * k + c] = static_cast<double>(column[i] * scale);
  }
  made.basis.assign(basis.begin(), basis.end());
  terms_.push_back(std::move(made));
}

namespace {

// Columns of X as they are made orthogonal, one at a time, in a dense vector of extended precision.
class Orthogonalizer {
 public:
  explicit Orthogonalizer(const ScaledDesign& design, SparseColumns& made) : design_(design), made_(made) {
    column_.resize(at(made.rows));
  }

  void load(const SparseColumns& x, std::int64_t j) {
    rows_.clear();
    for (std::int64_t p = x.start[at(j)]; p < x.start[at(j) + 1]; ++p) {
      rows_.push_back(x.row[at(p)]);
      column_[at(x.row[at(p)])] = x.value[at(p)];
    }
  }

  // Takes out of the column what lies along column i of those made.
  long double project(std::int64_t i) {
    const auto begin = at(made_.start[at(i)]);
    const auto end = at(made_.start[at(i) + 1]);
    long double dot = 0.0L;
    for (std::size_t p = begin; p < end; ++p) {
      const auto row = at(made_.row[p]);
      dot += design_.weight(row) * made_.value[p] * column_[row];
    }
    if (dot == 0.0L) return 0.0L;
    for (std::size_t p = begin; p < end; ++p) column_[at(made_.row[p])] -= dot * made_.value[p];
    merge(begin, end);
    return dot;
  }

  long double norm() const {
    long double sum = 0.0L;
    for (const std::int64_t row : rows_) sum += design_.weight(at(row)) * column_[at(row)] * column_[at(row)];
    return std::sqrt(sum);
  }

  void store(long double norm) {
    for (const std::int64_t row : rows_) {
      made_.row.push_back(row);
      made_.value.push_back(static_cast<double>(column_[at(row)] / norm));
      column_[at(row)] = 0.0L;
    }
    made_.start.push_back(static_cast<std::int64_t>(made_.row.size()));
  }

 private:
  void merge(std::size_t begin, std::size_t end) {
    merged_.clear();
    std::set_union(rows_.begin(), rows_.end(), made_.row.begin() + static_cast<std::ptrdiff_t>(begin),
                   made_.row.begin() + static_cast<std::ptrdiff_t>(end), std::back_inserter(merged_));
    rows_.swap(merged_);
  }

  const ScaledDesign& design_;
  SparseColumns& made_;
  std::vector<long double> column_;
  std::vector<std::int64_t> rows_;
  std::vector<std::int64_t> merged_;
};

std::int64_t entries_of(const SparseColumns& x, std::int64_t j) { return x.start[at(j) + 1] - x.start[at(j)]; }

bool is_indicator(const SparseColumns& x, std::int64_t j) {
  const auto begin = x.value.begin() + x.start[at(j)];
  const auto end = x.value.begin() + x.start[at(j) + 1];
  return std::all_of(begin, end, [&](double v) { return v == *begin; });
}

}  // namespace

void ScaledDesign::transform_fixed() {
  constexpr std::size_t kTargets = 256;  // columns that others are made orthogonal to; more would take too long
  const SparseColumns& x = model_.fixed.x;
  const std::int64_t n = rows();
  x_.rows = n;
  basis_.above.resize(at(x.cols()));
  basis_.norm.resize(at(x.cols()));
  std::vector<std::int64_t> well_filled;
  Orthogonalizer work(*this, x_);
  for (std::int64_t j = 0; j < x.cols(); ++j) {
    work.load(x, j);
    const bool filled = entries_of(x, j) * 50 >= n;
    const bool kept = std::binary_search(model_.fixed.kept.begin(), model_.fixed.kept.end(), j);
    if (filled && kept && !is_indicator(x, j)) {
      for (const std::int64_t i : well_filled) {
        if (entries_of(x_, i) > 4 * entries_of(x, j)) continue;
        const long double factor = work.project(i);
        if (factor != 0.0L) basis_.above[at(j)].push_back({i, factor});
      }
    }
    const long double norm = work.norm();
    basis_.norm[at(j)] = norm > 0.0L ? norm : 1.0L;
    work.store(basis_.norm[at(j)]);
    if (filled && kept && well_filled.size() < kTargets) well_filled.push_back(j);
  }
  take_fit_out(well_filled);
}

void ScaledDesign::take_fit_out(const std::vector<std::int64_t>& well_filled) {
  std::vector<long double> left(model_.y.begin(), model_.y.end());
  offset_.assign(at(fixed_count()), 0.0);
  for (const std::int64_t j : well_filled) {
    long double dot = 0.0L;
    const auto begin = at(x_.start[at(j)]);
    const auto end = at(x_.start[at(j) + 1]);
    for (std::size_t p = begin; p < end; ++p) dot += weight(at(x_.row[p])) * x_.value[p] * left[at(x_.row[p])];
    offset_[at(j)] = static_cast<double>(dot);
    for (std::size_t p = begin; p < end; ++p)
      left[at(x_.row[p])] -= static_cast<long double>(offset_[at(j)]) * x_.value[p];
  }
  y_.assign(left.begin(), left.end());
}

void ScaledDesign::store_rows() {
  const std::size_t n = at(rows());
  row_start_.assign(n + 1, 0);
  for (const std::int64_t row : x_.row) ++row_start_[at(row) + 1];
  for (std::size_t i = 0; i < n; ++i) row_start_[i + 1] += row_start_[i];
  row_col_.resize(x_.row.size());
  row_value_.resize(x_.row.size());
  std::vector<std::int64_t> next(row_start_.begin(), row_start_.end() - 1);
  for (std::int64_t j = 0; j < x_.cols(); ++j) {
    for (auto p = at(x_.start[at(j)]); p < at(x_.start[at(j) + 1]); ++p) {
      const auto place = at(next[at(x_.row[p])]++);
      row_col_[place] = static_cast<std::int32_t>(j);
      row_value_[place] = x_.value[p];
    }
  }
}

void ScaledDesign::subtract_product(std::span<const double> v, std::span<double> r) const {
  for (const DesignTerm& term : terms_) {
    const auto k = at(term.k);
    for (std::size_t i = 0; i < r.size(); ++i) {
      const double* const effect = &v[at(term.first) + at((*term.level)[i]) * k];
      double sum = 0.0;
      for (std::size_t c = 0; c < k; ++c) sum += term.z[i * k + c] * effect[c];
      r[i] -= sum;
    }
  }
  const std::span<const double> beta = v.subspan(at(random_count_));
  for (std::size_t i = 0; i < r.size(); ++i) {
    double sum = 0.0;
    for (auto p = at(row_start_[i]); p < at(row_start_[i + 1]); ++p) sum += row_value_[p] * beta[at(row_col_[p])];
    r[i] -= sum;
  }
}

void ScaledDesign::weigh(std::span<double> r) const {
  if (model_.weights.empty()) return;
  for (std::size_t i = 0; i < r.size(); ++i) r[i] *= model_.weights[i];
}

std::vector<double> ScaledDesign::transposed_product(std::span<const double> r) const {
  std::vector<double> out(at(unknowns()), 0.0);
  for (const DesignTerm& term : terms_) {
    const auto k = at(term.k);
    if (k == 1) {
      for (std::size_t i = 0; i < r.size(); ++i) out[at(term.first + (*term.level)[i])] += term.z[i] * r[i];
      continue;
    }
    for (std::size_t i = 0; i < r.size(); ++i) {
      double* const effect = &out[at(term.first) + at((*term.level)[i]) * k];
      for (std::size_t c = 0; c < k; ++c) effect[c] += term.z[i * k + c] * r[i];
    }
  }
  double* const fixed = out.data() + random_count_;
  for (std::size_t i = 0; i < r.size(); ++i) {
    for (auto p = at(row_start_[i]); p < at(row_start_[i + 1]); ++p) fixed[row_col_[p]] += row_value_[p] * r[i];
  }
  return out;
}

namespace {

// v_l <- T v_l for each level of each term, or T' v_l.
template <bool transposed>
void multiply_levels(const ScaledDesign& design, const Factors& factors, std::span<double> v) {
  std::vector<double> result;
  for (std::size_t t = 0; t < factors.size(); ++t) {
    const DesignTerm& term = design.terms()[t];
    const auto k = at(term.k);
    const std::vector<double>& factor = factors[t];
    result.resize(k);
    for (std::int64_t l = 0; l < term.levels; ++l) {
      double* const part = &v[at(term.first + l * term.k)];
      for (std::size_t a = 0; a < k; ++a) {
        result[a] = 0.0;
        for (std::size_t c = 0; c < k; ++c) result[a] += (transposed ? factor[a * k + c] : factor[c * k + a]) * part[c];
      }
      std::copy(result.begin(), result.end(), part);
    }
  }
}

}  // namespace

void multiply_factors(const ScaledDesign& design, const Factors& factors, std::span<double> v) {
  multiply_levels<false>(design, factors, v);
}

void multiply_factors_transposed(const ScaledDesign& design, const Factors& factors, std::span<double> v) {
  multiply_levels<true>(design, factors, v);
}

void add_precision_product(const ScaledDesign& design, std::span<const double> v, double scale, std::span<double> y) {
  for (const DesignTerm& term : design.terms()) {
    const auto k = at(term.k);
    const std::size_t first = at(term.first);
    if (!term.precision) {
      for (std::size_t i = first; i < first + at(term.levels) * k; ++i) y[i] += scale * v[i];
      continue;
    }
    const Precision& precision = *term.precision;
    for (std::size_t i = 0; i < at(term.levels); ++i) {
      for (auto p = at(precision.row_start[i]); p < at(precision.row_start[i + 1]); ++p) {
        const std::size_t j = at(precision.col[p]);
        const double element = scale * precision.value[p];
        for (std::size_t c = 0; c < k; ++c) {
          y[first + i * k + c] += element * v[first + j * k + c];
          if (j != i) y[first + j * k + c] += element * v[first + i * k + c];
        }
      }
    }
  }
}

}  // namespace sm::mixed
