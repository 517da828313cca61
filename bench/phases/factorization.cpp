// Symbolic and numeric factorization with the module's own permutation given to every peer. Each run starts from a
// matrix that is ordered and nothing more, so that everyone meets fresh memory.
#include <cmath>
#include <memory>
#include <optional>

#include "bench/harness/clock.hpp"
#include "bench/peers/cholmod.hpp"
#include "bench/phases/phases.hpp"

namespace sm::bench {
namespace {

constexpr double kLogTolerance = 1e-9;

class Ours {
 public:
  explicit Ours(Workbench& bench) : bench_(bench) {}

  double run() {
    const Exports& steps = bench_.module().by_name();
    matrix_.reset();
    matrix_ = bench_.copy_of(bench_.ordered());
    symbolic.push_back(seconds_of([&] {
      expect_ok(steps.qxsmreorder(*matrix_), "reordering");
      expect_ok(steps.qxsmsymbfact(*matrix_), "symbolic factorization");
    }));
    return seconds_of([&] { expect_ok(steps.qxsmnumfact(*matrix_), "numeric factorization"); });
  }

  // `peer` is a factorization of the same matrix in the same order, or null.
  std::string fault(const Cholmod* peer) {
    const Problem& problem = bench_.problem();
    const SmMatrix& m = **matrix_;
    if (m.rank != problem.rank) return number_fault("rank", static_cast<double>(m.rank), problem.rank, 0.0, 0.0);
    std::vector<double> x(problem.rhs.size());
    expect_ok(bench_.module().fn().qxsmsubst(*matrix_, problem.rhs.data(), x.data(), 1), "solving");
    if (std::string fault = solution_fault(bench_.rows(), x.data(), problem.rhs); !fault.empty()) return fault;
    if (!peer) return "";
    const auto entries = static_cast<double>(m.factor_iu[m.rows] + m.rows);
    if (entries != peer->fill().entries) return number_fault("entries", entries, peer->fill().entries, 0.0, 0.0);
    return number_fault("log-determinant", m.log_det, peer->log_determinant(), problem.n, kLogTolerance);
  }

  // What a symbolic factorization must move at least: an entry of A is read and written, a value and a subscript; the
  // subscripts of U are written, and four words a row say where they and the values begin. 0 when nothing was run.
  double symbolic_bytes() {
    if (!matrix_) return 0.0;
    return 32.0 * bench_.rows().entries() + 8.0 * kept_subscripts(**matrix_) + 32.0 * bench_.rows().n;
  }

  std::vector<double> symbolic;

 private:
  Workbench& bench_;
  std::optional<qxhost::Matrix> matrix_;
};

class Peer {
 public:
  Peer(Workbench& bench, Kind kind) : bench_(bench), kind_(kind) {}

  double run() {
    cholmod.reset();
    cholmod = std::make_unique<Cholmod>(bench_.rows(), Ordering::given, kind_, &bench_.permutation());
    symbolic.push_back(seconds_of([&] { cholmod->analyse(); }));
    return seconds_of([&] { cholmod->factorize(); });
  }
  std::string fault() {
    const Problem& problem = bench_.problem();
    return solution_fault(bench_.rows(), cholmod->solve(problem.rhs.data(), 1), problem.rhs);
  }

  std::unique_ptr<Cholmod> cholmod;
  std::vector<double> symbolic;

 private:
  Workbench& bench_;
  Kind kind_;
};

}  // namespace

void measure_factorization(Workbench& bench) {
  if (!bench.can_factor({"symbolic", "numeric"})) return;
  Ours ours(bench);
  Peer simplicial(bench, Kind::simplicial), supernodal(bench, Kind::supernodal);
  // The peers run first in each round and stand as references then.
  const auto reference = [&]() -> const Cholmod* {
    return supernodal.cholmod ? supernodal.cholmod.get() : simplicial.cholmod.get();
  };
  std::vector<Contestant> contestants;
  if (bench.problem().definite()) {  // CHOLMOD has no answer to a singular matrix
    contestants.push_back({"CHOLMOD simplicial", [&] { return simplicial.run(); }, [&] { return simplicial.fault(); }});
    contestants.push_back({"CHOLMOD supernodal", [&] { return supernodal.run(); }, [&] { return supernodal.fault(); }});
  }
  contestants.push_back({kOurs, [&] { return ours.run(); }, [&] { return ours.fault(reference()); }});
  const std::vector<Outcome> numeric = bench.race("numeric", contestants);

  std::vector<Outcome> symbolic = numeric;
  for (Outcome& outcome : symbolic) {
    outcome.seconds = outcome.name == kOurs                  ? ours.symbolic
                      : outcome.name == "CHOLMOD simplicial" ? simplicial.symbolic
                                                             : supernodal.symbolic;
  }
  const Fill fill = fill_of(bench.rows(), bench.permutation());
  bench.record("symbolic", "", symbolic, {{"factor_entries", fill.entries}, {"bytes", ours.symbolic_bytes()}});
  // The values of U are written and read again, an entry of A is a value and a subscript.
  const double bytes = 16.0 * fill.entries + 16.0 * bench.rows().entries();
  bench.record("numeric", "", numeric, {{"flops", fill.flops}, {"factor_entries", fill.entries}, {"bytes", bytes}});
}

}  // namespace sm::bench
