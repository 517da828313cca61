// Matrices of the module, made from what the command has read, and read back. They go back with the instance.
#pragma once

#include "cli/loading.hpp"
#include "cli/module_session.hpp"
#include "cli/phases.hpp"

namespace sm::cli {

// Kind and storage format.
struct Form {
  std::int32_t kind;
  std::int32_t format;
};
constexpr Form kGeneralSparse{SM_KIND_GENERAL, SM_FORMAT_SPARSE};
constexpr Form kGeneralDense{SM_KIND_GENERAL, SM_FORMAT_COLUMNS};  // as an array file lists it
constexpr Form kSymmetricSparse{SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE};
constexpr Form kSymmetricPacked{SM_KIND_SYMMETRIC, SM_FORMAT_ROWS};  // likewise: its lower triangle by columns

// The form that a matrix has in its file: coordinates are sparse, arrays dense or packed. A matrix that was reduced to
// its upper triangle is symmetric, whatever the file calls it.
Form form_in_file(const LoadedMatrix& matrix);

// A matrix without a size, for a result.
SmMatrix* new_matrix(ModuleSession& session, Form form);

// A closed matrix; symmetric with `matrix.rows` as its upper triangle. Zeros off the diagonal of a symmetric sparse one
// are not kept. Throws CommandError, also for rows without columns or columns without rows, which the module does not
// take.
SmMatrix* module_matrix(ModuleSession& session, const LoadedMatrix& matrix, Form form, PhaseClock& clock);

// The same, general or symmetric as the file is, and sparse.
SmMatrix* sparse_matrix(ModuleSession& session, const LoadedMatrix& matrix, PhaseClock& clock);

// Where element (row, col) of a packed matrix of order n stands, row <= col.
constexpr std::int64_t packed_place(std::int32_t format, std::int64_t n, std::int64_t row, std::int64_t col) {
  return format == SM_FORMAT_ROWS ? (2 * n - row + 1) * row / 2 - row + col : col * (col + 1) / 2 + row;
}

// Calls visit(row, col, value), zero-based, for each stored entry of a closed sparse matrix, row by row. Of a symmetric
// one these are the entries of its upper triangle.
template <class Visit>
void for_each_entry(const SmMatrix& matrix, Visit visit) {
  for (std::int64_t i = 0; i < matrix.rows; ++i) {
    if (matrix.kind == SM_KIND_SYMMETRIC) {
      for (std::int64_t p = matrix.row_start[i]; p < matrix.row_start[i + 1]; ++p) {
        visit(i, matrix.col_index[p], matrix.nz_values[p]);
      }
    } else {
      const NonzeroNode* node = matrix.nnz > 0 ? matrix.tree->first(matrix.tree, &matrix.row_roots[i]) : nullptr;
      for (; node; node = sm_node_next(node)) visit(i, node->key, node->value);
    }
  }
}

}  // namespace sm::cli
