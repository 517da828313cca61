// Facts that more than one subcommand reports.
#pragma once

#include "cli/factorization.hpp"
#include "cli/loading.hpp"
#include "cli/report.hpp"

namespace sm::cli {

void report_matrix(Report& report, const LoadedMatrix& matrix);
void report_outcome(Report& report,
                    const Factorization& factorization);  // rank, determinant, definiteness, dropped rows
void report_counts(Report& report, const FactorCounts& counts, std::int64_t order);
void report_phases(Report& report, double reading, const Factorization& factorization);
void report_memory(Report& report, const ModuleSession& session);

// The answer to a matrix with a negative pivot.
void report_not_definite(Report& report, const LoadedMatrix& matrix);

}  // namespace sm::cli
