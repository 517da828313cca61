// Numbers and names in what a user wrote, and the same in messages.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace sm::mixed {

// A finite decimal number, the whole of the text: "12", "-1.5e-3", "+.5". Words such as inf and nan are none.
bool parse_number(std::string_view text, double& value);

// Whether the text is an integer exactly as a program would print it, of at most 15 digits: "308", "-1", not "007".
bool is_plain_integer(std::string_view text);

// The shortest text that reads back as the number: "0.2", "308".
std::string print_number(double value);

// Input text made fit for a message: quoted, cut to a readable length, unprintable bytes as \xNN.
std::string quote(std::string_view text);

// "line 3" style counts: "1 row", "2 rows".
std::string count_of(std::int64_t count, std::string_view noun);

// Characters (not bytes) of UTF-8 text.
std::int64_t characters(std::string_view text);

// The name that was probably meant; empty when none is near.
std::string nearest_name(std::string_view name, const std::vector<std::string>& names);

// "a, b, c", at most `limit` of them, and how many more.
std::string listed(const std::vector<std::string>& names, std::size_t limit = 8);

}  // namespace sm::mixed
