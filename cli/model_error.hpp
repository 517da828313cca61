// What is wrong with data or a model, as the command says it.
#pragma once

#include "cli/error.hpp"
#include "cli/report.hpp"
#include "mixed/error.hpp"

namespace sm::cli {

// 2, or 1 for a precision that is not positive semidefinite: that is an answer about numbers.
ExitCode exit_code_of(const mixed::ModelError& error);

// The object that stands for it in JSON output: that of a Problem, with column and variable.
Json error_object(const mixed::ModelError& error);

}  // namespace sm::cli
