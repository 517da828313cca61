// Numbers in a line of text: a fast road for lines that are as they should be, and words for those that are not.
#pragma once

#include <cstdint>
#include <string_view>
#include <vector>

namespace sm::cli {

inline bool is_blank(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\v' || c == '\f'; }

inline const char* skip_blanks(const char* p, const char* end) {
  while (p != end && is_blank(*p)) ++p;
  return p;
}

// The scanners read a field that begins at p and answer the first byte behind it, or null when there is no such number
// there. They do not look at what follows.
const char* scan_index(const char* p, const char* end, std::int64_t& value);    // decimal digits, up to 2^63 - 1
const char* scan_integer(const char* p, const char* end, std::int64_t& value);  // the same with a sign
const char* scan_real(const char* p, const char* end, double& value);           // finite

// The same for a field as a whole.
bool parse_index(std::string_view field, std::int64_t& value);
bool parse_integer(std::string_view field, std::int64_t& value);
bool parse_real(std::string_view field, double& value);

std::vector<std::string_view> split_fields(std::string_view line);

}  // namespace sm::cli
