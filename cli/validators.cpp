#include "cli/validators.hpp"

#include <fmt/core.h>

#include <algorithm>

#include "cli/error.hpp"
#include "cli/fields.hpp"
#include "cli/format.hpp"

namespace sm::cli {

std::string alternatives(const std::vector<std::string>& names) {
  std::string text;
  for (std::size_t i = 0; i < names.size(); ++i) {
    text += (i == 0 ? "" : i + 1 == names.size() ? " or " : ", ") + names[i];
  }
  return text;
}

CLI::Validator one_of(const std::vector<std::string>& names) {
  const auto check = [names](const std::string& text) -> std::string {
    if (std::find(names.begin(), names.end(), text) != names.end()) return {};
    return fmt::format("found {}, expected {}", quote(text), alternatives(names));
  };
  return {check, ""};
}

CLI::Validator memory_size() {
  const auto check = [](const std::string& text) -> std::string {
    if (parse_memory(text)) return {};
    return fmt::format("found {}, expected a number of bytes above 0 with an optional suffix K, M, G or T (4G)",
                       quote(text));
  };
  return {check, ""};
}

CLI::Validator count() {
  const auto check = [](const std::string& text) -> std::string {
    std::int64_t value = 0;
    if (parse_index(text, value) && value > 0) return {};
    return fmt::format("found {}, expected a whole number above 0", quote(text));
  };
  return {check, ""};
}

CLI::Validator finite_number(const char* expected, double smallest) {
  const auto check = [expected, smallest](const std::string& text) -> std::string {
    double value = 0.0;
    if (parse_real(text, value) && value >= smallest) return {};
    return fmt::format("found {}, expected {}", quote(text), expected);
  };
  return {check, ""};
}

CLI::Validator tolerance() { return finite_number("a finite number, 0 or above", 0.0); }

CLI::Validator assignment(const char* example) {
  const auto check = [example](const std::string& text) -> std::string {
    const std::size_t equals = text.find('=');
    if (equals != std::string::npos && equals > 0 && equals + 1 < text.size()) return {};
    return fmt::format("found {}, expected a name, = and a value ({})", quote(text), example);
  };
  return {check, ""};
}

}  // namespace sm::cli
