// What the command says when it cannot go on, and the exit codes.
#pragma once

#include <cstdint>
#include <exception>
#include <string>
#include <string_view>

namespace sm::cli {

enum class ExitCode : int {
  fine = 0,
  no = 1,         // a numerical answer: not positive semidefinite, or inconsistent
  bad_input = 2,  // usage, files
  no_memory = 3,  // out of memory, or a failure of the system that is nobody's input
};

// One failure, in the parts that its message and its JSON object are made of.
struct Problem {
  ExitCode code = ExitCode::bad_input;
  std::string file{};      // empty: not about a file
  std::int64_t line = 0;   // 0: not about a line
  std::string what{};      // what was found or what went wrong, as a clause
  std::string expected{};  // what should have been there; may be empty
  std::string advice{};    // what to do next
};

// "bad.mtx:17: found 2 fields ("3 4"), expected 3 (row column value); complete the line"
std::string describe(const Problem& problem);

class CommandError : public std::exception {
 public:
  explicit CommandError(Problem problem) : problem_(std::move(problem)), text_(describe(problem_)) {}
  const Problem& problem() const { return problem_; }
  const char* what() const noexcept override { return text_.c_str(); }

 private:
  Problem problem_;
  std::string text_;
};

// Input text made fit for a message: quoted, cut to a readable length, unprintable bytes as \xNN.
std::string quote(std::string_view text);

// "error 13" is no help to anybody: the system's own words for an errno value.
std::string system_message(int error_number);

}  // namespace sm::cli
