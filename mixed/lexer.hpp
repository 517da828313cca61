// The words of a formula.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace sm::mixed {

enum class TokenKind { number, name, symbol, end };

struct Token {
  TokenKind kind = TokenKind::end;
  std::string text{};   // of a name: without its backquotes
  bool quoted = false;  // it had some
  double number = 0.0;
  std::int64_t column = 0;  // in characters of the formula, from 1

  bool is(std::string_view symbol) const { return kind == TokenKind::symbol && text == symbol; }
};

// The last one is of kind end. Throws ModelError for characters that no formula has, and formulas beyond all measure.
std::vector<Token> split_formula(std::string_view formula);

// What a token is called in a message.
std::string describe_token(const Token& token);

bool is_name_start(char c);
bool is_name_part(char c);

}  // namespace sm::mixed
