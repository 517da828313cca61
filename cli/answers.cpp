#include "cli/answers.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cmath>

#include "cli/commands.hpp"
#include "cli/format.hpp"

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

std::string answer_text(const Answer& answer, bool singular) {
  std::string text = fmt::format("{:.3e}", answer.residual);
  if (answer.gradients) {
    text += fmt::format(" after {} iterations{}", answer.gradients->iterations,
                        answer.gradients->converged ? "" : ", not converged");
  }
  if (singular || !answer.consistent) text += answer.consistent ? ", consistent" : ", inconsistent";
  return text;
}

Json answer_object(const Answer& answer, std::size_t index) {
  Json object{{"index", index}, {"relative_residual", answer.residual}, {"consistent", answer.consistent}};
  if (answer.gradients) {
    object["converged"] = answer.gradients->converged;
    object["iterations"] = answer.gradients->iterations;
    object["preconditioned_residual"] = answer.gradients->residual;
    object["history"] = answer.gradients->history;
  }
  return object;
}

void report_each(Report& report, const std::vector<Answer>& answers, bool singular) {
  Json list = Json::array();
  for (std::size_t j = 0; j < answers.size(); ++j) {
    list.push_back(answer_object(answers[j], j + 1));
    if (j >= kShown) continue;
    report.add_text(answers.size() == 1 ? "relative residual" : fmt::format("relative residual {}", j + 1),
                    answer_text(answers[j], singular));
  }
  if (answers.size() > kShown) report.add_text("...", fmt::format("{} more", answers.size() - kShown));
  report.add_json("right_hand_sides", std::move(list));
}

// The numbers, from 1, of the answers with some property.
template <class Property>
std::vector<std::int64_t> numbers_of(const std::vector<Answer>& answers, Property property) {
  std::vector<std::int64_t> numbers;
  for (std::size_t j = 0; j < answers.size(); ++j) {
    if (property(answers[j])) numbers.push_back(static_cast<std::int64_t>(j) + 1);
  }
  return numbers;
}

bool is_broken(const Answer& answer) { return !std::isfinite(answer.residual); }
bool is_inconsistent(const Answer& answer) { return !answer.consistent; }
bool is_unfinished(const Answer& answer) { return answer.gradients && !answer.gradients->converged; }

// What is wrong with the answers as a whole, if anything.
void blame(Report& report, const std::string& name, const std::vector<Answer>& answers) {
  Problem problem{.code = ExitCode::no, .file = name};
  if (const auto broken = numbers_of(answers, is_broken); !broken.empty()) {
    problem.what = fmt::format("the solution overflows for the right-hand sides {}", list_text(broken));
    problem.advice = "scale the matrix and the right-hand sides";
  } else if (const auto inconsistent = numbers_of(answers, is_inconsistent); !inconsistent.empty()) {
    problem.what = fmt::format(
        "A x = b has no solution for the right-hand sides {} (A is singular, relative residual above {:.0e})",
        list_text(inconsistent), kInconsistent);
    problem.advice = "the x found is that of a generalized inverse; check b, or remove the dropped rows";
  } else if (const auto unfinished = numbers_of(answers, is_unfinished); !unfinished.empty()) {
    const GradientOutcome& first = *answers[static_cast<std::size_t>(unfinished.front() - 1)].gradients;
    problem.what = fmt::format(
        "conjugate gradients have not converged for the right-hand sides {} (number {} is at {:.2e} of its first "
        "residual after {} iterations)",
        list_text(unfinished), unfinished.front(), first.residual, first.iterations);
    problem.advice = "raise --max-iterations or --tolerance, or use --method direct";
  } else {
    return;
  }
  report.fail(problem);
}

}  // namespace

std::vector<Answer> measure(const CompressedRows& upper, const Columns& b, const std::vector<double>& x) {
  const double norm = infinity_norm_symmetric(upper);
  std::vector<double> scratch(static_cast<std::size_t>(upper.rows));
  std::vector<Answer> answers;
  for (std::int64_t j = 0; j < b.count; ++j) {
    const std::int64_t offset = j * b.rows;
    Answer answer;
    answer.residual = relative_residual(upper, norm, x.data() + offset, b.values.data() + offset, scratch);
    answers.push_back(answer);
  }
  return answers;
}

void report_answers(Report& report, const std::string& name, const std::vector<Answer>& answers, bool singular) {
  report_each(report, answers, singular);
  double worst = 0.0;
  bool finite = true;
  for (const Answer& answer : answers) {
    worst = std::max(worst, answer.residual);
    finite = finite && !is_broken(answer);
  }
  report.add(
      "largest_residual", finite ? Json(worst) : Json(), "largest residual",
      finite ? fmt::format("{:.3e} (||b - A x|| / (||A|| ||x|| + ||b||), infinity norms)", worst) : "not finite");
  blame(report, name, answers);
}

}  // namespace sm::cli
