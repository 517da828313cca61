#include "mixed/formula.hpp"

#include <fmt/core.h>

#include <algorithm>

#include "mixed/expression.hpp"
#include "mixed/term_algebra.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

// The groups of (x | a/b): a, and a:b. Each is the list of columns that are combined.
class Groups {
 public:
  explicit Groups(std::string_view formula) : formula_(formula) {}

  std::vector<std::vector<Node>> of(const Node& node) const {
    if (node.kind != NodeKind::divide) return {combination(node)};
    std::vector<std::vector<Node>> groups = of(node.args[0]);
    std::vector<Node> inner = groups.back();
    for (const Node& name : combination(node.args[1])) put(inner, name);
    groups.push_back(std::move(inner));
    return groups;
  }

 private:
  std::vector<Node> combination(const Node& node) const {
    if (node.kind == NodeKind::name) {
      check_expression(formula_, node);
      return {node};
    }
    if (node.kind == NodeKind::interact) {
      std::vector<Node> names = combination(node.args[0]);
      for (const Node& name : combination(node.args[1])) put(names, name);
      return names;
    }
    const bool sum = node.kind == NodeKind::plus || node.kind == NodeKind::times;
    refuse_formula(formula_, {.column = node.column,
                              .what = fmt::format("found the group {}", quote(print_node(node))),
                              .expected = "a column, a:b or a/b",
                              .advice = sum ? "write a random term for each group: (1 | a) + (1 | b)"
                                            : "make the column in the data"});
  }

  static void put(std::vector<Node>& names, const Node& name) {
    const auto same = [&](const Node& other) { return other.text == name.text; };
    if (std::none_of(names.begin(), names.end(), same)) names.push_back(name);
  }

  std::string_view formula_;
};

// (x || g): a part for each term, without an intercept of its own; a factor's columns stay together.
std::vector<TermList> split_terms(const TermList& list) {
  std::vector<TermList> parts;
  if (list.intercept) parts.push_back({.intercept = true, .variables = {}, .terms = {}});
  for (const std::vector<int>& term : list.terms) {
    TermList part{.intercept = false, .variables = {}, .terms = {{}}};
    for (const int v : term) {
      part.terms[0].push_back(static_cast<int>(part.variables.size()));
      part.variables.push_back(list.variables[static_cast<std::size_t>(v)]);
    }
    parts.push_back(std::move(part));
  }
  return parts;
}

void add_random(Formula& formula, const Node& bar) {
  TermList terms = TermAlgebra(formula.text, nullptr).run(bar.args[0]);
  if (!terms.intercept && terms.terms.empty()) {
    refuse_formula(formula.text, {.column = bar.column,
                                  .what = "found a random term without a coefficient",
                                  .expected = "1 or variables before the bar",
                                  .advice = "write (1 | g)"});
  }
  const bool split = bar.kind == NodeKind::double_bar;
  const std::vector<TermList> parts = split ? split_terms(terms) : std::vector<TermList>{std::move(terms)};
  for (std::vector<Node>& group : Groups(formula.text).of(bar.args[1])) {
    for (const TermList& part : parts) {
      formula.random.push_back(
          {.terms = part, .group = group, .known = bar.text, .column = bar.column, .uncorrelated = split});
    }
  }
}

void refuse_twins(const Formula& formula) {
  for (auto part = formula.random.begin(); part != formula.random.end(); ++part) {
    const auto twin = std::find_if(formula.random.begin(), part, [&](const RandomPart& other) {
      if (other.group_label() != part->group_label() || other.known != part->known) return false;
      if (other.terms.intercept && part->terms.intercept) return true;
      for (std::size_t t = 0; t < part->terms.terms.size(); ++t) {
        for (std::size_t u = 0; u < other.terms.terms.size(); ++u) {
          if (part->terms.label(t) == other.terms.label(u)) return true;
        }
      }
      return false;
    });
    if (twin == part) continue;
    refuse_formula(formula.text, {.column = part->column,
                                  .variable = part->group_label(),
                                  .what = "found a random term that another one holds already",
                                  .expected = "each coefficient of a group once",
                                  .advice = "leave it out; a slope alone is (0 + x | g)"});
  }
}

void collect_names(const Node& node, std::vector<const Node*>& names) {
  if (node.kind == NodeKind::name) {
    const auto same = [&](const Node* other) { return other->text == node.text; };
    if (std::none_of(names.begin(), names.end(), same)) names.push_back(&node);
  }
  for (const Node& arg : node.args) collect_names(arg, names);
}

void refuse_response_as_term(const Formula& formula) {
  for (const Variable& variable : formula.fixed.variables) {
    if (variable.label != formula.response_label) continue;
    refuse_formula(formula.text, {.column = variable.expression.column,
                                  .variable = variable.label,
                                  .what = "the response is also a term",
                                  .expected = "it on the left of the tilde alone",
                                  .advice = "leave it out on the right"});
  }
}

}  // namespace

std::string TermList::label(std::size_t term) const {
  std::string text;
  for (const int v : terms[term]) text += (text.empty() ? "" : ":") + variables[static_cast<std::size_t>(v)].label;
  return text;
}

std::string RandomPart::group_label() const {
  std::string text;
  for (const Node& name : group) text += (text.empty() ? "" : ":") + name.text;
  return text;
}

std::vector<const Node*> names_in(const Node& node) {
  std::vector<const Node*> names;
  collect_names(node, names);
  return names;
}

Formula parse_formula(std::string_view text) {
  Formula formula;
  formula.text = text;
  FormulaSyntax syntax = parse_syntax(text);
  check_arithmetic(text, syntax.response);
  formula.response = std::move(syntax.response);
  formula.response_label = print_node(formula.response);
  if (names_in(formula.response).empty()) {
    refuse_formula(text, {.column = formula.response.column,
                          .what = fmt::format("found the response {}", quote(formula.response_label)),
                          .expected = "the name of a column",
                          .advice = "write what is to be modelled"});
  }
  std::vector<const Node*> bars;
  formula.fixed = TermAlgebra(text, &bars).run(syntax.terms);
  for (const Node* bar : bars) add_random(formula, *bar);
  refuse_twins(formula);
  refuse_response_as_term(formula);
  return formula;
}

}  // namespace sm::mixed
