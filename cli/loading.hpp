// From the files that the user names to the matrices that the subcommands work on.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "cli/progress.hpp"
#include "cli/sparse.hpp"

namespace sm::cli {

struct LoadedMatrix {
  std::string name;  // as messages name the file
  Header header;
  std::int64_t file_entries = 0;  // as stored in the file; of an array, the values that are not 0
  CompressedRows rows;            // of a symmetric file, the upper triangle only
  bool upper_only = false;        // whether that is so, here or after require_symmetric
  double seconds = 0.0;
};

// "coordinate real symmetric"
std::string kind_text(const Header& header);

// The path "-" is standard input. `limit` as in require_memory.
LoadedMatrix load_matrix(const std::string& path, std::uint64_t limit, Progress& progress);

// Reduces a matrix to its upper triangle. Throws CommandError when it is not square, or not symmetric in value; `why`
// opens the advice.
constexpr const char* kToBeFactored = "only symmetric matrices are factored";
void require_symmetric(LoadedMatrix& matrix, const char* why = kToBeFactored);

// Throws CommandError when the matrix has not as many columns as another one, A, has rows.
void require_columns(const LoadedMatrix& matrix, std::int64_t order);

// Row i of a matrix as the i-th of `rows` vectors of `cols` elements, zeros included. `limit` as in require_memory.
std::vector<double> dense_rows(const LoadedMatrix& matrix, std::uint64_t limit);

// Dense columns, one after the other.
struct Columns {
  std::int64_t rows = 0;
  std::int64_t count = 0;
  std::vector<double> values;
};

// Right-hand sides for a matrix of the given order. Throws CommandError when the file has another number of rows.
Columns load_columns(const std::string& path, std::int64_t order, std::uint64_t limit, Progress& progress);

}  // namespace sm::cli
