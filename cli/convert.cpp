#include <fmt/core.h>

#include "cli/commands.hpp"
#include "cli/matrix_output.hpp"
#include "cli/run.hpp"

namespace sm::cli {
namespace {

constexpr const char* kToBePacked = "only symmetric matrices are packed";

Form target_form(const std::string& to, const LoadedMatrix& matrix) {
  if (to == "dense") return kGeneralDense;
  if (to == "packed") return kSymmetricPacked;
  return matrix.upper_only ? kSymmetricSparse : kGeneralSparse;
}

}  // namespace

Report run_convert(const ConvertOptions& options, const CommonOptions& common, Progress& progress) {
  Run run("convert", {options.matrix}, common, progress);
  const LoadedMatrix& matrix = run.matrix();
  if (options.to == "packed") require_symmetric(run.matrix(), kToBePacked);
  const auto output = run.open_output();
  ModuleSession& session = run.session();
  SmMatrix* const source = module_matrix(session, matrix, form_in_file(matrix), run.clock());
  SmMatrix* const target = new_matrix(session, target_form(options.to, matrix));
  const SmStatus status = run.clock().timed("converting", [&] { return session.fn().qxsmconvert(source, target, 0); });
  session.expect_ok(status, "converting the matrix");
  const std::int64_t count = write_matrix(output.get(), *target, comment_text(matrix.name + ", converted"));
  run.report().add("to", options.to, "to", fmt::format("{} ({})", options.to, kind_text(*target)));
  run.report().add_json("to_format", kind_text(*target));
  run.report().add("values", count, "values", fmt::format("{}", count));
  run.report().add("output", output->path(), "written", output->path());
  return run.finish();
}

}  // namespace sm::cli
