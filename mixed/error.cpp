#include "mixed/error.hpp"

namespace sm::mixed {

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
  if (!fault.excerpt.empty()) text += "\n" + fault.excerpt;
  return text;
}

}  // namespace sm::mixed
