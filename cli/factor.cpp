#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/run.hpp"

namespace sm::cli {

Report run_factor(const FactorOptions& options, const CommonOptions& common, Progress& progress) {
  Run run("factor", {options.matrix}, common, progress);
  Factorization& factorization = run.analysed();
  if (factorization.factor()) {
    report_outcome(run.report(), factorization);
  } else {
    report_not_definite(run.report(), run.matrix());
  }
  report_counts(run.report(), factorization.counts(), factorization.order());
  return run.finish();
}

}  // namespace sm::cli
