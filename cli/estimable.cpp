#include <fmt/core.h>

#include <algorithm>
#include <limits>
#include <span>

#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/format.hpp"
#include "cli/hermite.hpp"

namespace sm::cli {
namespace {

constexpr std::size_t kShown = 10;  // rows listed in the text

// What the pivots alone say of a row.
enum class ByPivots { estimable, open, not_estimable };

struct Verdict {
  ByPivots pivots = ByPivots::open;
  bool hermite = false;  // l = l H
  bool check = false;    // l = A A^- l

  bool estimable() const { return hermite && check; }
};

// One character for each row of A: '1' when its pivot was accepted, else '0'.
std::string pivot_flags(Run& run, Factorization& factor) {
  std::string flags(static_cast<std::size_t>(factor.order()), '0');
  run.session().expect_ok(run.session().fn().qxsmpivot(factor.matrix(), flags.data()), "reading the pivots");
  return flags;
}

// With every pivot accepted every row is a combination of rows of A. Each dropped place has a null vector of A with a 1
// there and zeros in the other dropped places; a row with elements in dropped places only is not orthogonal to all of
// these. Rows with elements in both need a closer look.
ByPivots judge_by_pivots(const std::string& flags, std::span<const double> row) {
  bool in_dropped = false;
  bool in_accepted = false;
  bool any_dropped = false;
  for (std::size_t i = 0; i < row.size(); ++i) {
    any_dropped = any_dropped || flags[i] == '0';
    if (row[i] != 0.0) (flags[i] == '0' ? in_dropped : in_accepted) = true;
  }
  if (!any_dropped || (!in_dropped && !in_accepted)) return ByPivots::estimable;
  return in_accepted ? ByPivots::open : ByPivots::not_estimable;
}

// The module's check of all rows at once; true for those that pass.
std::vector<bool> passes(ModuleSession& session, SmMatrix* matrix, char mode, std::span<const double> rows,
                         std::int64_t count, double tolerance) {
  std::vector<std::int32_t> failed(static_cast<std::size_t>(count), 0);
  std::int64_t failures = 0;
  const SmStatus status = session.fn().qxsmcke(matrix, rows.data(), static_cast<std::int32_t>(count), &failures,
                                               failed.data(), mode, tolerance);
  session.expect_ok(status, "checking the rows");
  std::vector<bool> good(failed.size());
  for (std::size_t k = 0; k < good.size(); ++k) good[k] = failed[k] == 0;
  return good;
}

std::vector<Verdict> judge(Run& run, Factorization& factor, std::span<const double> rows, std::int64_t count,
                           double tolerance) {
  const auto n = static_cast<std::size_t>(factor.order());
  // The only row without elements is the zero of its space.
  if (n == 0) {
    return std::vector<Verdict>(static_cast<std::size_t>(count), {ByPivots::estimable, true, true});
  }
  const std::string flags = pivot_flags(run, factor);
  // With every pivot accepted H is the identity, and without any it has no entries for the module to check with.
  const bool regular = factor.rank() == factor.order();
  SmMatrix* const h = regular || factor.rank() == 0 ? nullptr : hermite_form(run, factor);
  std::vector<Verdict> verdicts(static_cast<std::size_t>(count));
  run.clock().timed("checking", [&] {
    const auto by_hermite = h ? passes(run.session(), h, 'H', rows, count, tolerance) : std::vector<bool>();
    const auto by_check = passes(run.session(), factor.matrix(), 'A', rows, count, tolerance);
    for (std::size_t k = 0; k < verdicts.size(); ++k) {
      verdicts[k].pivots = judge_by_pivots(flags, rows.subspan(k * n, n));
      verdicts[k].hermite = h ? by_hermite[k] : verdicts[k].pivots == ByPivots::estimable;
      verdicts[k].check = by_check[k];
    }
    return 0;
  });
  return verdicts;
}

std::string verdict_text(const Verdict& verdict) {
  const char* const pivots = verdict.pivots == ByPivots::estimable ? "yes"
                             : verdict.pivots == ByPivots::open    ? "open"
                                                                   : "no";
  return fmt::format("{} (pivots {}, Hermite form {}, check {})", verdict.estimable() ? "estimable" : "not estimable",
                     pivots, verdict.hermite ? "yes" : "no", verdict.check ? "yes" : "no");
}

Json verdict_object(const Verdict& verdict, std::size_t row) {
  return {{"row", row},
          {"estimable", verdict.estimable()},
          {"pivots", verdict.pivots == ByPivots::open ? Json() : Json(verdict.pivots == ByPivots::estimable)},
          {"hermite", verdict.hermite},
          {"check", verdict.check}};
}

void report_verdicts(Report& report, const std::string& name, const std::vector<Verdict>& verdicts) {
  Json list = Json::array();
  std::vector<std::int64_t> failing;
  for (std::size_t k = 0; k < verdicts.size(); ++k) {
    list.push_back(verdict_object(verdicts[k], k + 1));
    if (k < kShown) report.add_text(fmt::format("row {}", k + 1), verdict_text(verdicts[k]));
    if (!verdicts[k].estimable()) failing.push_back(static_cast<std::int64_t>(k) + 1);
  }
  if (verdicts.size() > kShown) report.add_text("...", fmt::format("{} more", verdicts.size() - kShown));
  report.add_json("rows_of_l", std::move(list));
  report.add(
      "not_estimable", failing, "not estimable",
      failing.empty() ? "none" : fmt::format("{} of {}: {}", failing.size(), verdicts.size(), list_text(failing)));
  if (failing.empty()) return;
  report.fail({.code = ExitCode::no,
               .file = name,
               .what = fmt::format("not estimable: {} {}", failing.size() == 1 ? "row" : "rows", list_text(failing)),
               .advice = "an estimable row is a combination of rows of A; change these, or raise --tolerance"});
}

}  // namespace

Report run_estimable(const EstimableOptions& options, const CommonOptions& common, Progress& progress) {
  Run run("estimable", {options.matrix, options.rows}, common, progress);
  const LoadedMatrix l = run.load(options.rows);
  require_symmetric(run.matrix());
  require_columns(l, run.matrix().rows.rows);
  if (l.rows.rows > std::numeric_limits<std::int32_t>::max()) {
    throw CommandError({.file = l.name,
                        .line = l.header.size_line,
                        .what = fmt::format("found {} rows", l.rows.rows),
                        .expected = "fewer than 2^31",
                        .advice = "test them in parts"});
  }
  const std::vector<double> rows = dense_rows(l, common.ceiling);
  Factorization* const factor = run.factored();
  if (!factor) return run.finish();
  run.report().add("rows_file", l.name, "rows of L", matrix_text(l));
  run.report().add("tolerance", options.tolerance, "tolerance", number_text(options.tolerance));
  report_outcome(run.report(), *factor);
  report_verdicts(run.report(), l.name, judge(run, *factor, rows, l.rows.rows, options.tolerance));
  return run.finish();
}

}  // namespace sm::cli
