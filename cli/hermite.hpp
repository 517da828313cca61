// The Hermite form of a factored matrix.
#pragma once

#include "cli/module_matrix.hpp"
#include "cli/run.hpp"

namespace sm::cli {

// H = A^- A, with a row of zeros for each dropped pivot; general and sparse.
SmMatrix* hermite_form(Run& run, Factorization& factor);

}  // namespace sm::cli
