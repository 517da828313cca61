// The symmetric product from one stored triangle, one vector and eight.
#include <fmt/format.h>

#include <algorithm>
#include <cmath>

#include "bench/harness/clock.hpp"
#include "bench/harness/latency.hpp"
#include "bench/peers/eigen.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {
namespace {

std::string product_fault(const UpperRows& rows, const std::vector<double>& x, const std::vector<double>& y) {
  const auto n = static_cast<std::size_t>(rows.n);
  for (std::size_t k = 0; k * n < x.size(); ++k) {
    const std::vector<double> want = multiply(rows, x.data() + k * n);
    double largest = 0.0;
    for (const double v : want) largest = std::max(largest, std::fabs(v));
    for (std::size_t i = 0; i < n; ++i) {
      if (!(std::fabs(y[k * n + i] - want[i]) <= 1e-12 * largest)) return "another product";
    }
  }
  return "";
}

// Seconds for the loads and additions of a product with the closed matrix, entry by entry, as if it had no rows.
double without_rows(const SmMatrix& closed) {
  constexpr int kTimes = 5;
  const auto n = static_cast<std::size_t>(closed.rows);
  const auto entries = static_cast<std::size_t>(closed.row_start[n]);
  const std::vector<double> x(n, 1.0);
  std::vector<double> y(n, 0.0);
  double least = 1e300;
  volatile double sum = 0.0;  // so that the loads are not left out
  for (int k = 0; k < kTimes; ++k) {
    least = std::min(least, seconds_per_call([&] {
                       sum = exchange(closed.col_index, closed.nz_values, entries, x.data(), y.data());
                     }));
  }
  return least;
}

}  // namespace

void measure_products(Workbench& bench) {
  const UpperRows& rows = bench.rows();
  SmMatrix* closed = bench.closed();
  const std::int64_t last = rows.n - 1;
  for (const int k : {1, 8}) {
    const std::vector<double> x = bench.right_hand_sides(k);
    std::vector<double> y(x.size());
    const auto run_ours = [&] {
      return seconds_per_call([&] {
        expect_ok(bench.module().by_name().qxsmmultv(closed, x.data(), y.data(), 0, last, 0, last, k, 0),
                  "multiplying");
      });
    };
    const auto run_eigen = [&] { return seconds_per_call([&] { multiply_by_eigen(rows, x, y, k); }); };
    const auto fault = [&] { return product_fault(rows, x, y); };
    const std::vector<Outcome> outcomes =
        bench.race(fmt::format("product{}", k), {{kOurs, run_ours, fault}, {"Eigen", run_eigen, fault}});
    // What must move at least: a value and an index of 8 bytes an entry, the row starts, and both vectors.
    const double bytes = 16.0 * rows.entries() + 8.0 * (1.0 + 2.0 * k) * rows.n;
    bench.record("product", fmt::format("{} vector{}", k, k == 1 ? "" : "s"), outcomes,
                 {{"bytes", bytes}, {"without_rows", k * without_rows(*closed)}});
  }
}

}  // namespace sm::bench
