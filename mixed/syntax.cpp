#include "mixed/syntax.hpp"

#include <fmt/core.h>

#include <algorithm>

#include "mixed/error.hpp"
#include "mixed/lexer.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

constexpr int kDeepest = 100;
constexpr std::size_t kMostShown = 160;

struct Operator {
  std::string_view symbol;
  NodeKind kind;
  int strength;
};
// As strong as in R: a power binds closest, then the sign, then an interaction.
constexpr int kSignStrength = 5;
constexpr Operator kOperators[] = {
    {"+", NodeKind::plus, 2},   {"-", NodeKind::minus, 2},    {"*", NodeKind::times, 3},
    {"/", NodeKind::divide, 3}, {":", NodeKind::interact, 4}, {"^", NodeKind::power, 6},
};

class Parser {
 public:
  explicit Parser(std::string_view formula) : formula_(formula), tokens_(split_formula(formula)) {}

  FormulaSyntax run() {
    if (tokens_[0].kind == TokenKind::end)
      fail("the formula is empty", "response ~ terms", "write one: 'y ~ x + (1 | g)'");
    if (now().is("~"))
      fail("there is no response before the tilde", "response ~ terms", "write what is to be modelled");
    FormulaSyntax syntax;
    syntax.response = sum();
    if (now().kind == TokenKind::end) fail("there is no tilde", "response ~ terms", "write 'y ~ x + (1 | g)'");
    if (!now().is("~")) unexpected("a tilde behind the response");
    ++at_;
    if (now().kind == TokenKind::end) fail("there is no term behind the tilde", "terms", "write 1 for the mean alone");
    syntax.terms = sum();
    if (now().is("~")) fail("found a second tilde", "one", "write response ~ terms");
    if (now().is("|") || now().is("||")) {
      fail(fmt::format("found {} outside parentheses", describe_token(now())), "(terms | group)",
           "put every random term in parentheses");
    }
    if (now().is(")")) fail("found a parenthesis that was never opened", "", "take it away, or open it before");
    if (now().kind != TokenKind::end) unexpected("an operator, or the end of the formula");
    return syntax;
  }

 private:
  const Token& now() const { return tokens_[at_]; }

  Node sum() { return binary(0); }

  // Operators of at least that strength, by climbing: equal ones group to the left, powers to the right.
  Node binary(int strength) {
    const Deeper deeper(*this);
    Node left = signed_operand(strength);
    for (;;) {
      const Operator* found = operator_here();
      if (!found || found->strength < strength) return left;
      const std::int64_t column = now().column;
      ++at_;
      Node right = binary(found->kind == NodeKind::power ? found->strength : found->strength + 1);
      left = join(found->kind, column, std::move(left), std::move(right));
    }
  }

  Node signed_operand(int strength) {
    if (now().is("+") && strength <= kSignStrength) {  // says nothing
      ++at_;
      return binary(kSignStrength);
    }
    if (!now().is("-")) return operand();
    Node node{.kind = NodeKind::negate, .column = now().column};
    ++at_;
    node.args.push_back(binary(kSignStrength));
    return node;
  }

  Node operand() {
    const Token& token = now();
    if (token.kind == TokenKind::number) {
      ++at_;
      return {.kind = NodeKind::number, .number = token.number, .text = token.text, .column = token.column};
    }
    if (token.kind == TokenKind::name) {
      ++at_;
      if (now().is("(") && !token.quoted) return call(token);
      return {.kind = NodeKind::name, .text = token.text, .column = token.column};
    }
    if (!token.is("(")) unexpected("a term");
    return in_parentheses();
  }

  Node call(const Token& function) {
    const Deeper deeper(*this);
    const Token open = now();
    ++at_;
    Node node{.kind = NodeKind::call, .text = function.text, .column = function.column};
    while (!now().is(")")) {
      node.args.push_back(sum());
      if (now().is(")")) break;
      if (!now().is(",")) unclosed(open, "a comma or a closing parenthesis");
      ++at_;
    }
    ++at_;
    return node;
  }

  Node in_parentheses() {
    const Deeper deeper(*this);
    const Token open = now();
    ++at_;
    Node node = sum();
    if (now().is("|") || now().is("||")) {
      const NodeKind kind = now().is("|") ? NodeKind::bar : NodeKind::double_bar;
      const std::int64_t column = open.column;
      ++at_;
      Node group = sum();
      node = join(kind, column, std::move(node), std::move(group));
      if (now().is(";")) {
        ++at_;
        if (now().kind != TokenKind::name) unexpected("the name of a known precision, such as pedigree");
        node.text = now().text;
        ++at_;
      }
    }
    if (!now().is(")")) unclosed(open, "a closing parenthesis");
    ++at_;
    node.parentheses = true;
    return node;
  }

  const Operator* operator_here() const {
    if (now().kind != TokenKind::symbol) return nullptr;
    for (const Operator& op : kOperators) {
      if (now().text == op.symbol) return &op;
    }
    return nullptr;
  }

  static Node join(NodeKind kind, std::int64_t column, Node left, Node right) {
    Node node{.kind = kind, .column = column};
    node.args.push_back(std::move(left));
    node.args.push_back(std::move(right));
    return node;
  }

  // Parentheses within parentheses, as deep as a person would write them.
  struct Deeper {
    explicit Deeper(Parser& owner) : parser(owner) {
      if (++parser.depth_ > kDeepest) parser.fail("found parentheses nested too deep", "", "write it flatter");
    }
    ~Deeper() { --parser.depth_; }
    Deeper(const Deeper&) = delete;
    Deeper& operator=(const Deeper&) = delete;
    Parser& parser;
  };

  [[noreturn]] void unclosed(const Token& open, const std::string& expected) const {
    if (now().kind != TokenKind::end) unexpected(expected);
    refuse_formula(formula_, {.column = open.column,
                              .what = "found a parenthesis that is never closed",
                              .expected = expected,
                              .advice = "close it"});
  }
  [[noreturn]] void unexpected(const std::string& expected) const {
    fail("found " + describe_token(now()), expected, "");
  }
  [[noreturn]] void fail(const std::string& what, const std::string& expected, const std::string& advice) const {
    refuse_formula(formula_, {.column = now().column, .what = what, .expected = expected, .advice = advice});
  }

  std::string_view formula_;
  std::vector<Token> tokens_;
  std::size_t at_ = 0;
  int depth_ = 0;
};

std::string print_operator(NodeKind kind) {
  switch (kind) {
    case NodeKind::plus:
      return " + ";
    case NodeKind::minus:
      return " - ";
    case NodeKind::times:
      return " * ";
    case NodeKind::divide:
      return "/";
    case NodeKind::interact:
      return ":";
    case NodeKind::power:
      return "^";
    case NodeKind::bar:
      return " | ";
    case NodeKind::double_bar:
      return " || ";
    default:
      return "";
  }
}

std::string print_bare(const Node& node) {
  switch (node.kind) {
    case NodeKind::number:
      return print_number(node.number);
    case NodeKind::name:
      return print_name(node.text);
    case NodeKind::negate:
      return fmt::format("-{}", print_node(node.args[0]));
    case NodeKind::call: {
      std::string text = node.text + "(";
      for (std::size_t i = 0; i < node.args.size(); ++i) text += (i ? ", " : "") + print_node(node.args[i]);
      return text + ")";
    }
    default:
      break;
  }
  std::string text = print_node(node.args[0]) + print_operator(node.kind) + print_node(node.args[1]);
  const bool random = node.kind == NodeKind::bar || node.kind == NodeKind::double_bar;
  if (random && !node.text.empty()) text += "; " + print_name(node.text);
  return text;
}

}  // namespace

void refuse_formula(std::string_view formula, const FormulaFault& fault) {
  Fault told{.column = fault.column,
             .variable = fault.variable,
             .what = fault.what,
             .expected = fault.expected,
             .advice = fault.advice};
  told.file = "formula";
  if (!formula.empty()) {
    const bool one_line =
        std::none_of(formula.begin(), formula.end(), [](char c) { return (c >= 0 && c < 0x20) || c == 0x7f; });
    if (one_line && formula.size() <= kMostShown) {
      const auto before = static_cast<std::size_t>(std::max<std::int64_t>(0, fault.column - 1));
      told.excerpt = fmt::format("  {}\n  {}^", formula, std::string(before, ' '));
    }
  }
  throw ModelError(told);
}

FormulaSyntax parse_syntax(std::string_view formula) { return Parser(formula).run(); }

std::string print_name(std::string_view name) {
  const bool ordinary = !name.empty() && is_name_start(name[0]) && std::all_of(name.begin(), name.end(), is_name_part);
  return ordinary ? std::string(name) : fmt::format("`{}`", name);
}

std::string print_node(const Node& node) {
  return node.parentheses ? fmt::format("({})", print_bare(node)) : print_bare(node);
}

}  // namespace sm::mixed
