#include "cli/commands.hpp"
#include "cli/facts.hpp"

namespace sm::cli {

Report run_factor(const FactorOptions& options, const CommonOptions& common, Progress& progress) {
  LoadedMatrix matrix = load_matrix(options.matrix, common.ceiling, progress);
  Report report("factor");
  report_matrix(report, matrix);
  require_symmetric(matrix);

  ModuleSession session(pool_ceiling(common));
  Factorization factorization(session, matrix.rows, progress);
  factorization.analyse();
  const bool factored = factorization.factor();
  if (factored) {
    report_outcome(report, factorization);
  } else {
    report_not_definite(report, matrix);
  }
  report_counts(report, factorization.counts(), factorization.order());
  report_phases(report, matrix.seconds, factorization);
  report_memory(report, session);
  return report;
}

}  // namespace sm::cli
