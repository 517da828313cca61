#include <fmt/format.h>

#include <algorithm>
#include <cmath>
#include <optional>

#include "cli/commands.hpp"
#include "cli/facts.hpp"
#include "cli/format.hpp"
#include "cli/output_file.hpp"

namespace sm::cli {
namespace {

constexpr std::size_t kShown = 10;  // right-hand sides listed in the text

double infinity_norm(const double* x, std::int64_t n) {
  double norm = 0.0;
  for (std::int64_t i = 0; i < n; ++i) {
    // A NaN must not be lost in a maximum.
    if (!(std::fabs(x[i]) <= norm)) norm = std::fabs(x[i]);
    if (std::isnan(norm)) break;
  }
  return norm;
}

// ||b - A x|| / (||A|| ||x|| + ||b||) in the infinity norm, from the entries that were read.
double relative_residual(const CompressedRows& upper, double norm, const double* x, const double* b,
                         std::vector<double>& scratch) {
  const std::int64_t n = upper.rows;
  multiply_symmetric(upper, x, scratch.data());
  for (std::int64_t i = 0; i < n; ++i) {
    scratch[static_cast<std::size_t>(i)] = b[i] - scratch[static_cast<std::size_t>(i)];
  }
  const double residual = infinity_norm(scratch.data(), n);
  return residual == 0.0 ? 0.0 : residual / (norm * infinity_norm(x, n) + infinity_norm(b, n));
}

Columns right_hand_sides(const SolveOptions& options, const LoadedMatrix& matrix, std::uint64_t limit,
                         Progress& progress) {
  const std::int64_t n = matrix.rows.rows;
  if (!options.right_hand_sides.empty()) return load_columns(options.right_hand_sides, n, limit, progress);
  Columns b{.rows = n, .count = 1, .values = std::vector<double>(static_cast<std::size_t>(n))};
  const std::vector<double> ones(static_cast<std::size_t>(n), 1.0);
  multiply_symmetric(matrix.rows, ones.data(), b.values.data());
  return b;
}

struct Answer {
  double residual = 0.0;
  bool consistent = true;
};

std::vector<Answer> judge(const CompressedRows& upper, bool singular, const Columns& b, const std::vector<double>& x) {
  const double norm = infinity_norm_symmetric(upper);
  std::vector<double> scratch(static_cast<std::size_t>(upper.rows));
  std::vector<Answer> answers;
  for (std::int64_t j = 0; j < b.count; ++j) {
    const std::int64_t offset = j * b.rows;
    Answer answer;
    answer.residual = relative_residual(upper, norm, x.data() + offset, b.values.data() + offset, scratch);
    answer.consistent = !singular || answer.residual <= kInconsistent;
    answers.push_back(answer);
  }
  return answers;
}

void report_answers(Report& report, const std::vector<Answer>& answers, bool singular) {
  Json list = Json::array();
  for (std::size_t j = 0; j < answers.size(); ++j) {
    const auto& [residual, consistent] = answers[j];
    list.push_back({{"index", j + 1}, {"relative_residual", residual}, {"consistent", consistent}});
    if (j >= kShown) continue;
    report.add_text(answers.size() == 1 ? "relative residual" : fmt::format("relative residual {}", j + 1),
                    fmt::format("{:.3e}{}", residual,
                                !singular    ? ""
                                : consistent ? ", consistent"
                                             : ", inconsistent"));
  }
  if (answers.size() > kShown) report.add_text("...", fmt::format("{} more", answers.size() - kShown));
  report.add_json("right_hand_sides", std::move(list));
}

// What is wrong with the answers as a whole, if anything.
void judge_all(Report& report, const std::string& name, const std::vector<Answer>& answers) {
  std::vector<std::int64_t> broken;
  std::vector<std::int64_t> inconsistent;
  double worst = 0.0;
  for (std::size_t j = 0; j < answers.size(); ++j) {
    const auto number = static_cast<std::int64_t>(j) + 1;
    if (!std::isfinite(answers[j].residual)) {
      broken.push_back(number);
    } else {
      worst = std::max(worst, answers[j].residual);
      if (!answers[j].consistent) inconsistent.push_back(number);
    }
  }
  report.add("largest_residual", broken.empty() ? Json(worst) : Json(), "largest residual",
             broken.empty() ? fmt::format("{:.3e} (||b - A x|| / (||A|| ||x|| + ||b||), infinity norms)", worst)
                            : "not finite");
  if (!broken.empty()) {
    report.fail({.code = ExitCode::no,
                 .file = name,
                 .what = fmt::format("the solution overflows for the right-hand sides {}", list_text(broken)),
                 .advice = "scale the matrix and the right-hand sides"});
  } else if (!inconsistent.empty()) {
    report.fail({.code = ExitCode::no,
                 .file = name,
                 .what = fmt::format("A x = b has no solution for the right-hand sides {} (A is singular, relative "
                                     "residual above {:.0e})",
                                     list_text(inconsistent), kInconsistent),
                 .advice = "the x found is that of a generalized inverse; check b, or remove the dropped rows"});
  }
}

void write_solution(Report& report, std::optional<OutputFile>& output, const Columns& b, const std::vector<double>& x,
                    const std::string& name) {
  if (output) write_array(*output, b.rows, b.count, x.data(), comment_text("solution of A x = b, A in " + name));
  report.add("output", output ? Json(output->path()) : Json(), "solution",
             output ? fmt::format("{} x {}, in {}", b.rows, b.count, output->path()) : "not written (see -o)");
}

}  // namespace

Report run_solve(const SolveOptions& options, const CommonOptions& common, Progress& progress) {
  if (options.matrix == "-" && options.right_hand_sides == "-") {
    throw CommandError({.what = "both the matrix and the right-hand sides are to come from standard input",
                        .advice = "give one of them as a file"});
  }
  LoadedMatrix matrix = load_matrix(options.matrix, common.ceiling, progress);
  Report report("solve");
  report_matrix(report, matrix);
  require_symmetric(matrix);
  const Columns b = right_hand_sides(options, matrix, common.ceiling, progress);
  std::optional<OutputFile> output;
  if (!options.output.empty()) output.emplace(options.output, std::vector{options.matrix, options.right_hand_sides});

  ModuleSession session(pool_ceiling(common));
  Factorization factorization(session, matrix.rows, progress);
  factorization.analyse();
  if (!factorization.factor()) {
    report_not_definite(report, matrix);
    return report;
  }
  std::vector<double> x(b.values.size());
  factorization.solve(b.values.data(), x.data(), b.count);

  const bool given = !options.right_hand_sides.empty();
  report.add("right_hand_side_file", given ? Json(options.right_hand_sides) : Json(), "right-hand sides",
             given ? fmt::format("{}, from {}", b.count, options.right_hand_sides) : "1, b = A * 1");
  report_outcome(report, factorization);
  report_phases(report, matrix.seconds, factorization);
  const bool singular = factorization.rank() < factorization.order();
  const auto answers = judge(matrix.rows, singular, b, x);
  report_answers(report, answers, singular);
  judge_all(report, options.right_hand_sides.empty() ? matrix.name : options.right_hand_sides, answers);
  write_solution(report, output, b, x, matrix.name);
  report_memory(report, session);
  return report;
}

}  // namespace sm::cli
