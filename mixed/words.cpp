#include "mixed/words.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdlib>

namespace sm::mixed {
namespace {

constexpr std::size_t kQuotedBytes = 40;
constexpr std::size_t kPlainDigits = 15;

bool is_digit(char c) { return c >= '0' && c <= '9'; }

// The number of single-character edits, case counting half, that make one of the two into the other.
double distance(std::string_view a, std::string_view b) {
  std::vector<double> row(b.size() + 1);
  for (std::size_t j = 0; j <= b.size(); ++j) row[j] = static_cast<double>(j);
  for (std::size_t i = 0; i < a.size(); ++i) {
    double diagonal = row[0];
    row[0] += 1.0;
    for (std::size_t j = 0; j < b.size(); ++j) {
      const bool same_letter =
          std::tolower(static_cast<unsigned char>(a[i])) == std::tolower(static_cast<unsigned char>(b[j]));
      const double change = a[i] == b[j] ? 0.0 : same_letter ? 0.5 : 1.0;
      const double best = std::min({diagonal + change, row[j] + 1.0, row[j + 1] + 1.0});
      diagonal = row[j + 1];
      row[j + 1] = best;
    }
  }
  return row[b.size()];
}

}  // namespace

bool parse_number(std::string_view text, double& value) {
  const char* p = text.data();
  const char* const end = p + text.size();
  const char* digits = p != end && (*p == '+' || *p == '-') ? p + 1 : p;
  if (digits == end || !(is_digit(*digits) || (*digits == '.' && digits + 1 != end && is_digit(digits[1]))))
    return false;
  if (*p == '+') ++p;
  const auto [stop, error] = std::from_chars(p, end, value);
  if (stop != end) return false;
  if (error == std::errc()) return true;
  if (error != std::errc::result_out_of_range) return false;
  value = std::strtod(std::string(p, end).c_str(), nullptr);  // too small is 0 or subnormal, and fine
  return std::isfinite(value);
}

bool is_plain_integer(std::string_view text) {
  if (!text.empty() && text[0] == '-') {
    text.remove_prefix(1);
    if (text == "0") return false;
  }
  if (text.empty() || text.size() > kPlainDigits || (text[0] == '0' && text.size() > 1)) return false;
  return std::all_of(text.begin(), text.end(), is_digit);
}

std::string print_number(double value) {
  // Integers in full: 1e+05 is no label.
  if (std::fabs(value) < 1e15 && value == std::trunc(value)) {
    return std::to_string(static_cast<std::int64_t>(value));
  }
  return fmt::format("{}", value);
}

std::string quote(std::string_view text) {
  const bool cut = text.size() > kQuotedBytes;
  if (cut) text = text.substr(0, kQuotedBytes);
  // Not in the middle of a character.
  while (cut && !text.empty() && (static_cast<unsigned char>(text.back()) & 0xc0u) == 0x80u) text.remove_suffix(1);
  if (cut && !text.empty() && static_cast<unsigned char>(text.back()) >= 0xc0u) text.remove_suffix(1);
  std::string quoted = "\"";
  for (const char c : text) {
    const auto byte = static_cast<unsigned char>(c);
    if (byte < 0x20 || byte == 0x7f) {
      quoted += fmt::format("\\x{:02x}", byte);
    } else {
      quoted += c;
    }
  }
  return quoted + (cut ? "...\"" : "\"");
}

std::string count_of(std::int64_t count, std::string_view noun) {
  return fmt::format("{} {}{}", count, noun, count == 1 ? "" : "s");
}

std::int64_t characters(std::string_view text) {
  return std::count_if(text.begin(), text.end(),
                       [](char c) { return (static_cast<unsigned char>(c) & 0xc0u) != 0x80u; });
}

std::string nearest_name(std::string_view name, const std::vector<std::string>& names) {
  std::string nearest;
  double best = 1.0 + 0.34 * static_cast<double>(name.size());
  for (const std::string& candidate : names) {
    if (candidate.size() > 2 * name.size() + 4) continue;
    const double d = distance(name, candidate);
    if (d >= static_cast<double>(std::max(name.size(), candidate.size()))) continue;  // not a letter in common
    // Of two that are as near, the one that begins alike: slips at the first letter are rare.
    const bool alike = !candidate.empty() && !name.empty() && candidate[0] == name[0];
    if (d < best || (d == best && alike && !nearest.empty() && nearest[0] != name[0])) {
      best = d;
      nearest = candidate;
    }
  }
  return nearest;
}

std::string listed(const std::vector<std::string>& names, std::size_t limit) {
  std::string text;
  for (std::size_t i = 0; i < std::min(names.size(), limit); ++i) text += (i ? ", " : "") + names[i];
  if (names.size() > limit) text += fmt::format(" and {} more", names.size() - limit);
  return text;
}

}  // namespace sm::mixed
