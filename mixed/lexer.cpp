#include "mixed/lexer.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <array>

#include "mixed/syntax.hpp"
#include "mixed/words.hpp"

namespace sm::mixed {
namespace {

// Far more than anybody writes; it bounds the depth of what is built from it.
constexpr std::size_t kMostTokens = 4000;
constexpr std::size_t kMostBytes = 100'000;

bool is_digit(char c) { return c >= '0' && c <= '9'; }
bool is_blank(char c) { return c == ' ' || c == '\t' || c == '\n' || c == '\r'; }

struct Refused {
  std::string_view symbol;
  std::string_view advice;
};
constexpr std::array<Refused, 8> kRefused = {{{"==", "make a column of TRUE and FALSE in the data"},
                                              {"!=", "make a column of TRUE and FALSE in the data"},
                                              {"<=", "make a column of TRUE and FALSE in the data"},
                                              {">=", "make a column of TRUE and FALSE in the data"},
                                              {"<", "make a column of TRUE and FALSE in the data"},
                                              {">", "make a column of TRUE and FALSE in the data"},
                                              {"=", "a formula has a tilde: response ~ terms"},
                                              {"$", "name the column alone"}}};

class Lexer {
 public:
  explicit Lexer(std::string_view formula) : formula_(formula) {}

  std::vector<Token> run() {
    if (formula_.size() > kMostBytes) {
      refuse_formula("", {.what = fmt::format("the formula has {} bytes", formula_.size()),
                          .expected = fmt::format("at most {}", kMostBytes),
                          .advice = "write it shorter"});
    }
    for (;;) {
      while (at_ < formula_.size() && is_blank(formula_[at_])) ++at_;
      Token token = next();
      token.column = 1 + characters(formula_.substr(0, begin_));
      tokens_.push_back(std::move(token));
      if (tokens_.back().kind == TokenKind::end) return std::move(tokens_);
      if (tokens_.size() > kMostTokens) {
        refuse_formula(
            "", {.what = fmt::format("the formula has more than {} words", kMostTokens), .advice = "write it shorter"});
      }
    }
  }

 private:
  Token next() {
    begin_ = at_;
    if (at_ == formula_.size()) return {};
    const char c = formula_[at_];
    if (is_digit(c) || (c == '.' && at_ + 1 < formula_.size() && is_digit(formula_[at_ + 1]))) return number();
    if (c == '`') return quoted_name();
    if (is_name_start(c)) {
      while (at_ < formula_.size() && is_name_part(formula_[at_])) ++at_;
      return {.kind = TokenKind::name, .text = std::string(formula_.substr(begin_, at_ - begin_))};
    }
    return symbol();
  }

  Token number() {
    const auto exponent = [&] { return at_ > begin_ && (formula_[at_ - 1] == 'e' || formula_[at_ - 1] == 'E'); };
    while (at_ < formula_.size() &&
           (is_name_part(formula_[at_]) || ((formula_[at_] == '+' || formula_[at_] == '-') && exponent()))) {
      ++at_;
    }
    const std::string_view text = formula_.substr(begin_, at_ - begin_);
    double value = 0.0;
    if (!parse_number(text, value)) {
      fail(fmt::format("found {}", quote(text)), "a number or a name",
           "names do not begin with a digit; "
           "put one that does in backquotes");
    }
    return {.kind = TokenKind::number, .text = std::string(text), .number = value};
  }

  Token quoted_name() {
    const std::size_t end = formula_.find('`', begin_ + 1);
    if (end == std::string_view::npos)
      fail("found a backquote that is never closed", "a name in backquotes", "close it");
    if (end == begin_ + 1) fail("found two backquotes with no name between them", "a name in backquotes", "");
    at_ = end + 1;
    return {
        .kind = TokenKind::name, .text = std::string(formula_.substr(begin_ + 1, end - begin_ - 1)), .quoted = true};
  }

  Token symbol() {
    const std::string_view rest = formula_.substr(at_);
    for (const Refused& refused : kRefused) {
      if (rest.starts_with(refused.symbol)) {
        fail(fmt::format("found {}", quote(refused.symbol)), "one of + - * / : ^ | ~", std::string(refused.advice));
      }
    }
    if (rest[0] == '%') {
      const std::size_t end = rest.find('%', 1);
      fail(fmt::format("found {}", quote(rest.substr(0, end == std::string_view::npos ? 1 : end + 1))),
           "one of + - * / : ^ | ~", "write a term within another one as a:b");
    }
    if (rest[0] == '"' || rest[0] == '\'') fail("found a quote", "the name of a column", "put odd names in backquotes");
    const std::size_t length = rest.starts_with("||") ? 2 : 1;
    if (std::string_view("~+-*/:^|();,").find(rest[0]) == std::string_view::npos) {
      std::size_t bytes = 1;
      while (bytes < rest.size() && (static_cast<unsigned char>(rest[bytes]) & 0xc0u) == 0x80u) ++bytes;
      fail(fmt::format("found {}", quote(rest.substr(0, bytes))), "a name, a number or an operator",
           "put names with odd characters in backquotes");
    }
    at_ += length;
    return {.kind = TokenKind::symbol, .text = std::string(rest.substr(0, length))};
  }

  [[noreturn]] void fail(const std::string& what, const std::string& expected, const std::string& advice) const {
    refuse_formula(
        formula_,
        {.column = 1 + characters(formula_.substr(0, begin_)), .what = what, .expected = expected, .advice = advice});
  }

  std::string_view formula_;
  std::size_t at_ = 0;
  std::size_t begin_ = 0;
  std::vector<Token> tokens_;
};

}  // namespace

bool is_name_start(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '.' || c == '_' ||
         static_cast<unsigned char>(c) >= 0x80;
}

bool is_name_part(char c) { return is_name_start(c) || is_digit(c); }

std::vector<Token> split_formula(std::string_view formula) { return Lexer(formula).run(); }

std::string describe_token(const Token& token) {
  if (token.kind == TokenKind::end) return "the end of the formula";
  return quote(token.quoted ? "`" + token.text + "`" : token.text);
}

}  // namespace sm::mixed
