#include "cli/matrix_output.hpp"

#include <iterator>

namespace sm::cli {
namespace {

void write_head(OutputFile& out, const SmMatrix& matrix, const std::string& comment) {
  fmt::format_to(std::back_inserter(out.buffer()), "%%MatrixMarket matrix {}\n% {}\n{} {}", kind_text(matrix), comment,
                 matrix.rows, matrix.cols);
}

std::int64_t write_coordinates(OutputFile* out, const SmMatrix& matrix, const std::string& comment) {
  std::int64_t count = 0;
  for_each_entry(matrix, [&](std::int64_t, std::int64_t, double value) { count += value != 0.0 ? 1 : 0; });
  if (!out) return count;
  write_head(*out, matrix, comment);
  const bool symmetric = matrix.kind == SM_KIND_SYMMETRIC;
  auto to = std::back_inserter(out->buffer());
  fmt::format_to(to, " {}\n", count);
  for_each_entry(matrix, [&](std::int64_t i, std::int64_t j, double value) {
    if (value == 0.0) return;
    // The upper triangle by rows, read the other way round, is the lower one by columns.
    fmt::format_to(to, "{} {} {:.16e}\n", (symmetric ? j : i) + 1, (symmetric ? i : j) + 1, value);
    out->flush_if_full();
  });
  return count;
}

std::int64_t write_values(OutputFile* out, const SmMatrix& matrix, const std::string& comment) {
  const bool symmetric = matrix.kind == SM_KIND_SYMMETRIC;
  const std::int64_t n = matrix.rows;
  if (!out) return matrix.nnz;
  write_head(*out, matrix, comment);
  auto to = std::back_inserter(out->buffer());
  fmt::format_to(to, "\n");
  for (std::int64_t j = 0; j < matrix.cols; ++j) {
    for (std::int64_t i = symmetric ? j : 0; i < n; ++i) {
      fmt::format_to(to, "{:.16e}\n", matrix.values[symmetric ? packed_place(matrix.format, n, j, i) : j * n + i]);
      out->flush_if_full();
    }
  }
  return matrix.nnz;
}

}  // namespace

std::string kind_text(const SmMatrix& matrix) {
  return fmt::format("{} real {}", matrix.format == SM_FORMAT_SPARSE ? "coordinate" : "array",
                     matrix.kind == SM_KIND_SYMMETRIC ? "symmetric" : "general");
}

std::int64_t write_matrix(OutputFile* out, const SmMatrix& matrix, const std::string& comment) {
  const std::int64_t count =
      matrix.format == SM_FORMAT_SPARSE ? write_coordinates(out, matrix, comment) : write_values(out, matrix, comment);
  if (out) out->finish();
  return count;
}

}  // namespace sm::cli
