#include "mixed/term_algebra.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cmath>

#include "mixed/expression.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

constexpr std::size_t kMostTerms = 5000;
constexpr double kHighestPower = 20;

}  // namespace

TermList TermAlgebra::run(const Node& node) {
  add(node);
  // Terms of equal order keep the order in which they were written.
  std::stable_sort(terms_.begin(), terms_.end(), [](const Term& a, const Term& b) { return a.size() < b.size(); });
  return {.intercept = intercept_, .variables = std::move(variables_), .terms = std::move(terms_)};
}

void TermAlgebra::add(const Node& node) {
  switch (node.kind) {
    case NodeKind::plus:
      add(node.args[0]);
      add(node.args[1]);
      return;
    case NodeKind::minus:
      add(node.args[0]);
      leave_out(node.args[1]);
      return;
    case NodeKind::negate:
      leave_out(node.args[0]);
      return;
    case NodeKind::number:
      intercept(node, true);
      return;
    case NodeKind::bar:
    case NodeKind::double_bar:
      if (!bars_) fail(node, {.what = "found a random term inside another one", .advice = "write them side by side"});
      bars_->push_back(&node);
      return;
    default:
      break;
  }
  for (Term& term : product(node)) put(terms_, std::move(term), node);
}

void TermAlgebra::intercept(const Node& node, bool added) {
  if (node.number != 0.0 && node.number != 1.0) {
    fail(node, {.what = fmt::format("found the number {}", print_number(node.number)),
                .expected = "1 or 0, for a model with or without an intercept",
                .advice = "arithmetic belongs inside I()"});
  }
  intercept_ = (node.number == 1.0) == added;
}

void TermAlgebra::leave_out(const Node& node) {
  if (node.kind == NodeKind::number) return intercept(node, false);
  if (node.kind == NodeKind::bar || node.kind == NodeKind::double_bar) {
    fail(node, {.what = "found a random term behind a minus", .advice = "leave it out of the formula"});
  }
  for (const Term& term : product(node)) {
    const auto found = std::find(terms_.begin(), terms_.end(), term);
    if (found == terms_.end()) {
      fail(node,
           {.variable = print_node(node), .what = "there is no such term to leave out", .advice = "check its name"});
    }
    terms_.erase(found);
  }
}

TermAlgebra::Terms TermAlgebra::product(const Node& node) {
  switch (node.kind) {
    case NodeKind::name:
    case NodeKind::call:
      return {{variable(node)}};
    case NodeKind::plus: {
      Terms terms = product(node.args[0]);
      for (Term& term : product(node.args[1])) put(terms, std::move(term), node);
      return terms;
    }
    case NodeKind::minus: {
      Terms terms = product(node.args[0]);
      for (const Term& term : product(node.args[1])) std::erase(terms, term);
      return terms;
    }
    case NodeKind::interact: {
      const Terms left = product(node.args[0]);  // in this order: it numbers the variables
      return crossed(left, product(node.args[1]), node);
    }
    case NodeKind::times: {
      Terms terms = product(node.args[0]);
      const Terms left = terms;
      const Terms right = product(node.args[1]);
      for (const Term& term : right) put(terms, term, node);
      for (Term& term : crossed(left, right, node)) put(terms, std::move(term), node);
      return terms;
    }
    case NodeKind::divide:
      return within(node);
    case NodeKind::power:
      return power(node);
    case NodeKind::bar:
    case NodeKind::double_bar:
      fail(node, {.what = "found a random term inside a product",
                  .expected = "it to be added",
                  .advice = "write '+ (x | g)'"});
    default:
      fail(node, {.what = fmt::format("found {} inside a product of terms", quote(print_node(node))),
                  .expected = "terms",
                  .advice = "put 0 and 1 outside, and arithmetic inside I()"});
  }
}

// a / b: a, and b within the levels of all that a has.
TermAlgebra::Terms TermAlgebra::within(const Node& node) {
  Terms terms = product(node.args[0]);
  Term all;
  for (const Term& term : terms) {
    for (const int v : term) {
      if (std::find(all.begin(), all.end(), v) == all.end()) all.push_back(v);
    }
  }
  std::sort(all.begin(), all.end());
  for (Term& term : crossed({all}, product(node.args[1]), node)) put(terms, std::move(term), node);
  return terms;
}

TermAlgebra::Terms TermAlgebra::power(const Node& node) {
  const Node& exponent = node.args[1];
  const double times = exponent.number;
  if (exponent.kind != NodeKind::number || times != std::trunc(times) || times < 1 || times > kHighestPower) {
    fail(exponent, {.what = fmt::format("found the power {}", quote(print_node(exponent))),
                    .expected = fmt::format("a whole number from 1 to {}", kHighestPower),
                    .advice = "write the power of a number as I(x^2)"});
  }
  const Terms once = product(node.args[0]);
  Terms terms = once;
  for (int i = 1; i < static_cast<int>(times); ++i) {
    Terms next = terms;
    for (Term& term : crossed(terms, once, node)) put(next, std::move(term), node);
    if (next.size() == terms.size()) break;
    terms = std::move(next);
  }
  return terms;
}

TermAlgebra::Terms TermAlgebra::crossed(const Terms& left, const Terms& right, const Node& node) const {
  Terms terms;
  for (const Term& a : left) {
    for (const Term& b : right) {
      Term both;
      std::set_union(a.begin(), a.end(), b.begin(), b.end(), std::back_inserter(both));
      put(terms, std::move(both), node);
    }
  }
  return terms;
}

int TermAlgebra::variable(const Node& node) {
  check_expression(formula_, node);
  const std::string label = print_node(node);
  for (std::size_t v = 0; v < variables_.size(); ++v) {
    if (variables_[v].label == label) return static_cast<int>(v);
  }
  variables_.push_back({.label = label, .expression = node});
  variables_.back().expression.parentheses = false;
  return static_cast<int>(variables_.size()) - 1;
}

void TermAlgebra::put(Terms& terms, Term term, const Node& node) const {
  if (std::find(terms.begin(), terms.end(), term) != terms.end()) return;
  if (terms.size() == kMostTerms) {
    fail(node,
         {.what = fmt::format("found more than {} terms", kMostTerms), .advice = "write the interactions you need"});
  }
  terms.push_back(std::move(term));
}

void TermAlgebra::fail(const Node& node, FormulaFault fault) const {
  fault.column = node.column;
  refuse_formula(formula_, fault);
}

}  // namespace sm::mixed
