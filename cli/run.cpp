#include "cli/run.hpp"

#include <algorithm>
#include <utility>

#include "cli/error.hpp"
#include "cli/facts.hpp"

namespace sm::cli {
namespace {

std::vector<std::string> checked(std::vector<std::string> inputs) {
  if (std::count(inputs.begin(), inputs.end(), "-") > 1) {
    throw CommandError(
        {.what = "both matrices are to come from standard input", .advice = "give one of them as a file"});
  }
  return inputs;
}

}  // namespace

Run::Run(const char* command, std::vector<std::string> inputs, const CommonOptions& common, Progress& progress)
    : common_(common),
      inputs_(checked(std::move(inputs))),
      matrix_(load_matrix(inputs_.front(), common.ceiling, progress)),
      report_(command),
      clock_(progress) {
  clock_.add({.name = "reading", .seconds = matrix_.seconds});
  report_matrix(report_, matrix_);
}

LoadedMatrix Run::load(const std::string& path) { return load_matrix(path, common_.ceiling, clock_.progress()); }

std::unique_ptr<OutputFile> Run::open_output() const {
  return common_.output.empty() ? nullptr : std::make_unique<OutputFile>(common_.output, inputs_);
}

ModuleSession& Run::session() {
  if (!session_) session_.emplace(pool_ceiling(common_));
  return *session_;
}

Factorization& Run::analysed() {
  require_symmetric(matrix_);
  factorization_.emplace(session(), matrix_, clock_);
  const Ordering ordering = common_.ordering.empty() ? Ordering::md : ordering_named(common_.ordering);
  factorization_->analyse(ordering, common_.ceiling);
  report_ordering(report_, ordering);
  return *factorization_;
}

Factorization* Run::factored() {
  if (analysed().factor()) return &*factorization_;
  report_not_definite(report_, matrix_);
  return nullptr;
}

Report Run::finish() {
  report_phases(report_, clock_);
  if (session_) report_memory(report_, *session_);
  return std::move(report_);
}

}  // namespace sm::cli
