// Arithmetic of a formula, over the rows of a table.
#pragma once

#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "mixed/syntax.hpp"

namespace sm::mixed {

// Whether a variable of a formula can be computed: names, numbers, arithmetic inside I(), and the functions log, log2,
// log10, log1p, exp, sqrt, abs. Throws ModelError for anything else, with what to do instead.
void check_expression(std::string_view formula, const Node& node);

// The same for arithmetic as such, which a response may be without I().
void check_arithmetic(std::string_view formula, const Node& node);

// The values of an expression for `rows` rows; `column` answers those of a named column.
std::vector<double> evaluate(const Node& node, std::size_t rows,
                             const std::function<std::vector<double>(const Node& name)>& column);

// Where an expression without a finite value in one row goes wrong.
struct NoValue {
  const Node* part = nullptr;  // the smallest part that has none
  std::string why;             // "log(-5.7) is the logarithm of a number that is not positive"
};
NoValue find_no_value(const Node& node, const std::function<double(const Node& name)>& cell);

}  // namespace sm::mixed
