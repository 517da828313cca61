// Facts that more than one subcommand reports.
#pragma once

#include "cli/commands.hpp"
#include "cli/factorization.hpp"
#include "cli/loading.hpp"
#include "cli/report.hpp"

namespace sm::cli {

// What the pools may hand out: what the user says, or what the machine has beside the resident memory of the command.
std::uint64_t pool_ceiling(const CommonOptions& common);

void report_matrix(Report& report, const LoadedMatrix& matrix);
void report_outcome(Report& report,
                    const Factorization& factorization);  // rank, determinant, definiteness, dropped rows
void report_counts(Report& report, const FactorCounts& counts, std::int64_t order);
void report_phases(Report& report, double reading, const Factorization& factorization);
void report_memory(Report& report, const ModuleSession& session);

// The answer to a matrix with a negative pivot.
void report_not_definite(Report& report, const LoadedMatrix& matrix);

}  // namespace sm::cli
