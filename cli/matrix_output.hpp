// Matrices of the module as Matrix Market files.
#pragma once

#include <string>

#include "cli/module_matrix.hpp"
#include "cli/output_file.hpp"

namespace sm::cli {

// "array real symmetric": how a matrix of that form is written.
std::string kind_text(const SmMatrix& matrix);

// Writes a closed matrix with 17 digits and finishes the file: sparse ones as coordinates, without entries that are 0,
// dense and packed ones as arrays; symmetric ones by their lower triangle. Answers how many values were written. A null
// file takes nothing, and the values are counted all the same.
std::int64_t write_matrix(OutputFile* out, const SmMatrix& matrix, const std::string& comment);

}  // namespace sm::cli
