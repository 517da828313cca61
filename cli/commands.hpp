// The subcommands: what each is told, and what it finds out.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "cli/orderings.hpp"
#include "cli/progress.hpp"
#include "cli/report.hpp"

namespace sm::cli {

// Options that more than one subcommand has.
struct CommonOptions {
  bool json = false;
  bool quiet = false;
  std::string memory;         // as given: "4G"
  std::uint64_t ceiling = 0;  // in bytes; what the machine has when not given
  std::string output;         // where the result goes; empty: it is not written
  std::string ordering;       // of those that factor, as given: "amd"; empty: md
};

struct InfoOptions {
  std::string matrix;
  bool fill = false;
};

struct FactorOptions {
  std::string matrix;
};

struct InvdiagOptions {
  std::string matrix;
};

struct TraceOptions {
  std::string matrix;
  std::string other;  // empty: there is no second matrix
  bool inverse = false;
};

struct QuadOptions {
  std::string matrix;
  std::string rows;
  bool inverse = false;
};

struct HermiteOptions {
  std::string matrix;
};

struct EstimableOptions {
  std::string matrix;
  std::string rows;
  double tolerance = 1e-6;
};

struct SolveOptions {
  std::string matrix;
  std::string right_hand_sides;  // empty: b = A * 1
  std::string method = "direct";
  std::optional<double> tolerance;  // of the conjugate gradients, as the next one
  std::optional<std::int64_t> max_iterations;
};

struct ConvertOptions {
  std::string matrix;
  std::string to;
};

// Each of them a path, or empty: not asked for.
struct PedigreeOptions {
  std::string pedigree;
  std::string a;
  std::string ainv;
  std::string inbreeding;
  std::string mendelian;
  std::string ids;
  bool report_inbreeding = false;  // of each animal
  bool report_mendelian = false;
};

// A mixed model. Lists have an element for each time that an option was given.
struct ModelOptions {
  std::string data;
  std::string formula;
  bool ml = false;
  std::string weights;
  std::vector<std::string> factors;  // "g,f"
  std::vector<std::string> levels;   // "f=a,b,c"
  std::string contrasts = "treatment";
  std::string missing = "drop";
  std::string pedigree;
  std::vector<std::string> kinv;       // "name=K.mtx"
  std::vector<std::string> ids;        // "name=ids.txt"
  std::vector<std::string> variances;  // "animal=20"
  std::string start;
  std::vector<std::string> tests;
  std::vector<std::string> ratios;
  std::string predict;
  bool pev = false;
  std::string folder;
  std::string plots;
  bool dry_run = false;
};

struct GridOptions {
  std::int64_t nx = 0;
  std::int64_t ny = 0;
  double shift = 0.0;
};

// Each throws CommandError when it cannot go on; a numerical "no" is a report with another exit code.
Report run_info(const InfoOptions& options, const CommonOptions& common, Progress& progress);
Report run_factor(const FactorOptions& options, const CommonOptions& common, Progress& progress);
Report run_solve(const SolveOptions& options, const CommonOptions& common, Progress& progress);
Report run_invdiag(const InvdiagOptions& options, const CommonOptions& common, Progress& progress);
Report run_quad(const QuadOptions& options, const CommonOptions& common, Progress& progress);
Report run_trace(const TraceOptions& options, const CommonOptions& common, Progress& progress);
Report run_hermite(const HermiteOptions& options, const CommonOptions& common, Progress& progress);
Report run_estimable(const EstimableOptions& options, const CommonOptions& common, Progress& progress);
Report run_convert(const ConvertOptions& options, const CommonOptions& common, Progress& progress);
Report run_pedigree(const PedigreeOptions& options, const CommonOptions& common, Progress& progress);
Report run_lmm(const ModelOptions& options, const CommonOptions& common, Progress& progress);
Report run_reml(const ModelOptions& options, const CommonOptions& common, Progress& progress);
Report run_blup(const ModelOptions& options, const CommonOptions& common, Progress& progress);
Report run_grid(const GridOptions& options, const CommonOptions& common, Progress& progress);

// A b is called inconsistent with a singular A when its relative residual is above this.
constexpr double kInconsistent = 1e-10;

// A right-hand side counts as solved by conjugate gradients when its residual has come down to this part of the first.
constexpr double kConverged = 1e-10;

}  // namespace sm::cli
