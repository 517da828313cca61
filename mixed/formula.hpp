// The meaning of a formula: which terms the fixed part has, in which order, and which random terms there are.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "mixed/syntax.hpp"

namespace sm::mixed {

// A column of the table, or numbers computed from some: "x", "log(x)", "I(x^2)".
struct Variable {
  std::string label;  // as R prints it
  Node expression;

  bool bare() const { return expression.kind == NodeKind::name; }
};

// Main effects in order of appearance, then interactions of two, of three and so on.
struct TermList {
  bool intercept = true;
  std::vector<Variable> variables;            // in order of appearance
  std::vector<std::vector<int>> terms;        // places in `variables`, ascending
  std::string label(std::size_t term) const;  // "a:b"
};

struct RandomPart {
  TermList terms;
  std::vector<Node> group;    // names of the columns whose levels are combined
  std::string known;          // (x | g; known): name of the precision of its levels; empty: they are independent
  std::int64_t column = 0;    // of the parenthesis
  bool uncorrelated = false;  // one of the parts of (x || g)

  std::string group_label() const;  // "Block:Variety"
};

struct Formula {
  std::string text;
  Node response;
  std::string response_label;
  TermList fixed;
  std::vector<RandomPart> random;  // nested groups and double bars written out
};

// Throws ModelError with the place in the formula.
Formula parse_formula(std::string_view text);

// Of the names in an expression, each once, in order of appearance.
std::vector<const Node*> names_in(const Node& node);

}  // namespace sm::mixed
