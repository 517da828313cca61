#include "bench/harness/workbench.hpp"

#include <fmt/format.h>

#include <algorithm>
#include <stdexcept>

#include "bench/generators/random.hpp"
#include "bench/harness/clock.hpp"

namespace sm::bench {

void enter(const SmFunctionTable& fn, SmMatrix* matrix, const Triplets& entries) {
  const auto assign = fn.qxsmassign;
  SmStatus status = SM_OK;
  for (std::size_t k = 0; k < entries.size() && status == SM_OK; ++k) {
    status = assign(matrix, entries.row[k], entries.col[k], 1, entries.value[k]);
  }
  expect_ok(status, "entering an element");
}

double kept_subscripts(const SmMatrix& factor) {
  std::int64_t end = 0;
  for (std::int64_t k = 0; k < factor.rows; ++k) {
    const std::int64_t length = factor.factor_iu[k + 1] - factor.factor_iu[k];
    if (length > 0) end = std::max(end, factor.factor_iju[k] + length);
  }
  return static_cast<double>(end);
}

Workbench::Workbench(Module& module, Problem problem, Records& records, Forecast& forecast, int rounds)
    : module_(module), problem_(std::move(problem)), records_(records), forecast_(forecast), rounds_(rounds) {}

const UpperRows& Workbench::rows() {
  if (!rows_) rows_ = compress(problem_);
  return *rows_;
}

SmMatrix* Workbench::closed() {
  if (!closed_) {
    closed_ = qxhost::Matrix::symmetric_sparse(module_.instance(), problem_.n);
    expect_ok(closed_->status(), "making a matrix");
    enter(module_.fn(), *closed_, problem_.upper);
    expect_ok(module_.fn().qxsmclose(*closed_, 0.0), "closing");
  }
  return *closed_;
}

SmMatrix* Workbench::ordered() {
  if (!ordered_) {
    ordered_ = copy_of(closed());
    const double seconds = seconds_of([&] { expect_ok(module_.by_name().qxsmmd(*ordered_), "ordering"); });
    forecast_.learn(job("ordering/") + kOurs, problem_.n, seconds);
  }
  return *ordered_;
}

SmMatrix* Workbench::factored() {
  if (!factored_) {
    factored_ = copy_of(ordered());
    const double seconds = seconds_of([&] { expect_ok(module_.fn().qxsmfact(*factored_, 0), "factoring"); });
    forecast_.learn(job("numeric/") + kOurs, problem_.n, seconds);
  }
  return *factored_;
}

const std::vector<int>& Workbench::permutation() {
  if (permutation_.empty()) {
    const SmMatrix* matrix = ordered();
    for (int k = 0; k < problem_.n; ++k) permutation_.push_back(static_cast<int>(matrix->perm[k]));
  }
  return permutation_;
}

qxhost::Matrix Workbench::copy_of(SmMatrix* source) {
  qxhost::Matrix copy(module_.instance(), SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE);
  expect_ok(copy.status(), "making a matrix");
  expect_ok(module_.fn().qxsmclone(source, copy, 0), "copying a matrix");
  return copy;
}

bool Workbench::can_factor(std::initializer_list<const char*> phases) {
  for (const char* step : {"ordering", "numeric"}) {
    const std::string needed = fmt::format("{}/{}", job(step), kOurs);
    if (!forecast_.too_long(needed, problem_.n)) continue;
    Outcome outcome;
    outcome.name = kOurs;
    outcome.not_run = fmt::format("about {:.0f} s expected for its {}", forecast_.expected(needed, problem_.n), step);
    for (const char* phase : phases) record(phase, "", {outcome});
    return false;
  }
  return true;
}

std::vector<double> Workbench::right_hand_sides(int count) {
  std::vector<double> block = problem_.rhs;
  Random random(11);
  std::vector<double> x(static_cast<std::size_t>(problem_.n));
  for (int k = 1; k < count; ++k) {
    for (double& v : x) v = random.between(-1.0, 1.0);
    const std::vector<double> b = multiply(rows(), x.data());
    block.insert(block.end(), b.begin(), b.end());
  }
  return block;
}

std::vector<Outcome> Workbench::race(const std::string& phase, const std::vector<Contestant>& contestants) {
  const Race race{.job = job(phase), .n = static_cast<double>(problem_.n), .rounds = rounds_};
  return run_race(race, contestants, forecast_);
}

void Workbench::record(const std::string& phase, const std::string& variant, const std::vector<Outcome>& outcomes,
                       const Json& facts) {
  const Subject subject{.family = problem_.family,
                        .name = problem_.name,
                        .n = static_cast<double>(problem_.n),
                        .entries = static_cast<double>(rows().entries())};
  records_.write(subject, phase, variant, outcomes, facts);
}

}  // namespace sm::bench
