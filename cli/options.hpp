// The command line: which subcommand with which options, and the help that goes with them.
#pragma once

#include <string>

#include "cli/commands.hpp"

namespace sm::cli {

struct Options {
  Report (*run)(const Options& options, Progress& progress) = nullptr;  // the subcommand
  bool filter = false;  // nothing is said beside an output that goes to standard output
  CommonOptions common;
  InfoOptions info;
  FactorOptions factor;
  SolveOptions solve;
  InvdiagOptions invdiag;
  QuadOptions quad;
  TraceOptions trace;
  HermiteOptions hermite;
  EstimableOptions estimable;
  ConvertOptions convert;
  PedigreeOptions pedigree;
  ModelOptions model;
  GridOptions grid;
  std::string answer;  // help or version that was asked for: to be printed instead of a run

  // Whether the result itself goes to standard output, so that the report has to go elsewhere.
  bool output_is_taken() const { return common.output == "-"; }
};

// Throws CommandError for anything that the command does not take.
Options parse_options(int argc, const char* const* argv);

// Whether --json is among the arguments; holds also for those that parse_options refuses.
bool wants_json(int argc, const char* const* argv);

}  // namespace sm::cli
