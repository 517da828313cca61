#include "cli/known_precision.hpp"

#include <memory>
#include <utility>

#include "cli/loading.hpp"
#include "mixed/pedigree_file.hpp"
#include "mixed/precision.hpp"
#include "mixed/relationship.hpp"
#include "mixed/row_ids.hpp"

namespace sm::cli {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

// Calls visit(row, col, value) for every entry of the whole matrix, so that the rows of each column ascend.
template <class Visit>
void for_each_entry(const LoadedMatrix& matrix, Visit visit) {
  const CompressedRows& rows = matrix.rows;
  for (std::int64_t i = 0; i < rows.rows; ++i) {
    for (std::int64_t p = rows.start[at(i)]; p < rows.start[at(i) + 1]; ++p) {
      const std::int64_t j = rows.col[at(p)];
      visit(i, j, rows.value[at(p)]);
      if (matrix.upper_only && j != i) visit(j, i, rows.value[at(p)]);
    }
  }
}

mixed::SparseColumns columns_of(const LoadedMatrix& matrix) {
  mixed::SparseColumns columns;
  columns.rows = matrix.rows.rows;
  std::vector<std::int64_t> next(at(matrix.rows.cols) + 1, 0);
  for_each_entry(matrix, [&](std::int64_t, std::int64_t j, double) { ++next[at(j) + 1]; });
  for (std::size_t j = 1; j < next.size(); ++j) next[j] += next[j - 1];
  columns.start = next;
  columns.row.resize(at(next.back()));
  columns.value.resize(at(next.back()));
  for_each_entry(matrix, [&](std::int64_t i, std::int64_t j, double value) {
    const std::size_t p = at(next[at(j)]++);
    columns.row[p] = i;
    columns.value[p] = value;
  });
  return columns;
}

}  // namespace

mixed::KnownPrecision load_precision(const std::string& matrix, const std::string& ids, const mixed::Module& module,
                                     std::uint64_t limit, Progress& progress) {
  const LoadedMatrix loaded = load_matrix(matrix, limit, progress);
  const mixed::MatrixNames names{.file = loaded.name, .ids = mixed::read_row_ids(ids, loaded.header.rows)};
  auto precision = std::make_shared<const mixed::Precision>(mixed::matrix_precision(module, columns_of(loaded), names));
  return {.labels = names.ids, .precision = std::move(precision)};
}

mixed::KnownPrecision load_pedigree(const std::string& path, std::vector<std::string>& notes) {
  mixed::Pedigree pedigree = mixed::read_pedigree(path);
  notes.insert(notes.end(), pedigree.notes.begin(), pedigree.notes.end());
  auto precision = std::make_shared<const mixed::Precision>(mixed::pedigree_precision(pedigree, path));
  return {.labels = std::move(pedigree.ids), .precision = std::move(precision)};
}

}  // namespace sm::cli
