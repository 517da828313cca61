// Text in columns on a terminal: what a name occupies there, and tables of numbers. Names come from a user's data, in
// UTF-8 or not.
#pragma once

#include <cstddef>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace sm::mixed {

// The first character of `rest`, which is not empty, taken off it. Returns 0xFFFD for bytes that are not UTF-8.
char32_t next_character(std::string_view& rest);

// Control characters and bytes that are not UTF-8 made visible: "\n", "\x07".
std::string printable(std::string_view text);

// Columns of a terminal that UTF-8 text takes: none for a combining mark, two for a wide East Asian character.
std::size_t cells(std::string_view text);

std::string pad_left(std::string_view text, std::size_t width);   // text at the right
std::string pad_right(std::string_view text, std::size_t width);  // text at the left
std::string cut(std::string_view text, std::size_t width);        // at most so wide, with an ellipsis when shortened

// Lines of at most `width`, broken at spaces where there are some; those after the first begin with `indent` spaces.
// Ends in a newline.
std::string wrapped(std::string_view text, std::size_t width, std::size_t indent);

// Every number with as many decimals as it takes to show `digits` significant digits of the smallest of them, or of the
// smallest of their scales, such as standard errors, where those are given. Where that is more than a column bears,
// each by itself in the shorter of fixed and scientific notation. What is not finite is a dash.
std::vector<std::string> number_column(std::span<const double> values, int digits, std::span<const double> scales = {});

// With so many decimals; "0.000" without a sign. Shorter in scientific notation from `largest` on.
std::string decimals_text(double value, int decimals, double largest);

constexpr const char* kNoNumber = "—";

// A table whose first columns are names, flush left, and whose others are flush right. A name too long for its column
// stands on a line of its own.
struct TextTable {
  std::vector<std::string> head;
  std::vector<std::vector<std::string>> rows;  // as long as the head
  std::size_t names = 1;
  std::size_t indent = 0;
  std::size_t widest_name = 36;

  // Adds a column of numbers, one for each row.
  void add_column(std::string title, const std::vector<std::string>& texts);
  std::string text() const;
};

}  // namespace sm::mixed
