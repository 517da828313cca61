// What a subcommand found out: each fact once, for the text and for the JSON object.
#pragma once

#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "cli/error.hpp"
#include "cli/json.hpp"

namespace sm::cli {

class Report {
 public:
  explicit Report(std::string command);

  // A fact with its line of text.
  void add(const std::string& key, Json value, std::string label, std::string text);
  // A fact that the text states elsewhere.
  void add_json(const std::string& key, Json value);
  // A line whose facts are in the JSON object by other means, such as one row of a table.
  void add_text(std::string label, std::string text);

  // Prints what was made elsewhere in place of the facts.
  void replace(std::string text, std::string json) {
    text_ = std::move(text);
    json_text_ = std::move(json);
  }

  // A numerical answer "no": what was found out stands, and the command ends with the problem's exit code.
  void fail(const Problem& problem);
  ExitCode code() const { return code_; }
  const std::string& failure() const { return failure_; }

  std::string text() const;
  std::string json() const;

 private:
  Json json_;
  std::vector<std::pair<std::string, std::string>> lines_;  // label and text
  std::string text_;
  std::string json_text_;
  ExitCode code_ = ExitCode::fine;
  std::string failure_;
};

// The object that stands for a failure in JSON output.
Json error_object(const Problem& problem);

// Writes all of `text` to a file descriptor. Throws CommandError, naming `name`, when that is not possible.
void write_all(int file, std::string_view text, const std::string& name);

}  // namespace sm::cli
