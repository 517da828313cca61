#include "cli/loading.hpp"

#include <fmt/core.h>

#include <chrono>

#include "cli/error.hpp"

namespace sm::cli {
namespace {

std::string name_of(const std::string& path) { return path == "-" ? "standard input" : path; }

Header read_file(const std::string& path, EntrySink& sink, Progress& progress) {
  progress.phase("reading");
  FileBytes bytes(path, [&](std::uint64_t done, std::uint64_t total) {
    if (total > 0) progress.update(static_cast<double>(done) / static_cast<double>(total));
  });
  return read_matrix_market(bytes, name_of(path), sink);
}

// Fills dense columns. An array grows with its data; a coordinate file needs its room at once, and what it asks for is
// checked first.
class ColumnSink : public EntrySink {
 public:
  ColumnSink(std::string name, std::int64_t order, std::uint64_t limit)
      : name_(std::move(name)), order_(order), limit_(limit) {}

  void begin(const Header& header) override {
    header_ = header;
    if (header.rows != order_) {
      throw CommandError(
          {.file = name_,
           .line = header.size_line,
           .what = fmt::format("found {} rows", header.rows),
           .expected = fmt::format("{}, the order of the matrix", order_),
           .advice = "give a file with one row for each unknown, and one column for each right-hand side"});
    }
    columns_.rows = header.rows;
    columns_.count = header.cols;
    if (grows()) return;
    const double values = static_cast<double>(header.rows) * static_cast<double>(header.cols);
    require_memory(8.0 * values, limit_, fmt::format("{} right-hand sides of {} rows", header.cols, header.rows));
    columns_.values.assign(static_cast<std::size_t>(header.rows * header.cols), 0.0);
  }

  void take(std::span<const Entry> entries) override {
    for (const Entry& entry : entries) {
      if (grows()) {
        columns_.values.push_back(entry.value);
        continue;
      }
      value(entry.row, entry.col) += entry.value;
      if (header_.symmetry == Symmetry::symmetric && entry.row != entry.col) value(entry.col, entry.row) += entry.value;
    }
  }

  Columns& columns() { return columns_; }

 private:
  bool grows() const { return header_.layout == Layout::array && header_.symmetry == Symmetry::general; }
  double& value(std::int64_t row, std::int64_t col) {
    return columns_.values[static_cast<std::size_t>(col * columns_.rows + row)];
  }

  std::string name_;
  std::int64_t order_;
  std::uint64_t limit_;
  Header header_;
  Columns columns_;
};

}  // namespace

std::string kind_text(const Header& header) {
  const char* layout = header.layout == Layout::array ? "array" : "coordinate";
  const char* field = header.field == Field::real ? "real" : header.field == Field::integer ? "integer" : "pattern";
  const char* symmetry = header.symmetry == Symmetry::symmetric ? "symmetric" : "general";
  return fmt::format("{} {} {}", layout, field, symmetry);
}

LoadedMatrix load_matrix(const std::string& path, std::uint64_t limit, Progress& progress) {
  const auto begin = std::chrono::steady_clock::now();
  LoadedMatrix matrix;
  matrix.name = name_of(path);
  EntryStore store;
  matrix.header = read_file(path, store, progress);
  matrix.file_entries = store.size();
  matrix.rows = store.compress(matrix.name, limit);
  matrix.upper_only = matrix.header.symmetry == Symmetry::symmetric;
  matrix.seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - begin).count();
  return matrix;
}

void require_symmetric(LoadedMatrix& matrix, const char* why) {
  const Header& header = matrix.header;
  if (header.rows != header.cols) {
    throw CommandError({.file = matrix.name,
                        .line = header.size_line,
                        .what = fmt::format("found {} rows and {} columns", header.rows, header.cols),
                        .expected = "a square matrix",
                        .advice = std::string(why) + "; for least squares give the normal equations X'X"});
  }
  if (matrix.upper_only) return;
  const SymmetryCheck check = check_symmetry(matrix.rows);
  if (!check.values) {
    throw CommandError(
        {.file = matrix.name,
         .what = fmt::format("found {} at ({}, {}) and {} at ({}, {})", check.below, check.row + 1, check.col + 1,
                             check.above, check.col + 1, check.row + 1),
         .expected = "a symmetric matrix",
         .advice = std::string(why) + "; make the two equal, or write one triangle and symmetric in line 1"});
  }
  keep_upper_triangle(matrix.rows);
  matrix.upper_only = true;
}

void require_columns(const LoadedMatrix& matrix, std::int64_t order) {
  if (matrix.header.cols == order) return;
  throw CommandError({.file = matrix.name,
                      .line = matrix.header.size_line,
                      .what = fmt::format("found {} columns", matrix.header.cols),
                      .expected = fmt::format("{}, the order of the matrix", order),
                      .advice = "give a file with one column for each row of the matrix"});
}

std::vector<double> dense_rows(const LoadedMatrix& matrix, std::uint64_t limit) {
  const CompressedRows& rows = matrix.rows;
  require_memory(8.0 * static_cast<double>(rows.rows) * static_cast<double>(rows.cols), limit,
                 fmt::format("{} vectors of {} elements", rows.rows, rows.cols));
  std::vector<double> dense(static_cast<std::size_t>(rows.rows * rows.cols), 0.0);
  for (std::int64_t i = 0; i < rows.rows; ++i) {
    for (auto p = rows.start[static_cast<std::size_t>(i)]; p < rows.start[static_cast<std::size_t>(i + 1)]; ++p) {
      const std::int64_t j = rows.col[static_cast<std::size_t>(p)];
      const double value = rows.value[static_cast<std::size_t>(p)];
      dense[static_cast<std::size_t>(i * rows.cols + j)] = value;
      if (matrix.upper_only) dense[static_cast<std::size_t>(j * rows.cols + i)] = value;
    }
  }
  return dense;
}

Columns load_columns(const std::string& path, std::int64_t order, std::uint64_t limit, Progress& progress) {
  ColumnSink sink(name_of(path), order, limit);
  read_file(path, sink, progress);
  return std::move(sink.columns());
}

}  // namespace sm::cli
