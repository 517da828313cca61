// The diagonal of the generalized inverse column by column, without memory.
//
// With A^- = V D^- V', V = U^-1: element i of the diagonal is the sum over columns j of V[i][j]^2 / D[j]. Column j of
// V D^(-1/2) is a back substitution that starts at row j, and reaches no row but those below j in the elimination tree,
// where the parent of a row is its first column (Liu, The role of elimination trees in sparse factorization, SIAM J.
// Matrix Anal. Appl. 11 (1990) 134-172). Rows are listed so that what is below j stands together behind it.
#include <algorithm>
#include <cmath>

#include "cholesky/numeric.hpp"

namespace sm {

namespace {

class Columns {
 public:
  explicit Columns(const SmMatrix& m)
      : a_(m, m.factor_scratch - m.work), list_(a_.jl), w_(reinterpret_cast<double*>(m.factor_scratch)) {}

  void add_diagonal(double* x);

 private:
  i64 parent(i64 row) const { return a_.iu[row] < a_.iu[row + 1] ? a_.ju[a_.iju[row]] : a_.n; }
  void list_rows();
  double product(i64 i, i64 last) const;

  const NumericArrays a_;
  i64* list_;  // the words of the lists of the factorization
  double* w_;
};

// Parents first, and everything below a row before anything else: the place of a row is behind its parent, and behind
// the rows below the children that came earlier.
void Columns::list_rows() {
  i64* size = a_.position;
  i64* end = list_;
  std::fill_n(size, a_.n, 1);
  for (i64 k = 0; k < a_.n; ++k) {
    if (parent(k) < a_.n) size[parent(k)] += size[k];
  }
  i64 end_of_roots = 0;
  for (i64 k = a_.n - 1; k >= 0; --k) {
    i64& next = parent(k) < a_.n ? end[parent(k)] : end_of_roots;
    end[k] = next + 1;
    next += size[k];
  }
  for (i64 k = 0; k < a_.n; ++k) end[k] -= size[k];
  i64* row_at = size;
  for (i64 k = 0; k < a_.n; ++k) row_at[end[k]] = k;
  std::copy_n(row_at, a_.n, list_);
}

// Row i of -U times w, up to column last; the columns of a row ascend.
double Columns::product(i64 i, i64 last) const {
  const i64* column = a_.ju + a_.iju[i] - a_.iu[i];
  double sum = 0.0;
  for (i64 p = a_.iu[i]; p < a_.iu[i + 1] && column[p] <= last; ++p) sum += a_.values[p] * w_[column[p]];
  return sum;
}

void Columns::add_diagonal(double* x) {
  list_rows();
  const i64* perm = a_.m.perm;
  for (i64 at = 0; at < a_.n; ++at) {
    const i64 j = list_[at];
    if (!(a_.diag[j] > 0.0)) continue;
    w_[j] = std::sqrt(a_.diag[j]);
    x[perm[j]] += a_.diag[j];
    for (i64 next = at + 1; next < a_.n && parent(list_[next]) <= j; ++next) {
      const i64 i = list_[next];
      w_[i] = a_.diag[i] > 0.0 ? product(i, j) : 0.0;
      x[perm[i]] += w_[i] * w_[i];
    }
  }
}

}  // namespace

void diagonal_by_columns(const SmMatrix& m, double* x) { Columns(m).add_diagonal(x); }

}  // namespace sm
