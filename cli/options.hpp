// The command line: which subcommand with which options, and the help that goes with them.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "cli/commands.hpp"

namespace CLI {
class App;
}

namespace sm::cli {

enum class Command { none, info, factor, solve, invdiag, grid };

struct Options {
  Command command = Command::none;
  CommonOptions common;
  InfoOptions info;
  FactorOptions factor;
  SolveOptions solve;
  InvdiagOptions invdiag;
  GridOptions grid;
  std::string answer;  // help or version that was asked for: to be printed instead of a run
};

// Throws CommandError for anything that the command does not take.
Options parse_options(int argc, const char* const* argv);

// Whether --json is among the arguments; holds also for those that parse_options refuses.
bool wants_json(int argc, const char* const* argv);

}  // namespace sm::cli
