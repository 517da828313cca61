// One system on the bench: the problem, its reference rows, and the module's matrix in the stages that phases start
// from, each made when it is first asked for.
#pragma once

#include <initializer_list>
#include <optional>
#include <string>
#include <vector>

#include "bench/harness/module.hpp"
#include "bench/harness/race.hpp"
#include "bench/harness/records.hpp"
#include "bench/harness/upper_rows.hpp"

namespace sm::bench {

class Workbench {
 public:
  Workbench(Module& module, Problem problem, Records& records, Forecast& forecast, int rounds);

  [[nodiscard]] const Problem& problem() const { return problem_; }
  const UpperRows& rows();
  Module& module() { return module_; }

  // State 1, 2 and 5. They stay as they are: phases work on copies, or read.
  SmMatrix* closed();
  SmMatrix* ordered();
  SmMatrix* factored();
  // perm[k] is the row that the module places k-th.
  const std::vector<int>& permutation();
  qxhost::Matrix copy_of(SmMatrix* source);

  // False, with the phases recorded as not run, when ordering or factoring would take too long.
  bool can_factor(std::initializer_list<const char*> phases);

  // `count` right-hand sides one after the other, all in the range of the matrix.
  std::vector<double> right_hand_sides(int count);

  [[nodiscard]] std::string job(const std::string& phase) const { return problem_.family + "/" + phase; }
  Forecast& forecast() { return forecast_; }
  std::vector<Outcome> race(const std::string& phase, const std::vector<Contestant>& contestants);
  void record(const std::string& phase, const std::string& variant, const std::vector<Outcome>& outcomes,
              const Json& facts = Json::object());

 private:
  Module& module_;
  Problem problem_;
  Records& records_;
  Forecast& forecast_;
  int rounds_;
  std::optional<UpperRows> rows_;
  std::optional<qxhost::Matrix> closed_, ordered_, factored_;
  std::vector<int> permutation_;
};

// An open matrix with these contributions entered one by one.
void enter(const SmFunctionTable& fn, SmMatrix* matrix, const Triplets& entries);

// Subscripts that are kept of U: rows share the ends of theirs.
double kept_subscripts(const SmMatrix& factor);

}  // namespace sm::bench
