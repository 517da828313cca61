#include "cli/module_matrix.hpp"

#include <fmt/core.h>

#include "cli/error.hpp"

namespace sm::cli {
namespace {

constexpr std::int64_t kRowsPerUpdate = 4096;
constexpr const char* kDoing = "assembling the matrix";

void size(ModuleSession& session, SmMatrix* matrix, const LoadedMatrix& loaded) {
  const SmStatus status = session.fn().qxsmresize(matrix, loaded.rows.rows, loaded.rows.cols);
  if (status == SM_BAD_SIZE) {
    throw CommandError({.file = loaded.name,
                        .line = loaded.header.size_line,
                        .what = fmt::format("found {} rows and {} columns", loaded.rows.rows, loaded.rows.cols),
                        .expected = "rows and columns, or neither",
                        .advice = "correct the size line"});
  }
  session.expect_ok(status, kDoing);
}

// Element by element, in add mode.
void enter(ModuleSession& session, SmMatrix* matrix, const CompressedRows& rows, Progress& progress) {
  const auto assign = session.fn().qxsmassign;
  for (std::int64_t i = 0; i < rows.rows; ++i) {
    const auto end = static_cast<std::size_t>(rows.start[static_cast<std::size_t>(i + 1)]);
    for (auto p = static_cast<std::size_t>(rows.start[static_cast<std::size_t>(i)]); p < end; ++p) {
      const SmStatus status = assign(matrix, i, rows.col[p], 1, rows.value[p]);
      if (status != SM_OK) session.expect_ok(status, kDoing);
    }
    if (i % kRowsPerUpdate == 0) progress.update(static_cast<double>(i) / static_cast<double>(rows.rows));
  }
}

}  // namespace

Form form_in_file(const LoadedMatrix& matrix) {
  if (matrix.header.layout == Layout::array) return matrix.upper_only ? kSymmetricPacked : kGeneralDense;
  return matrix.upper_only ? kSymmetricSparse : kGeneralSparse;
}

SmMatrix* new_matrix(ModuleSession& session, Form form) {
  SmMatrix* matrix = nullptr;
  session.expect_ok(session.fn().qxsmnew(session.instance(), &matrix, form.kind, form.format), "making a matrix");
  return matrix;
}

SmMatrix* module_matrix(ModuleSession& session, const LoadedMatrix& matrix, Form form, PhaseClock& clock) {
  SmMatrix* const made = clock.timed("assembling", [&] {
    SmMatrix* empty = new_matrix(session, form);
    size(session, empty, matrix);
    enter(session, empty, matrix.rows, clock.progress());
    return empty;
  });
  const SmStatus closed = clock.timed("closing", [&] { return session.fn().qxsmclose(made, 0.0); });
  session.expect_ok(closed, "closing the matrix");
  return made;
}

SmMatrix* sparse_matrix(ModuleSession& session, const LoadedMatrix& matrix, PhaseClock& clock) {
  return module_matrix(session, matrix, matrix.upper_only ? kSymmetricSparse : kGeneralSparse, clock);
}

}  // namespace sm::cli
