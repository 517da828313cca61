#include "bench/peers/eigen.hpp"

#include <Eigen/IterativeLinearSolvers>
#include <Eigen/Sparse>
#include <Eigen/SparseCholesky>
#include <cmath>

#include "bench/harness/clock.hpp"

namespace sm::bench {
namespace {

using Matrix = Eigen::SparseMatrix<double, Eigen::ColMajor, int>;
using Lower = Eigen::Map<const Matrix>;
using Vector = Eigen::VectorXd;

// Rows of the upper triangle are columns of the lower one.
Lower lower_of(const UpperRows& rows) {
  return {rows.n, rows.n, rows.entries(), rows.start.data(), rows.col.data(), rows.value.data()};
}

Eigen::Map<const Vector> vector_of(const std::vector<double>& x, int n) { return {x.data(), n}; }

using Solver = Eigen::SimplicialLDLT<Matrix, Eigen::Lower, Eigen::AMDOrdering<int>>;

}  // namespace

bool solve_by_eigen(const UpperRows& rows, const std::vector<double>& b, std::vector<double>& x) {
  Solver solver;
  solver.compute(lower_of(rows));
  if (solver.info() != Eigen::Success) return false;
  x.resize(b.size());
  Eigen::Map<Vector>(x.data(), rows.n) = solver.solve(vector_of(b, rows.n));
  return true;
}

bool solve_by_eigen(const UpperRows& rows, const std::vector<double>& b, std::vector<double>& x, Steps& steps) {
  Solver solver;
  const auto a = lower_of(rows);
  steps.time("analysis", [&] { solver.analyzePattern(a); });
  steps.time("numeric", [&] { solver.factorize(a); });
  if (solver.info() != Eigen::Success) return false;
  x.resize(b.size());
  steps.time("solve", [&] { Eigen::Map<Vector>(x.data(), rows.n) = solver.solve(vector_of(b, rows.n)); });
  return true;
}

void multiply_by_eigen(const UpperRows& rows, const std::vector<double>& x, std::vector<double>& y, int k) {
  y.resize(x.size());
  const auto a = lower_of(rows);
  if (k == 1) {  // a vector at compile time, which has a loop of its own
    Eigen::Map<Vector>(y.data(), rows.n).noalias() = a.selfadjointView<Eigen::Lower>() * vector_of(x, rows.n);
    return;
  }
  const Eigen::Map<const Eigen::MatrixXd> block(x.data(), rows.n, k);
  Eigen::Map<Eigen::MatrixXd>(y.data(), rows.n, k).noalias() = a.selfadjointView<Eigen::Lower>() * block;
}

double iterate_by_eigen(const UpperRows& rows, const std::vector<double>& b, std::vector<double>& x, int steps) {
  const Matrix a = lower_of(rows);
  Eigen::ConjugateGradient<Matrix, Eigen::Lower> solver(a);
  solver.setTolerance(0.0);
  solver.setMaxIterations(steps);
  x.resize(b.size());
  return seconds_of([&] { Eigen::Map<Vector>(x.data(), rows.n) = solver.solve(vector_of(b, rows.n)); });
}

struct EigenAssembly::State {
  std::vector<Eigen::Triplet<double>> entries;
  Matrix lower;
};

EigenAssembly::EigenAssembly(const Problem& problem, const Triplets& entries) : state_(std::make_unique<State>()) {
  state_->entries.reserve(entries.size());
  for (std::size_t k = 0; k < entries.size(); ++k) {
    state_->entries.emplace_back(entries.col[k], entries.row[k], entries.value[k]);
  }
  state_->lower.resize(problem.n, problem.n);
}

EigenAssembly::~EigenAssembly() = default;

void EigenAssembly::run() { state_->lower.setFromTriplets(state_->entries.begin(), state_->entries.end()); }

std::string EigenAssembly::fault(const UpperRows& want) const {
  Matrix wanted = lower_of(want);
  Matrix difference = state_->lower - wanted;
  const double largest = wanted.coeffs().cwiseAbs().maxCoeff();
  const bool right = difference.nonZeros() == 0 || difference.coeffs().cwiseAbs().maxCoeff() <= 1e-12 * largest;
  return right ? "" : "another sum than ours";
}

}  // namespace sm::bench
