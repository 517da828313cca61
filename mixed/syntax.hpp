// What a formula says, before what it means: operators and their operands, with their places.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace sm::mixed {

enum class NodeKind {
  number,
  name,
  call,        // text: the function
  negate,      // -a
  plus,        // a + b
  minus,       // a - b
  times,       // a * b
  divide,      // a / b
  interact,    // a:b
  power,       // a ^ b
  bar,         // a | b; text: the name behind the semicolon, if any
  double_bar,  // a || b; the same
};

struct Node {
  NodeKind kind = NodeKind::number;
  double number = 0.0;
  std::string text{};
  std::vector<Node> args{};
  std::int64_t column = 0;  // in characters of the formula, from 1
  bool parentheses = false;
};

// Anything wrong at a place of a formula, with the formula and a caret below the message.
struct FormulaFault {
  std::int64_t column = 0;
  std::string variable{};
  std::string what{};
  std::string expected{};
  std::string advice{};
};
[[noreturn]] void refuse_formula(std::string_view formula, const FormulaFault& fault);

struct FormulaSyntax {
  Node response;
  Node terms;
};

// "response ~ terms". Throws ModelError at the place where it is no formula.
FormulaSyntax parse_syntax(std::string_view formula);

// The expression as R prints it: "log(x + 1)", "I(x^2)".
std::string print_node(const Node& node);

// The name as it must stand in a formula: in backquotes unless it is an ordinary one.
std::string print_name(std::string_view name);

}  // namespace sm::mixed
