#include "cli/fields.hpp"

#include <charconv>
#include <cmath>
#include <cstdlib>
#include <string>

namespace sm::cli {
namespace {

const char* skip_plus(const char* p, const char* end) {
  return p != end && *p == '+' && p + 1 != end && p[1] != '-' ? p + 1 : p;
}

// from_chars answers out_of_range for values too small as well as too large; the former are 0 or subnormal, and fine.
bool nearest_double(const char* p, const char* end, double& value) {
  const std::string text(p, end);
  value = std::strtod(text.c_str(), nullptr);
  return std::isfinite(value);
}

template <class Value, class Scan>
bool parse_whole(std::string_view field, Value& value, Scan scan) {
  const char* end = field.data() + field.size();
  return scan(field.data(), end, value) == end && !field.empty();
}

}  // namespace

const char* scan_index(const char* p, const char* end, std::int64_t& value) {
  if (p == end || *p < '0' || *p > '9') return nullptr;
  const auto [stop, error] = std::from_chars(p, end, value);
  return error == std::errc() ? stop : nullptr;
}

const char* scan_integer(const char* p, const char* end, std::int64_t& value) {
  const auto [stop, error] = std::from_chars(skip_plus(p, end), end, value);
  return error == std::errc() ? stop : nullptr;
}

const char* scan_real(const char* p, const char* end, double& value) {
  p = skip_plus(p, end);
  const auto [stop, error] = std::from_chars(p, end, value);
  if (error == std::errc()) return std::isfinite(value) ? stop : nullptr;
  return error == std::errc::result_out_of_range && nearest_double(p, stop, value) ? stop : nullptr;
}

bool parse_index(std::string_view field, std::int64_t& value) { return parse_whole(field, value, scan_index); }
bool parse_integer(std::string_view field, std::int64_t& value) { return parse_whole(field, value, scan_integer); }
bool parse_real(std::string_view field, double& value) { return parse_whole(field, value, scan_real); }

std::vector<std::string_view> split_fields(std::string_view line) {
  std::vector<std::string_view> fields;
  const char* const end = line.data() + line.size();
  const char* p = skip_blanks(line.data(), end);
  while (p != end) {
    const char* stop = p;
    while (stop != end && !is_blank(*stop)) ++stop;
    fields.emplace_back(p, static_cast<std::size_t>(stop - p));
    p = skip_blanks(stop, end);
  }
  return fields;
}

}  // namespace sm::cli
