#include "mixed/expression.hpp"

#include <fmt/core.h>

#include <array>
#include <cmath>

#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

struct Function {
  std::string_view name;
  double (*apply)(double);
};
constexpr std::array<Function, 8> kFunctions = {{{"I", [](double x) { return x; }},
                                                 {"log", [](double x) { return std::log(x); }},
                                                 {"exp", [](double x) { return std::exp(x); }},
                                                 {"sqrt", [](double x) { return std::sqrt(x); }},
                                                 {"abs", [](double x) { return std::fabs(x); }},
                                                 {"log2", [](double x) { return std::log2(x); }},
                                                 {"log10", [](double x) { return std::log10(x); }},
                                                 {"log1p", [](double x) { return std::log1p(x); }}}};

// What people write who come from elsewhere, and what to write here.
struct Elsewhere {
  std::string_view name;
  std::string_view advice;
};
constexpr std::array<Elsewhere, 14> kElsewhere = {{
    {"poly", "write the powers: x + I(x^2)"},
    {"ns", "put the columns of the spline into the data"},
    {"bs", "put the columns of the spline into the data"},
    {"s", "put the columns of the smooth into the data"},
    {"offset", "subtract it from the response: y - x ~ ..."},
    {"factor", "name the column with --factor"},
    {"as.factor", "name the column with --factor"},
    {"ordered", "name the column with --factor"},
    {"relevel", "give the order of the levels with --levels"},
    {"scale", "write it out with numbers: I((x - 5) / 2)"},
    {"C", "choose the contrasts with --contrasts"},
    {"cbind", "fit one response at a time"},
    {"cut", "make the column of classes in the data"},
    {"interaction", "write a:b"},
}};

const Function* find_function(std::string_view name) {
  for (const Function& function : kFunctions) {
    if (function.name == name) return &function;
  }
  return nullptr;
}

void check_call(std::string_view formula, const Node& node) {
  if (!find_function(node.text)) {
    std::string advice = "make the column in the data; the name of one with parentheses stands in backquotes";
    for (const Elsewhere& other : kElsewhere) {
      if (other.name == node.text) advice = other.advice;
    }
    refuse_formula(formula, {.column = node.column,
                             .what = fmt::format("found {}(), which is not available", node.text),
                             .expected = "I, log, log2, log10, log1p, exp, sqrt or abs",
                             .advice = advice});
  }
  if (node.args.size() != 1) {
    refuse_formula(formula,
                   {.column = node.column,
                    .what = fmt::format("found {} in {}()",
                                        count_of(static_cast<std::int64_t>(node.args.size()), "argument"), node.text),
                    .expected = "one",
                    .advice = node.text == "log" ? "write log2(x), log10(x) or I(log(x) / log(3))" : ""});
  }
  check_arithmetic(formula, node.args[0]);
}

void check_name(std::string_view formula, const Node& node) {
  if (node.text != ".") return;
  refuse_formula(formula, {.column = node.column,
                           .what = "found a point for all other columns",
                           .expected = "names of columns",
                           .advice = "write them out"});
}

std::string why_not(const Node& node, double left, double right) {
  if (node.kind == NodeKind::call) {
    const std::string call = fmt::format("{}({:.6g})", node.text, left);
    const bool negative = node.text == "log1p" ? left <= -1.0 : left <= 0.0;
    if (node.text.starts_with("log") && negative) {
      return fmt::format("{} is the logarithm of a number that is not {}", call,
                         node.text == "log1p" ? "above -1" : "positive");
    }
    return fmt::format("{} is {}", call, node.text == "sqrt" ? "the square root of a negative number" : "too large");
  }
  std::string text = fmt::format("{:.6g}{}{:.6g}", left, node.kind == NodeKind::power ? "^" : " / ", right);
  if (node.kind == NodeKind::divide && right == 0.0) return text + " is a division by zero";
  if (node.kind == NodeKind::power && left == 0.0) return text + " is a division by zero";
  if (node.kind == NodeKind::power && left < 0.0) return text + " is a negative number to a power that is not whole";
  return "the value is too large";
}

template <class Combine>
std::vector<double> combined(std::vector<double> left, const std::vector<double>& right, Combine combine) {
  for (std::size_t i = 0; i < left.size(); ++i) left[i] = combine(left[i], right[i]);
  return left;
}

}  // namespace

void check_expression(std::string_view formula, const Node& node) {
  if (node.kind == NodeKind::call) return check_call(formula, node);
  check_name(formula, node);
}

void check_arithmetic(std::string_view formula, const Node& node) {
  switch (node.kind) {
    case NodeKind::number:
      return;
    case NodeKind::name:
      return check_name(formula, node);
    case NodeKind::call:
      return check_call(formula, node);
    case NodeKind::bar:
    case NodeKind::double_bar:
    case NodeKind::interact:
      refuse_formula(formula, {.column = node.column,
                               .what = fmt::format("found {} where a number is computed", quote(print_node(node))),
                               .expected = "arithmetic with + - * / ^",
                               .advice = "random terms and interactions stand outside"});
    default:
      break;
  }
  for (const Node& operand : node.args) check_arithmetic(formula, operand);
}

std::vector<double> evaluate(const Node& node, std::size_t rows,
                             const std::function<std::vector<double>(const Node& name)>& column) {
  if (node.kind == NodeKind::number) return std::vector<double>(rows, node.number);
  if (node.kind == NodeKind::name) return column(node);
  std::vector<double> left = evaluate(node.args[0], rows, column);
  if (node.kind == NodeKind::negate) {
    for (double& value : left) value = -value;
    return left;
  }
  if (node.kind == NodeKind::call) {
    const Function* const function = find_function(node.text);
    for (double& value : left) value = function->apply(value);
    return left;
  }
  const std::vector<double> right = evaluate(node.args[1], rows, column);
  switch (node.kind) {
    case NodeKind::plus:
      return combined(std::move(left), right, [](double a, double b) { return a + b; });
    case NodeKind::minus:
      return combined(std::move(left), right, [](double a, double b) { return a - b; });
    case NodeKind::times:
      return combined(std::move(left), right, [](double a, double b) { return a * b; });
    case NodeKind::divide:
      return combined(std::move(left), right, [](double a, double b) { return a / b; });
    // Squares by multiplication, as R has them.
    default:
      return combined(std::move(left), right, [](double a, double b) { return b == 2.0 ? a * a : std::pow(a, b); });
  }
}

NoValue find_no_value(const Node& node, const std::function<double(const Node& name)>& cell) {
  for (const Node& operand : node.args) {
    NoValue inner = find_no_value(operand, cell);
    if (inner.part) return inner;
  }
  const auto value_of = [&](const Node& part) {
    return evaluate(part, 1, [&](const Node& name) { return std::vector<double>{cell(name)}; }).front();
  };
  if (std::isfinite(value_of(node))) return {};
  const double left = node.args.empty() ? 0.0 : value_of(node.args[0]);
  return {.part = &node, .why = why_not(node, left, node.args.size() < 2 ? 0.0 : value_of(node.args[1]))};
}

}  // namespace sm::mixed
