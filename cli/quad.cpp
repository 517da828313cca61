#include <fmt/core.h>

#include <algorithm>
#include <cmath>

#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/matrix_output.hpp"
#include "cli/run.hpp"

namespace sm::cli {
namespace {

constexpr const char* kToBeAForm = "only symmetric matrices have forms";

// Whether sums of products could overflow on the way to X A X': each is at most the square of a sum of magnitudes in a
// row of X, times the largest element of A.
bool may_overflow(const LoadedMatrix& a, const LoadedMatrix& x) {
  double row = 0.0;
  if (x.upper_only) {
    row = infinity_norm_symmetric(x.rows);
  } else {
    for (std::size_t i = 0; i + 1 < x.rows.start.size(); ++i) {
      double sum = 0.0;
      for (auto p = x.rows.start[i]; p < x.rows.start[i + 1]; ++p) {
        sum += std::fabs(x.rows.value[static_cast<std::size_t>(p)]);
      }
      row = std::max(row, sum);
    }
  }
  double largest = 0.0;
  for (const double value : a.rows.value) largest = std::max(largest, std::fabs(value));
  return !std::isfinite(row * largest * row) || !std::isfinite(row * row * largest);
}

void report_overflow(Run& run, const char* what) {
  run.report().fail({.code = ExitCode::no, .file = run.matrix().name, .what = what, .advice = "scale the matrices"});
}

// A sparse result keeps no NaN that an overflow leaves, so that overflows have to be ruled out beforehand. Null, and a
// report that says so, when they cannot.
SmMatrix* plain_form(Run& run, const LoadedMatrix& x) {
  const Form form = form_in_file(x);
  const bool dense = form.kind == SM_KIND_GENERAL && form.format != SM_FORMAT_SPARSE;
  if (!dense && may_overflow(run.matrix(), x)) {
    report_overflow(run, "the form can overflow");
    return nullptr;
  }
  ModuleSession& session = run.session();
  SmMatrix* const a = sparse_matrix(session, run.matrix(), run.clock());
  SmMatrix* const rows = module_matrix(session, x, form, run.clock());
  SmMatrix* const result = new_matrix(session, dense ? Form{SM_KIND_SYMMETRIC, SM_FORMAT_COLUMNS} : kSymmetricSparse);
  const SmStatus status = run.clock().timed("multiplying", [&] { return session.fn().qxsmquad(a, rows, result, 0); });
  session.expect_ok(status, "computing the form");
  return result;
}

// Null when A has no inverse to speak of; the report says why.
SmMatrix* inverse_form(Run& run, const LoadedMatrix& x) {
  const std::int64_t p = x.rows.rows;
  const std::vector<double> vectors = dense_rows(x, run.common().ceiling);
  const double values = 0.5 * static_cast<double>(p) * static_cast<double>(p + 1);
  require_memory(8.0 * values, run.common().ceiling, fmt::format("a form of order {}", p));
  Factorization* const factor = run.factored();
  if (!factor) return nullptr;
  report_outcome(run.report(), *factor);
  ModuleSession& session = run.session();
  std::vector<double> packed(static_cast<std::size_t>(values), 0.0);
  const SmStatus status = run.clock().timed("multiplying", [&] {
    return session.fn().qxsminvquadv(factor->matrix(), vectors.data(), packed.data(), p, kSymmetricPacked.format);
  });
  session.expect_ok(status, "computing the form");
  SmMatrix* const result = new_matrix(session, kSymmetricPacked);
  session.expect_ok(session.steps().qxsmcopyv(packed.data(), result, p, p, kSymmetricPacked.kind, result->format),
                    "keeping the form");
  return result;
}

bool is_finite(const SmMatrix& form) {
  if (form.format == SM_FORMAT_SPARSE) return true;  // overflows were ruled out
  return std::all_of(form.values, form.values + form.nnz, [](double value) { return std::isfinite(value); });
}

void report_form(Run& run, SmMatrix& form, OutputFile* output, const std::string& comment) {
  std::vector<double> diagonal(static_cast<std::size_t>(form.rows));
  if (form.rows > 0) {
    run.session().expect_ok(run.session().fn().qxsmdiag(&form, diagonal.data(), 0, form.rows - 1),
                            "reading the diagonal of the form");
  }
  const std::int64_t count = write_matrix(output, form, comment);
  run.report().add("form_order", form.rows, "form",
                   fmt::format("{} x {}, {} values in its lower triangle", form.rows, form.rows, count));
  run.report().add_json("form_values", count);
  report_first_values(run.report(), "diagonal", diagonal);
  report_written(run.report(), output, "written", fmt::format("{} x {} ({})", form.rows, form.rows, kind_text(form)));
}

}  // namespace

Report run_quad(const QuadOptions& options, const CommonOptions& common, Progress& progress) {
  Run run("quad", {options.matrix, options.rows}, common, progress);
  const LoadedMatrix x = run.load(options.rows);
  require_symmetric(run.matrix(), options.inverse ? kToBeFactored : kToBeAForm);
  require_columns(x, run.matrix().rows.rows);
  const auto output = run.open_output();
  const char* const of = options.inverse ? "X A^- X'" : "X A X'";
  run.report().add_json("of", of);
  run.report().add("rows_file", x.name, "rows of X", matrix_text(x));
  SmMatrix* const form = options.inverse ? inverse_form(run, x) : plain_form(run, x);
  if (!form) return run.finish();
  if (is_finite(*form)) {
    report_form(run, *form, output.get(),
                comment_text(fmt::format("{}, A in {}, X in {}", of, run.matrix().name, x.name)));
  } else {
    report_overflow(run, "the form overflows");
  }
  return run.finish();
}

}  // namespace sm::cli
