#include "mixed/error.hpp"

#include <array>

namespace sm::mixed {
namespace {

// Names come from a user's files, and control characters in them would be obeyed by a terminal.
std::string without_controls(const std::string& text) {
  constexpr std::array<char, 17> kDigits{"0123456789abcdef"};
  std::string out;
  unsigned char before = 0;
  for (const char c : text) {
    const auto byte = static_cast<unsigned char>(c);
    // Behind C2, bytes up to 9F are a second set of controls.
    const bool second = before == 0xc2 && byte < 0xa0;
    if (second) out.replace(out.size() - 1, 1, "\\xc2");
    before = byte;
    if (!second && byte >= 0x20 && byte != 0x7f) {
      out += c;
    } else {
      out += "\\x";
      out += kDigits[byte >> 4];
      out += kDigits[byte & 0xf];
    }
  }
  return out;
}

}  // namespace

std::string describe(const Fault& fault) {
  std::string text = fault.file;
  if (fault.line > 0) text += (text.empty() ? "line " : ":") + std::to_string(fault.line);
  if (fault.column > 0) {
    text += fault.line > 0 ? ":" : text.empty() ? "column " : ": column ";
    text += std::to_string(fault.column);
  }
  if (!text.empty()) text += ": ";
  if (!fault.variable.empty()) text += "'" + fault.variable + "': ";
  text += fault.what;
  if (!fault.expected.empty()) text += ", expected " + fault.expected;
  if (!fault.advice.empty()) text += "; " + fault.advice;
  text = without_controls(text);
  if (!fault.excerpt.empty()) text += "\n" + fault.excerpt;
  return text;
}

}  // namespace sm::mixed
