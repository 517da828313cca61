// Packed matrices: the triangular factor (qxsmfact) and the inverse (qxsminv), beside LAPACK's on full and packed ones.
#include <fmt/format.h>

#include <cmath>

#include "bench/generators/random.hpp"
#include "bench/harness/clock.hpp"
#include "bench/peers/lapack.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {
namespace {

constexpr double kTolerance = 1e-10;

std::size_t at(int i) { return static_cast<std::size_t>(i); }

// A definite matrix of order n: full by columns, and both packed layouts of its upper triangle.
struct DenseCase {
  explicit DenseCase(int order) : n(order), full(at(n) * at(n)) {
    Random random(13);
    for (int j = 0; j < n; ++j) {
      for (int i = 0; i <= j; ++i) {
        full[at(j) * at(n) + at(i)] = full[at(i) * at(n) + at(j)] =
            random.between(-1.0, 1.0) + (i == j ? 2.0 * std::sqrt(static_cast<double>(n)) : 0.0);
      }
    }
    for (int j = 0; j < n; ++j) {
      for (int i = 0; i <= j; ++i) by_columns.push_back(full[at(j) * at(n) + at(i)]);
      for (int k = j; k < n; ++k) by_rows.push_back(full[at(j) * at(n) + at(k)]);
    }
  }
  [[nodiscard]] const std::vector<double>& packed(int format) const {
    return format == SM_FORMAT_COLUMNS ? by_columns : by_rows;
  }
  [[nodiscard]] std::vector<double> times(const std::vector<double>& x) const {
    std::vector<double> y(at(n));
    for (int j = 0; j < n; ++j) {
      for (int i = 0; i < n; ++i) y[at(i)] += full[at(j) * at(n) + at(i)] * x[at(j)];
    }
    return y;
  }
  int n;
  std::vector<double> full, by_columns, by_rows;
};

class DenseBench {
 public:
  DenseBench(Module& module, Records& records, int n, int rounds)
      : module_(module), records_(records), case_(n), rounds_(rounds), known_(at(n)), right_() {
    Random random(14);
    for (double& v : known_) v = random.between(-1.0, 1.0);
    right_ = case_.times(known_);
  }

  void factor() {
    std::vector<Contestant> contestants;
    add_ours(contestants, [](const SmFunctionTable& fn, SmMatrix* m) { return fn.qxsmfact(m, 1); });
    contestants.push_back(
        {"dpotrf", [this] { return lapack(&factor_full, case_.full); },
         [this] { return number_fault("log-determinant", log_det(full_diagonal()), ours_, 1.0, kTolerance); }});
    contestants.push_back(
        {"dpptrf", [this] { return lapack(&factor_packed, case_.by_columns); },
         [this] { return number_fault("log-determinant", log_det(packed_diagonal()), ours_, 1.0, kTolerance); }});
    race("dense factor", contestants);
  }

  void inverse() {
    std::vector<Contestant> contestants;
    add_ours(contestants, [](const SmFunctionTable& fn, SmMatrix* m) { return fn.qxsminv(m, 1, NAN); });
    contestants.push_back(
        {"dpotrf + dpotri",
         [this] { return lapack([](auto& a, int n) { return factor_full(a, n) && invert_full(a, n); }, case_.full); },
         [this] { return inverse_fault(); }});
    race("dense inverse", contestants);
  }

 private:
  template <class Operation>
  void add_ours(std::vector<Contestant>& contestants, Operation operation) {
    for (const auto& [name, format] : {std::pair{"qxesm", SM_FORMAT_ROWS}, {"qxesm, by columns", SM_FORMAT_COLUMNS}}) {
      contestants.push_back({name, [this, operation, format = format] { return run_ours(operation, format); },
                             [this] { return number_fault("solution", error_, 0.0, 1.0, kTolerance); }});
    }
  }

  template <class Operation>
  double run_ours(Operation operation, int format) {
    const SmFunctionTable& fn = module_.fn();
    qxhost::Matrix matrix(module_.instance(), SM_KIND_SYMMETRIC, format);
    expect_ok(
        module_.by_name().qxsmcopyv(case_.packed(format).data(), matrix, case_.n, case_.n, SM_KIND_SYMMETRIC, format),
        "filling a packed matrix");
    const double seconds = seconds_of([&] { expect_ok(operation(fn, matrix), "the dense operation"); });
    // A factor is substituted with, an inverse is multiplied by: both must give the known solution.
    std::vector<double> x(at(case_.n));
    if (matrix->state == SM_STATE_FACTORED) {
      expect_ok(fn.qxsmsubst(matrix, right_.data(), x.data(), 1), "solving");
    } else {
      expect_ok(module_.by_name().qxsmmultv(matrix, right_.data(), x.data(), 0, case_.n - 1, 0, case_.n - 1, 1, 0),
                "multiplying");
    }
    ours_ = matrix->log_det;
    error_ = distance(x);
    return seconds;
  }

  template <class Work>
  double lapack(Work work, const std::vector<double>& from) {
    array_ = from;
    return seconds_of([&] {
      if (!work(array_, case_.n)) array_.clear();
    });
  }

  [[nodiscard]] double distance(const std::vector<double>& x) const {
    double worst = 0.0;
    for (std::size_t i = 0; i < x.size(); ++i) {
      const double error = std::fabs(x[i] - known_[i]);
      if (!(error <= worst)) worst = error;
    }
    return worst;
  }

  [[nodiscard]] std::vector<double> full_diagonal() const {
    std::vector<double> d;
    for (std::size_t i = 0; i < array_.size(); i += at(case_.n) + 1) d.push_back(array_[i]);
    return d;
  }
  [[nodiscard]] std::vector<double> packed_diagonal() const {
    std::vector<double> d;
    for (std::size_t i = 0, j = 0; i < array_.size(); i += ++j + 1) d.push_back(array_[i]);
    return d;
  }
  static double log_det(const std::vector<double>& diagonal) {
    double sum = 0.0;
    for (const double d : diagonal) sum += 2.0 * std::log(d);
    return diagonal.empty() ? NAN : sum;
  }

  // dpotri fills the upper triangle.
  [[nodiscard]] std::string inverse_fault() const {
    if (array_.empty()) return "LAPACK failed";
    std::vector<double> x(at(case_.n));
    for (int j = 0; j < case_.n; ++j) {
      for (int i = 0; i <= j; ++i) {
        const double v = array_[at(j) * at(case_.n) + at(i)];
        x[at(i)] += v * right_[at(j)];
        if (i != j) x[at(j)] += v * right_[at(i)];
      }
    }
    return number_fault("solution", distance(x), 0.0, 1.0, kTolerance);
  }

  void race(const std::string& phase, const std::vector<Contestant>& contestants) {
    Forecast forecast(INFINITY);
    const Race race{.job = phase, .n = static_cast<double>(case_.n), .rounds = rounds_};
    const double entries = 0.5 * case_.n * (case_.n + 1.0);
    records_.write({.family = "dense", .name = fmt::format("order {}", case_.n), .n = race.n, .entries = entries},
                   phase, "", run_race(race, contestants, forecast));
  }

  Module& module_;
  Records& records_;
  DenseCase case_;
  int rounds_;
  std::vector<double> known_, right_;  // A known = right
  std::vector<double> array_;          // LAPACK's
  double ours_ = 0.0;                  // log-determinant of the module's last run
  double error_ = 0.0;                 // and its distance from the known solution
};

}  // namespace

void measure_dense(Module& module, Records& records, int n, int rounds) {
  DenseBench bench(module, records, n, rounds);
  bench.factor();
  bench.inverse();
}

}  // namespace sm::bench
