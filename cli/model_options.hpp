// The options of the subcommands that fit models.
#pragma once

#include <CLI/App.hpp>

#include "cli/commands.hpp"

namespace sm::cli {

enum class ModelCommand { lmm, reml, blup };

void add_model_options(CLI::App& command, ModelOptions& options, ModelCommand which);

}  // namespace sm::cli
