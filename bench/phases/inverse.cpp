// The diagonal of the inverse, and the trace of the inverse times a matrix on the pattern, beside a plain column by
// column Takahashi on CHOLMOD's factor in the same order.
#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <optional>

#include "bench/generators/random.hpp"
#include "bench/harness/clock.hpp"
#include "bench/peers/takahashi.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {
namespace {

constexpr double kTolerance = 1e-8;
constexpr int kProbes = 32;
constexpr double kTooMuch = 3e11;  // multiplications, some minutes

// Elements of the diagonal against solves by CHOLMOD with columns of the unit matrix.
class DiagonalProbes {
 public:
  DiagonalProbes(Cholmod& peer, int n) {
    Random random(12);
    std::vector<double> unit(static_cast<std::size_t>(n));
    for (int k = 0; k < kProbes; ++k) {
      const auto i = static_cast<std::size_t>(random.below(n));
      unit[i] = 1.0;
      probes_.emplace_back(i, peer.solve(unit.data(), 1)[i]);
      unit[i] = 0.0;
    }
  }
  [[nodiscard]] std::string fault(const std::vector<double>& diagonal) const {
    for (const auto& [i, want] : probes_) {
      if (std::string fault = number_fault("an element", diagonal[i], want, 0.0, kTolerance); !fault.empty()) {
        return fault;
      }
    }
    return "";
  }

 private:
  std::vector<std::pair<std::size_t, double>> probes_;
};

// Relative to the largest element: those off the diagonal may be small by cancellation.
std::string difference(const std::vector<double>& got, const std::vector<double>& want) {
  double largest = 0.0;
  for (const double v : want) largest = std::max(largest, std::fabs(v));
  for (std::size_t i = 0; i < got.size(); ++i) {
    if (std::string fault = number_fault("an element", got[i], want[i], largest, kTolerance); !fault.empty()) {
      return fault;
    }
  }
  return "";
}

// The sum of A_ij (A^-1)_ij over both triangles is n.
std::string pattern_fault(const UpperRows& rows, const std::vector<double>& inverse) {
  double sum = 0.0;
  for (std::size_t i = 0; i + 1 < rows.start.size(); ++i) {
    const auto first = static_cast<std::size_t>(rows.start[i]);  // the diagonal
    const auto end = static_cast<std::size_t>(rows.start[i + 1]);
    for (std::size_t p = first; p < end; ++p) sum += (p == first ? 1.0 : 2.0) * rows.value[p] * inverse[p];
  }
  return number_fault("the sum of products with A", sum, rows.n, 0.0, kTolerance);
}

class InverseBench {
 public:
  explicit InverseBench(Workbench& bench)
      : bench_(bench),
        peer_(bench.rows(), Ordering::given, Kind::supernodal, &bench.permutation()),
        ours_(bench.problem().rhs.size()) {
    peer_.analyse();
    peer_.factorize();
    peer_.make_simplicial();
    probes_.emplace(peer_, bench.problem().n);
    takahashi_.emplace(peer_);
  }

  void diagonal() {
    std::vector<Contestant> contestants;
    if (takahashi_->work() < kTooMuch) {
      const auto run = [this] {
        const double seconds = seconds_of([&] { takahashi_->run(); });
        theirs_ = takahashi_->diagonal();
        return seconds;
      };
      contestants.push_back({kPeer, run, [this] { return probes_->fault(theirs_); }});
    }
    const auto run = [this] {
      const qxhost::Matrix matrix = fresh();
      return seconds_of(
          [&] { expect_ok(bench_.module().fn().qxsminvdiag(matrix, ours_.data()), "inverting the diagonal"); });
    };
    contestants.push_back({kOurs, run, [this] { return fault_of_ours(); }});
    record("inverse", "", contestants);
  }

  // The inverse at the stored entries, in a module that has it.
  void pattern() {
    if (!bench_.module().by_name().qxsminvpattern || takahashi_->work() >= kTooMuch) return;
    std::vector<double> theirs, ours(bench_.rows().value.size());
    const auto run_peer = [&] {
      const double seconds = seconds_of([&] { takahashi_->run(); });
      theirs = takahashi_->on_pattern(bench_.rows());
      return seconds;
    };
    const auto run = [&] {
      const qxhost::Matrix matrix = fresh();
      return seconds_of(
          [&] { expect_ok(bench_.module().by_name().qxsminvpattern(matrix, ours.data()), "inverting the pattern"); });
    };
    // The diagonal of the peer's has been compared with solves.
    const auto fault = [&] {
      std::string wrong = pattern_fault(bench_.rows(), ours);
      return wrong.empty() && !theirs.empty() ? difference(ours, theirs) : wrong;
    };
    record("inverse", "on the pattern", {{kPeer, run_peer, [] { return ""; }}, {kOurs, run, fault}});
  }

  // B = A, entered by itself: the trace is the rank.
  void trace() {
    double trace = 0.0;
    const auto fault = [&] { return number_fault("trace", trace, bench_.problem().rank, 0.0, kTolerance); };
    std::vector<Contestant> contestants;
    if (takahashi_->work() < kTooMuch) {
      const auto run = [&] {
        return seconds_of([&] {
          takahashi_->run();
          trace = takahashi_->trace_with(bench_.rows());
        });
      };
      contestants.push_back({kPeer, run, fault});
    }
    const auto run = [&] {
      const qxhost::Matrix matrix = fresh();
      SmMatrix* b = bench_.closed();
      return seconds_of([&] { expect_ok(bench_.module().by_name().qxsmtraceinvAB(matrix, b, 0, &trace), "tracing"); });
    };
    contestants.push_back({kOurs, run, fault});
    record("trace", "", contestants);
  }

 private:
  static constexpr const char* kPeer = "column Takahashi";

  // A copy each time: what an earlier call left in the matrix must not help.
  qxhost::Matrix fresh() { return bench_.copy_of(bench_.factored()); }

  std::string fault_of_ours() const {
    std::string fault = probes_->fault(ours_);
    return fault.empty() && !theirs_.empty() ? difference(ours_, theirs_) : fault;
  }

  void record(const char* phase, const char* variant, const std::vector<Contestant>& contestants) {
    const std::vector<Outcome> outcomes = bench_.race(fmt::format("{}{}", phase, variant), contestants);
    bench_.record(phase, variant, outcomes, {{"column_work", takahashi_->work()}});
  }

  Workbench& bench_;
  Cholmod peer_;
  std::optional<DiagonalProbes> probes_;
  std::optional<Takahashi> takahashi_;
  std::vector<double> ours_, theirs_;  // the second is empty until the peer has run
};

}  // namespace

void measure_inverse(Workbench& bench) {
  if (!bench.problem().definite() || !bench.can_factor({"inverse", "trace"})) return;
  InverseBench inverse(bench);
  inverse.diagonal();
  inverse.pattern();
  inverse.trace();
}

}  // namespace sm::bench
