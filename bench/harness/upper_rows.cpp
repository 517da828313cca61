#include "bench/harness/upper_rows.hpp"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>

namespace sm::bench {
namespace {

constexpr double kResidual = 1e-12;

std::size_t at(int i) { return static_cast<std::size_t>(i); }

// Places of a stable counting sort of `order` by key.
std::vector<int> sorted_by(const std::vector<int>& key, const std::vector<int>& order, int n) {
  std::vector<int> next(at(n) + 1);
  for (const int k : key) ++next[at(k) + 1];
  for (std::size_t i = 1; i < next.size(); ++i) next[i] += next[i - 1];
  std::vector<int> sorted(order.size());
  for (const int p : order) sorted[at(next[at(key[at(p)])]++)] = p;
  return sorted;
}

}  // namespace

UpperRows compress(const Problem& problem) {
  Triplets all = problem.upper;
  for (int i = 0; i < problem.n; ++i) all.add(i, i, 0.0);
  std::vector<int> order(all.size());
  for (std::size_t p = 0; p < order.size(); ++p) order[p] = static_cast<int>(p);
  order = sorted_by(all.row, sorted_by(all.col, order, problem.n), problem.n);
  UpperRows a{.n = problem.n, .start = std::vector<int>(at(problem.n) + 1), .col = {}, .value = {}};
  for (std::size_t k = 0; k < order.size();) {
    const int i = all.row[at(order[k])];
    const int j = all.col[at(order[k])];
    double sum = 0.0;
    for (; k < order.size() && all.row[at(order[k])] == i && all.col[at(order[k])] == j; ++k) {
      sum += all.value[at(order[k])];
    }
    if (sum == 0.0 && i != j) continue;
    a.col.push_back(j);
    a.value.push_back(sum);
    a.start[at(i) + 1] = static_cast<int>(a.col.size());
  }
  return a;
}

std::vector<double> multiply(const UpperRows& a, const double* x) {
  std::vector<double> y(at(a.n));
  for (int i = 0; i < a.n; ++i) {
    double sum = 0.0;
    for (int p = a.start[at(i)]; p < a.start[at(i) + 1]; ++p) {
      const int j = a.col[at(p)];
      sum += a.value[at(p)] * x[j];
      if (j != i) y[at(j)] += a.value[at(p)] * x[i];
    }
    y[at(i)] += sum;
  }
  return y;
}

std::string solution_fault(const UpperRows& a, const double* x, const std::vector<double>& b) {
  const std::vector<double> ones(at(a.n), 1.0);
  UpperRows magnitudes = a;
  for (double& v : magnitudes.value) v = std::fabs(v);
  double norm_a = 0.0, norm_x = 0.0, norm_b = 0.0, worst = 0.0;
  for (const double v : multiply(magnitudes, ones.data())) norm_a = std::max(norm_a, v);
  const std::vector<double> product = multiply(a, x);
  for (int i = 0; i < a.n; ++i) {
    const double error = std::fabs(b[at(i)] - product[at(i)]);
    if (!(error <= worst)) worst = error;  // takes a NaN and keeps it
    if (!std::isfinite(worst)) return "the solution is not finite";
    norm_x = std::max(norm_x, std::fabs(x[i]));
    norm_b = std::max(norm_b, std::fabs(b[at(i)]));
  }
  const double residual = worst / (norm_a * norm_x + norm_b);
  return residual <= kResidual ? "" : fmt::format("relative residual {:.1e}", residual);
}

std::string number_fault(const char* what, double got, double want, double scale, double tolerance) {
  const double error = std::fabs(got - want) / std::max(std::fabs(want), scale);
  return error <= tolerance ? "" : fmt::format("{} {:.15g} instead of {:.15g}", what, got, want);
}

}  // namespace sm::bench
