// The options of the subcommands that fit models, and of the one that reads their pedigrees.
#pragma once

#include <CLI/App.hpp>

#include "cli/commands.hpp"

namespace sm::cli {

enum class ModelCommand { lmm, reml, blup };

void add_model_options(CLI::App& command, ModelOptions& options, ModelCommand which);

void add_pedigree_options(CLI::App& command, PedigreeOptions& pedigree);
// After parsing: which results are reported instead of written. True when one goes to standard output.
bool settle_pedigree(const CLI::App& command, PedigreeOptions& pedigree);

}  // namespace sm::cli
