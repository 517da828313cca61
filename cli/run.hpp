// What the subcommands that work on a matrix have in common: reading it, the module at work on it, and the report.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "cli/commands.hpp"
#include "cli/factorization.hpp"
#include "cli/loading.hpp"
#include "cli/output_file.hpp"
#include "cli/report.hpp"

namespace sm::cli {

class Run {
 public:
  // Reads the first of the inputs, the matrix, and begins the report with it; the others are read by those who want
  // them, and the empty ones of them are none. Throws CommandError when two of them are standard input.
  Run(const char* command, std::vector<std::string> inputs, const CommonOptions& common, Progress& progress);

  LoadedMatrix& matrix() { return matrix_; }
  Report& report() { return report_; }
  const CommonOptions& common() const { return common_; }
  PhaseClock& clock() { return clock_; }

  // Reads another matrix.
  LoadedMatrix load(const std::string& path);
  // Opens the file for the result; null when it is not to be written. Throws CommandError.
  std::unique_ptr<OutputFile> open_output() const;
  // Loads the module with the first call, so that its pools get what reading has left.
  ModuleSession& session();
  // The matrix, symmetric and ordered, on its way to a factor.
  Factorization& analysed();
  // The same with its factor, or null when it is not positive semidefinite; the report says so then.
  Factorization* factored();

  // Ends the report with what the run has cost.
  Report finish();

 private:
  const CommonOptions& common_;
  std::vector<std::string> inputs_;
  LoadedMatrix matrix_;
  Report report_;
  PhaseClock clock_;
  std::optional<ModuleSession> session_;
  std::optional<Factorization> factorization_;
};

}  // namespace sm::cli
