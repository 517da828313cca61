#include "cli/error.hpp"

#include <fmt/core.h>

#include <system_error>

namespace sm::cli {

std::string describe(const Problem& problem) {
  std::string text;
  if (!problem.file.empty()) {
    text += problem.file;
    if (problem.line > 0) text += fmt::format(":{}", problem.line);
    text += ": ";
  }
  text += problem.what;
  if (!problem.expected.empty()) text += ", expected " + problem.expected;
  if (!problem.advice.empty()) text += "; " + problem.advice;
  return text;
}

std::string quote(std::string_view text) {
  constexpr std::size_t kLongest = 60;
  std::string out = "\"";
  for (const char c : text.substr(0, kLongest)) {
    const auto byte = static_cast<unsigned char>(c);
    if (byte >= 0x20 && byte < 0x7f) {
      out += c;
    } else if (byte == '\t') {
      out += ' ';
    } else {
      out += fmt::format("\\x{:02x}", byte);
    }
  }
  out += text.size() > kLongest ? "...\"" : "\"";
  return out;
}

std::string system_message(int error_number) { return std::generic_category().message(error_number); }

}  // namespace sm::cli
