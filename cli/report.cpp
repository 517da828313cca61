#include "cli/report.hpp"

#include <fmt/core.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

namespace sm::cli {

Report::Report(std::string command) { json_["command"] = std::move(command); }

void Report::add(const std::string& key, Json value, std::string label, std::string text) {
  json_[key] = std::move(value);
  lines_.emplace_back(std::move(label), std::move(text));
}

void Report::add_json(const std::string& key, Json value) { json_[key] = std::move(value); }

void Report::add_text(std::string label, std::string text) { lines_.emplace_back(std::move(label), std::move(text)); }

void Report::fail(const Problem& problem) {
  code_ = problem.code;
  failure_ = describe(problem);
  json_["error"] = error_object(problem);
}

std::string Report::text() const {
  if (!text_.empty()) return text_;
  std::size_t width = 0;
  for (const auto& [label, text] : lines_) width = std::max(width, label.size());
  std::string out;
  for (const auto& [label, text] : lines_) out += fmt::format("{:<{}}  {}\n", label, width, text);
  return out;
}

std::string Report::json() const { return json_text_.empty() ? json_text(json_) : json_text_; }

Json error_object(const Problem& problem) {
  Json error;
  error["exit_code"] = static_cast<int>(problem.code);
  error["file"] = problem.file.empty() ? Json() : Json(problem.file);
  error["line"] = problem.line > 0 ? Json(problem.line) : Json();
  error["what"] = problem.what;
  error["expected"] = problem.expected.empty() ? Json() : Json(problem.expected);
  error["advice"] = problem.advice;
  error["message"] = describe(problem);
  return error;
}

void write_all(int file, std::string_view text, const std::string& name) {
  while (!text.empty()) {
    const ssize_t written = ::write(file, text.data(), text.size());
    if (written > 0) {
      text.remove_prefix(static_cast<std::size_t>(written));
    } else if (errno != EINTR) {
      throw CommandError({.file = name,
                          .what = fmt::format("cannot be written ({})", system_message(errno)),
                          .advice = "check the free space and that the reader of a pipe is still there"});
    }
  }
}

}  // namespace sm::cli
