// The diagonal of the inverse, and the trace of the inverse times a matrix on the pattern, beside a plain column by
// column Takahashi on CHOLMOD's factor in the same order.
#include <cmath>
#include <memory>
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

std::string difference(const std::vector<double>& got, const std::vector<double>& want) {
  for (std::size_t i = 0; i < got.size(); ++i) {
    if (std::string fault = number_fault("an element", got[i], want[i], 0.0, kTolerance); !fault.empty()) return fault;
  }
  return "";
}

}  // namespace

void measure_inverse(Workbench& bench) {
  if (!bench.problem().definite()) return;
  for (const char* phase : {"inverse", "trace"}) {
    if (!bench.can_factor(phase)) return;
  }
  const Problem& problem = bench.problem();
  const SmFunctionTable& fn = bench.module().fn();
  Cholmod peer(bench.rows(), Ordering::given, Kind::supernodal, &bench.permutation());
  peer.analyse();
  peer.factorize();
  peer.make_simplicial();
  const DiagonalProbes probes(peer, problem.n);
  Takahashi takahashi(peer);
  const double work = takahashi.work();

  // A copy each time: what an earlier call left in the matrix must not help.
  std::vector<double> ours(problem.rhs.size());
  std::vector<double> theirs;  // empty until the peer has run
  std::vector<Contestant> contestants;
  if (work < kTooMuch) {
    contestants.push_back({"column Takahashi",
                           [&] {
                             const double seconds = seconds_of([&] { takahashi.run(); });
                             theirs = takahashi.diagonal();
                             return seconds;
                           },
                           [&] { return probes.fault(theirs); }});
  }
  contestants.push_back({kOurs,
                         [&] {
                           const qxhost::Matrix matrix = bench.copy_of(bench.factored());
                           return seconds_of([&] { expect_ok(fn.qxsminvdiag(matrix, ours.data()), "inverting"); });
                         },
                         [&] {
                           std::string fault = probes.fault(ours);
                           return fault.empty() && !theirs.empty() ? difference(ours, theirs) : fault;
                         }});
  const Json facts = {{"column_work", work}};
  std::vector<Outcome> outcomes = bench.race("inverse", contestants);
  bench.record("inverse", "", outcomes, facts);

  // B = A, entered by itself: the trace is the rank.
  double trace = 0.0;
  contestants.pop_back();
  if (!contestants.empty()) {
    contestants[0].run = [&] {
      return seconds_of([&] {
        takahashi.run();
        trace = takahashi.trace_with(bench.rows());
      });
    };
    contestants[0].fault = [&] { return number_fault("trace", trace, problem.rank, 0.0, kTolerance); };
  }
  contestants.push_back({kOurs,
                         [&] {
                           const qxhost::Matrix matrix = bench.copy_of(bench.factored());
                           return seconds_of([&] {
                             expect_ok(bench.module().by_name().qxsmtraceinvAB(matrix, bench.closed(), 0, &trace),
                                       "tracing");
                           });
                         },
                         [&] { return number_fault("trace", trace, problem.rank, 0.0, kTolerance); }});
  outcomes = bench.race("trace", contestants);
  bench.record("trace", "", outcomes, facts);
}

}  // namespace sm::bench
