// Terms as sets of variables, and what the operators of a formula do to them.
#pragma once

#include <string_view>
#include <vector>

#include "mixed/formula.hpp"

namespace sm::mixed {

// Sums up an expression of terms; bars, which it may not meet inside a product, go to `bars` with their nodes.
class TermAlgebra {
 public:
  // `bars` null: there may be none.
  TermAlgebra(std::string_view formula, std::vector<const Node*>* bars) : formula_(formula), bars_(bars) {}

  TermList run(const Node& node);

 private:
  using Term = std::vector<int>;
  using Terms = std::vector<Term>;

  void add(const Node& node);
  void leave_out(const Node& node);
  void intercept(const Node& node, bool added);
  Terms product(const Node& node);
  Terms power(const Node& node);
  Terms within(const Node& node);
  Terms crossed(const Terms& left, const Terms& right, const Node& node) const;
  int variable(const Node& node);
  void put(Terms& terms, Term term, const Node& node) const;
  [[noreturn]] void fail(const Node& node, FormulaFault fault) const;

  std::string_view formula_;
  std::vector<const Node*>* bars_;
  bool intercept_ = true;
  std::vector<Variable> variables_;
  Terms terms_;
};

}  // namespace sm::mixed
