#include "cli/factorization.hpp"

#include <fmt/format.h>

#include <algorithm>
#include <chrono>

#include "cli/error.hpp"

namespace sm::cli {
namespace {

constexpr std::int64_t kRowsPerUpdate = 4096;
constexpr std::int64_t kSolvesPerCall = 16;  // right-hand sides between two updates of the progress bar

}  // namespace

double FactorCounts::fill_ratio(std::int64_t n) const {
  return entries == 0 ? 1.0 : static_cast<double>(nnz_u + n) / static_cast<double>(entries);
}

template <class Work>
auto Factorization::timed(const std::string& name, Work work, double flops) {
  progress_.phase(flops > 0.0 ? fmt::format("{} ({:.3g} Gflop)", name, flops / 1e9) : name);
  const auto begin = std::chrono::steady_clock::now();
  const auto answer = work();
  const std::chrono::duration<double> seconds = std::chrono::steady_clock::now() - begin;
  phases_.push_back({name, seconds.count(), flops});
  return answer;
}

Factorization::Factorization(ModuleSession& session, const CompressedRows& upper, Progress& progress)
    : session_(session), progress_(progress), order_(upper.rows) {
  timed("assembling", [&] { return enter(upper), 0; });
  const SmStatus closed = timed("closing", [&] { return session_.fn().qxsmclose(matrix_, 0.0); });
  session_.expect_ok(closed, "closing the matrix");
  counts_.entries = matrix_->nnz;
}

void Factorization::enter(const CompressedRows& upper) {
  const std::string doing = "assembling the matrix";
  session_.expect_ok(session_.fn().qxsmnewss(session_.instance(), &matrix_, order_), doing);
  const auto assign = session_.fn().qxsmassign;
  for (std::int64_t i = 0; i < order_; ++i) {
    const auto end = static_cast<std::size_t>(upper.start[static_cast<std::size_t>(i + 1)]);
    for (auto p = static_cast<std::size_t>(upper.start[static_cast<std::size_t>(i)]); p < end; ++p) {
      const SmStatus status = assign(matrix_, i, upper.col[p], 1, upper.value[p]);
      if (status != SM_OK) session_.expect_ok(status, doing);
    }
    if (i % kRowsPerUpdate == 0) progress_.update(static_cast<double>(i) / static_cast<double>(order_));
  }
}

void Factorization::analyse() {
  if (order_ == 0) return;
  const ExportedSteps& steps = session_.steps();
  const SmStatus ordered = timed("ordering", [&] { return steps.qxsmmd(matrix_); });
  session_.expect_ok(ordered, "ordering the matrix");
  const SmStatus moved = timed("reordering", [&] { return steps.qxsmreorder(matrix_); });
  session_.expect_ok(moved, "applying the order");
  const SmStatus symbolic = timed("symbolic", [&] { return steps.qxsmsymbfact(matrix_); });
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
  const SmStatus status = timed(
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
      progress_.update(static_cast<double>(done + now) / static_cast<double>(count));
    }
    return 0;
  };
  timed("solving", all, flops);
}

std::vector<double> Factorization::inverse_diagonal() {
  std::vector<double> diagonal(static_cast<std::size_t>(order_));
  if (order_ == 0) return diagonal;
  const SmStatus status = timed("inverting", [&] { return session_.fn().qxsminvdiag(matrix_, diagonal.data()); });
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
