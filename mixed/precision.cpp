#include "mixed/precision.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <utility>

namespace sm::mixed {
namespace {

// How far a dropped row may be from a combination of the others, as a part of the sizes that are added up in it. What
// the module drops without a word reaches further: pivots down to -0.1.
constexpr double kDependent = 1e-8;

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

std::string row_text(const MatrixNames& names, std::int64_t row) {
  return fmt::format("row {} ({})", row + 1, names.ids[at(row)]);
}

// The entry at (row, col), 0 where there is none.
double entry(const SparseColumns& k, std::int64_t row, std::int64_t col) {
  const auto begin = k.row.begin() + k.start[at(col)];
  const auto end = k.row.begin() + k.start[at(col) + 1];
  const auto found = std::lower_bound(begin, end, row);
  return found == end || *found != row ? 0.0 : k.value[at(found - k.row.begin())];
}

void require_symmetric(const SparseColumns& k, const MatrixNames& names) {
  if (k.rows != k.cols() || k.rows == 0) {
    throw ModelError({.file = names.file,
                      .what = fmt::format("found {} rows and {} columns", k.rows, k.cols()),
                      .expected = "a square matrix with a row for each level",
                      .advice = "give the precision matrix of the levels"});
  }
  for (std::int64_t j = 0; j < k.cols(); ++j) {
    for (std::int64_t p = k.start[at(j)]; p < k.start[at(j) + 1]; ++p) {
      const std::int64_t i = k.row[at(p)];
      const double mirrored = entry(k, j, i);
      if (k.value[at(p)] == mirrored) continue;
      throw ModelError({.file = names.file,
                        .what = fmt::format("found {} at ({}, {}) and {} at ({}, {})", k.value[at(p)], i + 1, j + 1,
                                            mirrored, j + 1, i + 1),
                        .expected = "a symmetric matrix",
                        .advice = "make the two equal, or write one triangle and symmetric in line 1"});
    }
  }
}

[[noreturn]] void refuse_indefinite(const MatrixNames& names, std::string what) {
  throw NotSemidefinite({.file = names.file,
                         .what = std::move(what),
                         .expected = "a positive semidefinite matrix",
                         .advice = "give the inverse of a covariance matrix, with all digits (17)"});
}

void require_diagonal(const SparseColumns& k, const MatrixNames& names) {
  for (std::int64_t i = 0; i < k.rows; ++i) {
    const double diagonal = entry(k, i, i);
    if (diagonal < 0.0)
      refuse_indefinite(names, fmt::format("{} has {} on the diagonal", row_text(names, i), diagonal));
  }
}

// The lower triangle by columns is the upper one by rows.
void copy_triangle(const SparseColumns& k, Precision& precision) {
  precision.order = k.rows;
  precision.row_start.assign(1, 0);
  for (std::int64_t j = 0; j < k.cols(); ++j) {
    precision.col.push_back(j);
    precision.value.push_back(entry(k, j, j));
    for (std::int64_t p = k.start[at(j)]; p < k.start[at(j) + 1]; ++p) {
      if (k.row[at(p)] <= j || k.value[at(p)] == 0.0) continue;
      precision.col.push_back(k.row[at(p)]);
      precision.value.push_back(k.value[at(p)]);
    }
    precision.row_start.push_back(static_cast<std::int64_t>(precision.col.size()));
  }
}

// The matrix in the module, with its factor.
class Factored {
 public:
  Factored(const Module& module, const Precision& precision, const MatrixNames& names) : module_(module) {
    try {
      enter(precision);
      factor(names);
    } catch (...) {
      release();
      throw;
    }
  }
  ~Factored() { release(); }
  Factored(const Factored&) = delete;
  Factored& operator=(const Factored&) = delete;

  double log_determinant() const {
    double value = 0.0;
    module_.expect_ok(module_.fn().qxsmlogdet(matrix_, &value), "reading the log-determinant of a precision");
    return value;
  }
  std::vector<std::int64_t> dropped_rows() const {
    std::vector<std::int64_t> rows;
    for (std::int64_t place = 0; place < matrix_->rows; ++place) {
      if (matrix_->factor_diag[place] == 0.0) rows.push_back(matrix_->perm[place]);
    }
    std::sort(rows.begin(), rows.end());
    return rows;
  }
  void solve(const std::vector<double>& b, std::vector<double>& x) const {
    module_.expect_ok(module_.fn().qxsmsubst(matrix_, b.data(), x.data(), 1), "solving with a precision");
  }

 private:
  void enter(const Precision& precision) {
    const char* const doing = "assembling a precision";
    module_.expect_ok(module_.fn().qxsmnewss(module_.instance, &matrix_, precision.order), doing);
    for (std::int64_t i = 0; i < precision.order; ++i) {
      for (std::int64_t p = precision.row_start[at(i)]; p < precision.row_start[at(i) + 1]; ++p) {
        const SmStatus status = module_.fn().qxsmassign(matrix_, i, precision.col[at(p)], 0, precision.value[at(p)]);
        if (status != SM_OK) module_.expect_ok(status, doing);
      }
    }
    module_.expect_ok(module_.fn().qxsmclose(matrix_, 0.0), doing);
  }
  void factor(const MatrixNames& names) {
    module_.expect_ok(module_.qxsmmd(matrix_), "ordering a precision");
    module_.expect_ok(module_.qxsmreorder(matrix_), "applying the order of a precision");
    module_.expect_ok(module_.qxsmsymbfact(matrix_), "finding the structure of a precision's factor");
    const SmStatus status = module_.qxsmnumfact(matrix_);
    if (status == SM_NOT_DEFINITE) refuse_indefinite(names, "the matrix has a negative eigenvalue");
    module_.expect_ok(status, "factoring a precision");
  }
  void release() { module_.fn().qxsmDestroyMatrix(module_.instance, &matrix_); }

  const Module& module_;
  SmMatrix* matrix_ = nullptr;
};

// How the null vector x of the dropped row d fails to be one, in the dropped rows: there K x is what the factor left of
// column d.
void require_null(const SparseColumns& k, const MatrixNames& names, const std::vector<std::int64_t>& dropped,
                  std::int64_t d, const double* x) {
  for (const std::int64_t i : dropped) {
    double sum = 0.0;
    double size = 0.0;
    for (std::int64_t p = k.start[at(i)]; p < k.start[at(i) + 1]; ++p) {
      const double part = k.value[at(p)] * x[k.row[at(p)]];
      sum += part;
      size += std::fabs(part);
    }
    if (std::fabs(sum) <= kDependent * size) continue;
    refuse_indefinite(names, i == d ? fmt::format("{} has the pivot {} after the other rows", row_text(names, d), sum)
                                    : fmt::format("{} and {} are left with pivots of 0, but {} between them",
                                                  row_text(names, d), row_text(names, i), sum));
  }
}

// The columns of the basis one after the other by Gram and Schmidt, each twice: then they are orthogonal to rounding
// (Giraud, Langou and Rozloznik, Comput. Math. Appl. 50 (2005) 1069-1075). Answers log|R|, where basis = Q R.
double orthonormalise(std::vector<double>& basis, std::int64_t n, std::int64_t count) {
  double log_r = 0.0;
  for (std::int64_t j = 0; j < count; ++j) {
    double* const column = basis.data() + j * n;
    for (int pass = 0; pass < 2; ++pass) {
      for (std::int64_t earlier = 0; earlier < j; ++earlier) {
        const double* const q = basis.data() + earlier * n;
        double product = 0.0;
        for (std::int64_t i = 0; i < n; ++i) product += q[i] * column[i];
        if (product == 0.0) continue;
        for (std::int64_t i = 0; i < n; ++i) column[i] -= product * q[i];
      }
    }
    double square = 0.0;
    for (std::int64_t i = 0; i < n; ++i) square += column[i] * column[i];
    const double norm = std::sqrt(square);
    log_r += std::log(norm);
    for (std::int64_t i = 0; i < n; ++i) column[i] /= norm;
  }
  return log_r;
}

// One null vector for each dropped row, not yet orthogonal.
std::vector<double> null_vectors(const SparseColumns& k, const MatrixNames& names, const Factored& factored,
                                 const std::vector<std::int64_t>& dropped) {
  const std::size_t n = at(k.rows);
  std::vector<double> basis(n * dropped.size(), 0.0);
  std::vector<double> b(n, 0.0);
  std::vector<double> x(n, 0.0);
  for (std::size_t j = 0; j < dropped.size(); ++j) {
    const std::int64_t d = dropped[j];
    for (std::int64_t p = k.start[at(d)]; p < k.start[at(d) + 1]; ++p) b[at(k.row[at(p)])] = -k.value[at(p)];
    factored.solve(b, x);
    for (std::int64_t p = k.start[at(d)]; p < k.start[at(d) + 1]; ++p) b[at(k.row[at(p)])] = 0.0;
    x[at(d)] = 1.0;
    require_null(k, names, dropped, d, x.data());
    std::copy(x.begin(), x.end(), basis.begin() + static_cast<std::ptrdiff_t>(j * n));
  }
  return basis;
}

}  // namespace

Precision matrix_precision(const Module& module, const SparseColumns& k, const MatrixNames& names) {
  require_symmetric(k, names);
  require_diagonal(k, names);
  Precision precision;
  copy_triangle(k, precision);
  const Factored factored(module, precision, names);
  precision.null_rows = factored.dropped_rows();
  precision.nullity = static_cast<std::int64_t>(precision.null_rows.size());
  if (precision.nullity == precision.order) {
    throw ModelError({.file = names.file,
                      .what = "the matrix is zero",
                      .expected = "a precision matrix",
                      .advice = "check the values"});
  }
  precision.null_basis = null_vectors(k, names, factored, precision.null_rows);
  precision.log_det = factored.log_determinant();
  precision.log_det += 2.0 * orthonormalise(precision.null_basis, precision.order, precision.nullity);
  return precision;
}

}  // namespace sm::mixed
