// Matrices of the module, made from the rows that the command has read. They go back with the instance.
#pragma once

#include "cli/module_session.hpp"
#include "cli/progress.hpp"
#include "cli/sparse.hpp"

namespace sm::cli {

// Enters the rows element by element into a matrix that takes them. Throws CommandError.
void enter_rows(ModuleSession& session, SmMatrix* matrix, const CompressedRows& rows, Progress& progress);

// A closed sparse matrix: general, or symmetric with `rows` as its upper triangle. Nothing is dropped.
SmMatrix* module_matrix(ModuleSession& session, const CompressedRows& rows, bool symmetric, Progress& progress);

}  // namespace sm::cli
