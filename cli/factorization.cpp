#include "cli/factorization.hpp"

#include <algorithm>

#include "cli/error.hpp"
#include "cli/module_matrix.hpp"

namespace sm::cli {
namespace {

constexpr std::int64_t kSolvesPerCall = 16;  // right-hand sides between two updates of the progress bar

}  // namespace

double FactorCounts::fill_ratio(std::int64_t n) const {
  return entries == 0 ? 1.0 : static_cast<double>(nnz_u + n) / static_cast<double>(entries);
}

Factorization::Factorization(ModuleSession& session, const LoadedMatrix& upper, PhaseClock& clock)
    : session_(session),
      clock_(clock),
      order_(upper.rows.rows),
      matrix_(module_matrix(session, upper, kSymmetricSparse, clock)) {
  counts_.entries = matrix_->nnz;
}

SmStatus Factorization::order(Ordering ordering, std::uint64_t limit) {
  if (ordering == Ordering::md) return session_.steps().qxsmmd(matrix_);
  const UpperPattern upper{.n = order_, .start = matrix_->row_start, .col = matrix_->col_index};
  return session_.steps().qxsmorder(matrix_, find_order(ordering, upper, limit).data());
}

void Factorization::analyse(Ordering ordering, std::uint64_t limit) {
  if (order_ == 0) return;
  const ExportedSteps& steps = session_.steps();
  const SmStatus ordered = clock_.timed("ordering", [&] { return order(ordering, limit); });
  session_.expect_ok(ordered, "ordering the matrix");
  const SmStatus moved = clock_.timed("reordering", [&] { return steps.qxsmreorder(matrix_); });
  session_.expect_ok(moved, "applying the order");
  const SmStatus symbolic = clock_.timed("symbolic", [&] { return steps.qxsmsymbfact(matrix_); });
  session_.expect_ok(symbolic, "finding the structure of the factor");
  count();
}

void Factorization::count() {
  counts_.nnz_u = matrix_->factor_iu[order_];
  for (std::int64_t k = 0; k < order_; ++k) {
    const std::int64_t length = matrix_->factor_iu[k + 1] - matrix_->factor_iu[k];
    counts_.flops += static_cast<double>(length) * static_cast<double>(length + 2);
    if (length > 0) counts_.subscripts = std::max(counts_.subscripts, matrix_->factor_iju[k] + length);
  }
}

bool Factorization::factor() {
  if (order_ == 0) return true;
  const SmStatus status = clock_.timed(
      "numeric", [&] { return session_.steps().qxsmnumfact(matrix_); }, counts_.flops);
  if (status == SM_NOT_DEFINITE) return false;
  session_.expect_ok(status, "factoring the matrix");
  session_.expect_ok(session_.fn().qxsmrank(matrix_, &rank_), "reading the rank");
  session_.expect_ok(session_.fn().qxsmlogdet(matrix_, &log_determinant_), "reading the log-determinant");
  return true;
}

void Factorization::solve(const double* b, double* x, std::int64_t count) {
  if (order_ == 0 || count == 0) return;
  // Each entry of U is met twice, with a multiplication and an addition; each pivot once.
  const double flops =
      static_cast<double>(count) * (4.0 * static_cast<double>(counts_.nnz_u) + static_cast<double>(order_));
  const auto all = [&] {
    for (std::int64_t done = 0; done < count; done += kSolvesPerCall) {
      const std::int64_t now = std::min(kSolvesPerCall, count - done);
      session_.expect_ok(session_.steps().qxsminvmultv(matrix_, b + done * order_, x + done * order_, now), "solving");
      clock_.progress().update(static_cast<double>(done + now) / static_cast<double>(count));
    }
    return 0;
  };
  clock_.timed("solving", all, flops);
}

std::vector<double> Factorization::inverse_diagonal() {
  std::vector<double> diagonal(static_cast<std::size_t>(order_));
  if (order_ == 0) return diagonal;
  const SmStatus status =
      clock_.timed("inverting", [&] { return session_.fn().qxsminvdiag(matrix_, diagonal.data()); });
  session_.expect_ok(status, "computing the diagonal of the inverse");
  return diagonal;
}

std::vector<std::int64_t> Factorization::dropped_rows() const {
  std::vector<std::int64_t> rows;
  for (std::int64_t k = 0; k < order_; ++k) {
    if (matrix_->factor_diag[k] == 0.0) rows.push_back(matrix_->perm[k] + 1);
  }
  std::sort(rows.begin(), rows.end());
  return rows;
}

}  // namespace sm::cli
