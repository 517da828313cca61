// The subcommands: what each is told, and what it finds out.
#pragma once

#include <cstdint>
#include <string>

#include "cli/progress.hpp"
#include "cli/report.hpp"

namespace sm::cli {

// Options that every subcommand has.
struct CommonOptions {
  bool json = false;
  bool quiet = false;
  std::string memory;         // as given: "4G"
  std::uint64_t ceiling = 0;  // in bytes; what the machine has when not given
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
  std::string output;  // empty: the diagonal is not written
};

struct SolveOptions {
  std::string matrix;
  std::string right_hand_sides;  // empty: b = A * 1
  std::string output;            // empty: the solution is not written
  std::string method = "direct";
};

struct GridOptions {
  std::int64_t nx = 0;
  std::int64_t ny = 0;
  double shift = 0.0;
  std::string output = "-";
};

// Each throws CommandError when it cannot go on; a numerical "no" is a report with another exit code.
Report run_info(const InfoOptions& options, const CommonOptions& common, Progress& progress);
Report run_factor(const FactorOptions& options, const CommonOptions& common, Progress& progress);
Report run_invdiag(const InvdiagOptions& options, const CommonOptions& common, Progress& progress);
Report run_solve(const SolveOptions& options, const CommonOptions& common, Progress& progress);
Report run_grid(const GridOptions& options);

// A b is called inconsistent with a singular A when its relative residual is above this.
constexpr double kInconsistent = 1e-10;

}  // namespace sm::cli
