#include "mixed/text.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <limits>
#include <utility>

namespace sm::mixed {
namespace {

constexpr char32_t kNotUtf8 = 0xFFFD;

// Blocks of combining marks, of characters without width and of wide ones that names may hold (Unicode 15, coarse).
constexpr std::array<std::pair<char32_t, char32_t>, 6> kNoWidth{
    {{0x300, 0x36F}, {0x200B, 0x200F}, {0x20D0, 0x20FF}, {0xFE00, 0xFE0F}, {0xFE20, 0xFE2F}, {0x1AB0, 0x1AFF}}};
constexpr std::array<std::pair<char32_t, char32_t>, 8> kWide{{{0x1100, 0x115F},
                                                              {0x2E80, 0xA4CF},
                                                              {0xAC00, 0xD7A3},
                                                              {0xF900, 0xFAFF},
                                                              {0xFE30, 0xFE6F},
                                                              {0xFF00, 0xFF60},
                                                              {0x1F300, 0x1FAFF},
                                                              {0x20000, 0x3FFFD}}};

std::size_t cells_of(char32_t character) {
  const auto in = [character](const auto& range) { return character >= range.first && character <= range.second; };
  if (std::any_of(kNoWidth.begin(), kNoWidth.end(), in)) return 0;
  return std::any_of(kWide.begin(), kWide.end(), in) ? 2 : 1;
}

constexpr double kInfinite = std::numeric_limits<double>::infinity();

int exponent_of(double size) { return static_cast<int>(std::floor(std::log10(size))); }

// How many bytes the first character announces; 0 for a byte that begins none.
std::size_t announced(unsigned char first) {
  if (first < 0x80) return 1;
  if (first >= 0xC2 && first < 0xE0) return 2;
  if (first >= 0xE0 && first < 0xF0) return 3;
  return first >= 0xF0 && first < 0xF5 ? 4 : 0;
}

}  // namespace

char32_t next_character(std::string_view& rest) {
  const auto first = static_cast<unsigned char>(rest.front());
  const std::size_t length = announced(first);
  if (length == 1) {
    rest.remove_prefix(1);
    return first;
  }
  constexpr std::array<unsigned char, 5> kFirstBits{0, 0, 0x1F, 0x0F, 0x07};
  constexpr std::array<char32_t, 5> kSmallest{0, 0, 0x80, 0x800, 0x10000};
  char32_t value = first & kFirstBits[length];
  bool valid = length > 0 && length <= rest.size();
  for (std::size_t i = 1; valid && i < length; ++i) {
    const auto byte = static_cast<unsigned char>(rest[i]);
    valid = (byte & 0xC0) == 0x80;
    value = (value << 6) | (byte & 0x3F);
  }
  valid = valid && value >= kSmallest[length] && value <= 0x10FFFF && (value < 0xD800 || value > 0xDFFF);
  rest.remove_prefix(valid ? length : 1);
  return valid ? value : kNotUtf8;
}

std::string printable(std::string_view text) {
  std::string out;
  while (!text.empty()) {
    const std::string_view before = text;
    const char32_t character = next_character(text);
    const std::string_view bytes = before.substr(0, before.size() - text.size());
    const bool broken = character == kNotUtf8 && bytes.size() == 1;
    if (character == '\n') {
      out += "\\n";
    } else if (character == '\t') {
      out += "\\t";
    } else if (broken || character < 0x20 || (character >= 0x7F && character < 0xA0)) {
      out += fmt::format("\\x{:02x}", broken ? static_cast<unsigned char>(bytes[0]) : static_cast<unsigned>(character));
    } else {
      out += bytes;
    }
  }
  return out;
}

std::size_t cells(std::string_view text) {
  std::size_t width = 0;
  while (!text.empty()) width += cells_of(next_character(text));
  return width;
}

std::string pad_left(std::string_view text, std::size_t width) {
  const std::size_t taken = cells(text);
  return std::string(taken < width ? width - taken : 0, ' ').append(text);
}

std::string pad_right(std::string_view text, std::size_t width) {
  const std::size_t taken = cells(text);
  return std::string(text) + std::string(taken < width ? width - taken : 0, ' ');
}

std::string cut(std::string_view text, std::size_t width) {
  if (cells(text) <= width) return std::string(text);
  std::string_view rest = text;
  std::string_view kept = text.substr(0, 0);
  std::size_t taken = 0;
  while (!rest.empty()) {
    taken += cells_of(next_character(rest));
    if (taken + 1 > width) break;
    kept = text.substr(0, text.size() - rest.size());
  }
  return width == 0 ? std::string() : std::string(kept) + "…";
}

std::string wrapped(std::string_view text, std::size_t width, std::size_t indent) {
  std::string out;
  std::size_t taken = 0;
  bool line_is_empty = true;
  while (!text.empty()) {
    const std::size_t end = std::min(text.find(' '), text.size());
    const std::string_view word = text.substr(0, end);
    text.remove_prefix(std::min(end + 1, text.size()));
    const std::size_t wide = cells(word);
    if (!line_is_empty && taken + 1 + wide > width) {
      out += '\n' + std::string(indent, ' ');
      taken = indent;
      line_is_empty = true;
    }
    if (!line_is_empty) {
      out += ' ';
      ++taken;
    }
    out += word;
    taken += wide;
    line_is_empty = false;
  }
  return out + '\n';
}

std::vector<std::string> number_column(std::span<const double> values, int digits, std::span<const double> scales) {
  constexpr int kWidest = 13;
  int decimals = 0;
  int places = 1;  // before the point
  for (std::size_t i = 0; i < values.size(); ++i) {
    const double value = std::fabs(values[i]);
    if (!std::isfinite(value)) continue;
    const bool scaled = i < scales.size() && std::isfinite(scales[i]) && scales[i] != 0.0;
    const double size = scaled ? std::fabs(scales[i]) : value;
    if (size > 0.0) decimals = std::max(decimals, digits - 1 - exponent_of(size));
    if (value > 0.0) places = std::max(places, exponent_of(value) + 1);
  }
  const bool fixed = places + decimals <= kWidest;
  std::vector<std::string> out;
  for (const double value : values) {
    if (!std::isfinite(value)) {
      out.emplace_back(kNoNumber);
    } else if (value == 0.0) {
      out.emplace_back("0");
    } else {
      out.push_back(fixed ? decimals_text(value, decimals, kInfinite) : fmt::format("{:.{}g}", value, digits + 2));
    }
  }
  return out;
}

std::string decimals_text(double value, int decimals, double largest) {
  if (!std::isfinite(value)) return kNoNumber;
  if (std::fabs(value) >= largest) return fmt::format("{:.4g}", value);
  std::string text = fmt::format("{:.{}f}", value, decimals);
  if (text.starts_with('-') && text.find_first_of("123456789") == std::string::npos) text.erase(0, 1);
  return text;
}

void TextTable::add_column(std::string title, const std::vector<std::string>& texts) {
  head.push_back(std::move(title));
  for (std::size_t i = 0; i < rows.size(); ++i) rows[i].push_back(texts.at(i));
}

std::string TextTable::text() const {
  std::vector<std::size_t> widths(head.size(), 0);
  const auto measure = [&](const std::vector<std::string>& row) {
    for (std::size_t j = 0; j < row.size(); ++j) {
      const std::size_t wide = cells(row[j]);
      if (j < names && wide > widest_name) continue;  // gets a line of its own
      widths[j] = std::max(widths[j], wide);
    }
  };
  measure(head);
  for (const auto& row : rows) measure(row);
  const auto line = [&](const std::vector<std::string>& row) {
    std::string out(indent, ' ');
    for (std::size_t j = 0; j < row.size(); ++j) {
      if (j > 0) out += "  ";
      const bool too_long = j < names && cells(row[j]) > widths[j];
      out += j < names ? pad_right(row[j], widths[j]) : pad_left(row[j], widths[j]);
      if (too_long && j + 1 < row.size()) {
        std::size_t place = indent;
        for (std::size_t k = 0; k <= j; ++k) place += widths[k] + (k > 0 ? 2 : 0);
        out += '\n' + std::string(place, ' ');
      }
    }
    out.erase(out.find_last_not_of(' ') + 1);
    return out + '\n';
  };
  std::string out = line(head);
  for (const auto& row : rows) out += line(row);
  return out;
}

}  // namespace sm::mixed
