// The trace of a product, without the product: one walk over the stored elements of one matrix, each with the elements
// of the other that stand across from it.
#include <algorithm>

#include "store/operations.hpp"
#include "store/views.hpp"
#include "trace/operations.hpp"

namespace sm {

namespace {

enum class Answer { computed, silent, refused };

// What a pair of kinds and formats gets, A's line first. `silent` is an answer of 0 that leaves the missing value in
// place, which says that there is no trace when the status does not. any_other: a format that its kind does not know,
// or another kind.
struct Pairs {
  std::int32_t kind, format;
  Answer with_general, with_strange_general, with_symmetric, with_diagonal, any_other;
};
using enum Answer;
constexpr Pairs kPairs[] = {
    {SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE, computed, silent, computed, computed, refused},
    {SM_KIND_SYMMETRIC, SM_FORMAT_ROWS, computed, refused, computed, computed, silent},
    {SM_KIND_SYMMETRIC, SM_FORMAT_COLUMNS, refused, refused, computed, computed, refused},
    {SM_KIND_GENERAL, SM_FORMAT_SPARSE, computed, refused, refused, refused, refused},
    {SM_KIND_GENERAL, SM_FORMAT_ROWS, computed, refused, refused, refused, refused},
    {SM_KIND_GENERAL, SM_FORMAT_COLUMNS, computed, refused, refused, refused, refused},
};

bool is_known_format(const SmMatrix& m) { return m.format == SM_FORMAT_SPARSE || is_dense_format(m.format); }

Answer answer_to(const Pairs& a, const SmMatrix& b) {
  switch (b.kind) {
    case SM_KIND_GENERAL:
      return is_known_format(b) ? a.with_general : a.with_strange_general;
    case SM_KIND_SYMMETRIC:
      return is_known_format(b) ? a.with_symmetric : a.any_other;
    case SM_KIND_DIAGONAL:
      return a.with_diagonal;
    default:
      return a.any_other;
  }
}

Answer answer_to(const SmMatrix& a, const SmMatrix& b) {
  if (a.kind != SM_KIND_GENERAL && a.kind != SM_KIND_SYMMETRIC) return refused;
  for (const Pairs& pairs : kPairs) {
    if (pairs.kind == a.kind && pairs.format == a.format) return answer_to(pairs, b);
  }
  return silent;
}

Gate may_trace_product(const SmMatrix& a, const SmMatrix& b) {
  SM_STOP_IF(a.nnz < 1 && b.nnz < 1, SM_NOTHING_TO_REPORT);
  SM_STOP_IF(a.kind == SM_KIND_NONE || b.kind == SM_KIND_NONE, SM_NOTHING_TO_REPORT);
  SM_STOP_IF(!is_closed_or_empty(a) || !is_closed_or_empty(b), SM_NOT_CLOSED);
  SM_STOP_IF(a.cols != b.rows, SM_DIMENSION_MISMATCH);
  return {};
}

SmStatus trace_with_diagonal(const SmMatrix& a, SmMatrix& b, double& result) {
  const i64 length = std::min(b.rows, b.cols);
  Scratch<double> work;
  SM_TRY(need_pool(b));
  SM_TRY(work.take(b.pool, length, Fill::zero));
  SM_TRY(diagonal(b, work.data(), 0, length - 1));
  result = 0.0;
  for (i64 i = 0; i < std::min(a.nnz, length); ++i) result += a.values[i] * work.data()[i];
  return SM_OK;
}

// The stored element (i, j), or null when it is absent or outside.
template <class View>
const double* element(const View& view, i64 i, i64 j) {
  if (i >= view.rows || j >= view.cols) return nullptr;
  return View::one_triangle ? view.find(std::min(i, j), std::max(i, j)) : view.find(i, j);
}

template <class A, class B>
double sum_of_products(const A& a, const B& b) {
  double sum = 0.0;
  a.entries([&](i64 i, i64 j, double v) {
    if (const double* across = element(b, j, i)) sum += v * *across;
    if (!A::one_triangle || i == j) return;
    if (const double* across = element(b, i, j)) sum += v * *across;  // (j, i), stored as (i, j)
  });
  return sum;
}

// Two sparse symmetric matrices: B row by row in a dense vector. Entries that ordering moved into this row of A stand
// left of the diagonal and are searched for in B.
double sum_of_sparse_products(const UpperRows& a, const UpperRows& b, double* row_of_b) {
  double sum = 0.0;
  for (i64 i = 0; i < a.rows; ++i) {
    b.row(i, [&](i64 j, double v) { row_of_b[j] = v; });
    a.row(i, [&](i64 j, double v) {
      const double* moved = j < i ? b.find(j, i) : nullptr;
      const double across = j < i ? (moved ? *moved : 0.0) : row_of_b[j];
      if (across == 0.0) return;
      sum += v * across;
      if (j != i) sum += v * across;
    });
    b.row(i, [&](i64 j, double) { row_of_b[j] = 0.0; });
  }
  return sum;
}

// A reordered B, and a work vector that cannot be had, end with the missing value and the answer 0.
SmStatus trace_of_sparse_pair(SmMatrix& a, SmMatrix& b, double& result) {
  if (b.state > SM_STATE_ORDERED) return SM_OK;
  Scratch<double> work;
  if (need_pool(a) != SM_OK || work.take(a.pool, a.rows, Fill::zero) != SM_OK) return SM_OK;
  result = sum_of_sparse_products(UpperRows(a), UpperRows(b), work.data());
  return SM_OK;
}

}  // namespace

SmStatus trace_of_product(SmMatrix& a, SmMatrix& b, double& result) {
  result = missing();
  SM_PASS(may_trace_product(a, b));
  if (a.kind == SM_KIND_DIAGONAL) return trace_with_diagonal(a, b, result);
  const Answer answer = answer_to(a, b);
  if (answer != computed) return answer == silent ? SM_OK : SM_UNAVAILABLE;
  if (a.nnz < 1 || b.nnz < 1) {
    result = 0.0;
    return SM_OK;
  }
  if (is_symmetric_sparse(a) && is_symmetric_sparse(b)) return trace_of_sparse_pair(a, b, result);
  // Both symmetric, the sparse one is walked: its rows may be reordered, which a walk does not mind and a search would.
  if (a.kind == SM_KIND_SYMMETRIC && is_symmetric_sparse(b)) return trace_of_product(b, a, result);
  return visit(a, [&](const auto& view_a) {
    return visit(b, [&](const auto& view_b) {
      result = sum_of_products(view_a, view_b);
      return SM_OK;
    });
  });
}

}  // namespace sm
