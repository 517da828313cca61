#include "cli/module_matrix.hpp"

namespace sm::cli {
namespace {

constexpr std::int64_t kRowsPerUpdate = 4096;
constexpr const char* kDoing = "assembling the matrix";

}  // namespace

void enter_rows(ModuleSession& session, SmMatrix* matrix, const CompressedRows& rows, Progress& progress) {
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

SmMatrix* module_matrix(ModuleSession& session, const CompressedRows& rows, bool symmetric, Progress& progress) {
  progress.phase("assembling");
  const SmFunctionTable& fn = session.fn();
  SmMatrix* matrix = nullptr;
  session.expect_ok(symmetric ? fn.qxsmnewss(session.instance(), &matrix, rows.rows)
                              : fn.qxsmnewsg(session.instance(), &matrix, rows.rows, rows.cols),
                    kDoing);
  enter_rows(session, matrix, rows, progress);
  session.expect_ok(fn.qxsmclose(matrix, 0.0), "closing the matrix");
  return matrix;
}

}  // namespace sm::cli
