// Facts that more than one subcommand reports.
#pragma once

#include <span>
#include <string>

#include "cli/commands.hpp"
#include "cli/factorization.hpp"
#include "cli/loading.hpp"
#include "cli/output_file.hpp"
#include "cli/report.hpp"

namespace sm::cli {

// What the pools may hand out: what the user says, or what the machine has beside the resident memory of the command.
std::uint64_t pool_ceiling(const CommonOptions& common);

void report_matrix(Report& report, const LoadedMatrix& matrix);
// By which order; how long finding it took is among the phases.
void report_ordering(Report& report, Ordering ordering);
// Rank, determinant, definiteness, dropped rows.
void report_outcome(Report& report, const Factorization& factorization);
void report_counts(Report& report, const FactorCounts& counts, std::int64_t order);
void report_phases(Report& report, const PhaseClock& clock);
void report_memory(Report& report, const ModuleSession& session);

// The first of the values, one to a line, `label` with their number from 1 in front of each; as "first_values" in JSON.
void report_first_values(Report& report, const char* label, std::span<const double> values);

// Where the result went, if it did: "3 x 3, in f.mtx".
void report_written(Report& report, const OutputFile* output, const char* label, const std::string& shape);

// "f.mtx (coordinate real symmetric), 3 x 3"
std::string matrix_text(const LoadedMatrix& matrix);

// The answer to a matrix with a negative pivot.
void report_not_definite(Report& report, const LoadedMatrix& matrix);

}  // namespace sm::cli
