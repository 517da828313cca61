// The plain road of the numeric factorization, one row at a time: the tests hold the blocked one to it.
//
// Method: Eisenstat, Gursky, Schultz, Sherman, "Yale Sparse Matrix Package I: the symmetric codes", Int. J. Numer.
// Methods Eng. 18 (1982) 1145-1151. Row k gathers its entries of A in a dense row; the earlier rows that have an entry
// in column k, chained from jl[k], are subtracted; what is left of the diagonal is the pivot. Rows of U are stored as
// -U, so that every later use adds.
#include "cholesky/numeric.hpp"

namespace sm {

namespace {

class NumericRows {
 public:
  NumericRows(const NumericArrays& a, Pivots& pivots) : a_(a), pivots_(pivots) {}
  SmStatus run();

 private:
  void load(i64 k);
  double subtract_earlier_rows(i64 k);
  void store(i64 k);
  void await(i64 row, i64 p);
  // Columns of a row from its position p on.
  const i64* columns(i64 row, i64 p) const { return a_.ju + a_.iju[row] + (p - a_.iu[row]); }

  const NumericArrays& a_;
  Pivots& pivots_;
};

void NumericRows::load(i64 k) {
  const SmMatrix& m = a_.m;
  const i64 row = m.perm[k];
  for (i64 p = m.row_start[row]; p < m.row_start[row + 1]; ++p) {
    const i64 j = m.inv_perm[m.col_index[p]];
    if (j >= k) a_.diag[j] = m.nz_values[p];
  }
}

// Row `row` is next used at its position p: chain it to the column that stands there.
void NumericRows::await(i64 row, i64 p) {
  if (p >= a_.iu[row + 1]) return;
  const i64 column = *columns(row, p);
  a_.position[row] = p;
  a_.jl[row] = a_.jl[column];
  a_.jl[column] = row;
}

// Updates the dense row above k; answers the pivot.
double NumericRows::subtract_earlier_rows(i64 k) {
  double d = a_.diag[k];
  for (i64 i = a_.jl[k]; i >= 0;) {
    const i64 following = a_.jl[i];
    const i64 p = a_.position[i];
    const double u = a_.values[p];
    const double m = -u * a_.diag[i];
    a_.values[p] = m;
    d += u * m;
    const i64* column = columns(i, p + 1);
    const i64 end = a_.iu[i + 1];
    for (i64 q = p + 1; q < end; ++q) a_.diag[*column++] += a_.values[q] * m;
    await(i, p + 1);
    i = following;
  }
  return d;
}

void NumericRows::store(i64 k) {
  const i64* column = columns(k, a_.iu[k]);
  for (i64 p = a_.iu[k]; p < a_.iu[k + 1]; ++p, ++column) {
    a_.values[p] = a_.diag[*column];
    a_.diag[*column] = 0.0;
  }
  await(k, a_.iu[k]);
}

SmStatus NumericRows::run() {
  for (i64 k = 0; k < a_.n; ++k) {
    a_.diag[k] = 0.0;
    a_.jl[k] = -1;
  }
  for (i64 k = 0; k < a_.n; ++k) {
    load(k);
    SM_TRY(pivots_.judge(k, subtract_earlier_rows(k), a_.diag[k]));
    store(k);
  }
  return SM_OK;
}

}  // namespace

SmStatus factor_by_rows(const NumericArrays& a, Pivots& pivots) { return NumericRows(a, pivots).run(); }

}  // namespace sm
