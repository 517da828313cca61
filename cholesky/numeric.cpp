// Numeric factorization of a symmetric sparse matrix: the values of U and D, one row at a time.
//
// Method: Eisenstat, Gursky, Schultz, Sherman, "Yale Sparse Matrix Package I: the symmetric codes", Int. J. Numer.
// Methods Eng. 18 (1982) 1145-1151. Row k gathers its entries of A in a dense row; the earlier rows that have an entry
// in column k, chained from jl[k], are subtracted; what is left of the diagonal is the pivot.
//
// The dense row shares storage with the finished reciprocal pivots: those are below k, the row is at k and above. Rows
// of U are stored as -U, so that every later use adds.
#include <cmath>

#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

class NumericRows {
 public:
  NumericRows(const SmMatrix& m, i64 value_word)
      : m_(m),
        n_(m.rows),
        iju_(m.work),
        iu_(m.work + n_),
        jl_(m.work + 2 * n_ + 1),
        ju_(m.work + 3 * n_ + 1),
        position_(m.work + value_word),
        diag_(reinterpret_cast<double*>(m.work + value_word + n_)),
        values_(reinterpret_cast<double*>(m.work + value_word + 2 * n_)) {}

  // 0, or 103 with the rows before the bad pivot done.
  SmStatus run(double tolerance);
  i64 rank() const { return rank_; }
  double log_sum() const { return log_sum_; }
  void publish(SmMatrix& m) const {
    m.factor_scratch = position_;
    m.factor_diag = diag_;
    m.factor_values = values_;
  }

 private:
  void load(i64 k);
  double subtract_earlier_rows(i64 k);
  SmStatus pivot(i64 k, double d, double tolerance);
  void store(i64 k);
  void await(i64 row, i64 p);
  // Columns of a row from its position p on.
  const i64* columns(i64 row, i64 p) const { return ju_ + iju_[row] + (p - iu_[row]); }

  const SmMatrix& m_;
  i64 n_;
  const i64 *iju_, *iu_;
  i64* jl_;
  const i64* ju_;
  i64* position_;
  double* diag_;
  double* values_;
  i64 rank_ = 0;
  double log_sum_ = 0.0;
};

void NumericRows::load(i64 k) {
  const i64 row = m_.perm[k];
  for (i64 p = m_.row_start[row]; p < m_.row_start[row + 1]; ++p) {
    const i64 j = m_.inv_perm[m_.col_index[p]];
    if (j >= k) diag_[j] = m_.nz_values[p];
  }
}

// Row `row` is next used at its position p: chain it to the column that stands there.
void NumericRows::await(i64 row, i64 p) {
  if (p >= iu_[row + 1]) return;
  const i64 column = *columns(row, p);
  position_[row] = p;
  jl_[row] = jl_[column];
  jl_[column] = row;
}

// Updates the dense row above k; answers the pivot.
double NumericRows::subtract_earlier_rows(i64 k) {
  double d = diag_[k];
  for (i64 i = jl_[k]; i >= 0;) {
    const i64 following = jl_[i];
    const i64 p = position_[i];
    const double u = values_[p];
    const double m = -u * diag_[i];
    values_[p] = m;
    d += u * m;
    const i64* column = columns(i, p + 1);
    const i64 end = iu_[i + 1];
    for (i64 q = p + 1; q < end; ++q) diag_[*column++] += values_[q] * m;
    await(i, p + 1);
    i = following;
  }
  return d;
}

SmStatus NumericRows::pivot(i64 k, double d, double tolerance) {
  const PivotLimits limits(m_.nz_values[m_.row_start[m_.perm[k]]], tolerance);
  if (d > limits.accept) {
    diag_[k] = 1.0 / d;
    ++rank_;
    log_sum_ += std::log(d);
    return SM_OK;
  }
  diag_[k] = 0.0;  // dropped: the row contributes nothing from here on
  return d < limits.refuse ? SM_NOT_DEFINITE : SM_OK;
}

void NumericRows::store(i64 k) {
  const i64* column = columns(k, iu_[k]);
  for (i64 p = iu_[k]; p < iu_[k + 1]; ++p, ++column) {
    values_[p] = diag_[*column];
    diag_[*column] = 0.0;
  }
  await(k, iu_[k]);
}

SmStatus NumericRows::run(double tolerance) {
  for (i64 k = 0; k < n_; ++k) {
    diag_[k] = 0.0;
    jl_[k] = -1;
  }
  for (i64 k = 0; k < n_; ++k) {
    load(k);
    SM_TRY(pivot(k, subtract_earlier_rows(k), tolerance));
    store(k);
  }
  return SM_OK;
}

Gate may_factor(const SmMatrix& m) {
  SM_STOP_IF(m.nnz < 1, SM_OK);
  SM_STOP_IF(m.state == SM_STATE_FACTORED, SM_OK);
  SM_STOP_IF(m.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(!is_closed(m), SM_NOT_CLOSED);
  SM_STOP_IF(m.state > SM_STATE_FACTORED, SM_OK);
  SM_STOP_IF(m.state != SM_STATE_SYMBOLIC || !is_symmetric_sparse(m) || !m.work, SM_WRONG_STATE);
  return {};
}

}  // namespace

SmStatus factor_numeric(SmMatrix& m) {
  SM_PASS(may_factor(m));
  const i64 n = m.rows;
  const i64 integers = 3 * n + 2 + m.work[n - 1];
  const i64 value_word = (integers + m.factor_block - 1) / m.factor_block;
  m.definite = 1;
  if (m.work_capacity - (value_word + 2 * n) < m.work[2 * n]) return SM_NO_MEMORY;
  NumericRows rows(m, value_word);
  if (const SmStatus status = rows.run(singularity_tolerance(m)); status != SM_OK) {
    m.definite = 0;
    return status;
  }
  rows.publish(m);
  m.rank = rows.rank();
  m.log_det = rows.log_sum();
  m.state = SM_STATE_FACTORED;
  return SM_OK;
}

}  // namespace sm
