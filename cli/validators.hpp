// Checks of option values, whose messages say what was found and what was expected.
#pragma once

#include <CLI/App.hpp>
#include <string>
#include <vector>

namespace sm::cli {

// "info, factor or solve"
std::string alternatives(const std::vector<std::string>& names);

CLI::Validator one_of(const std::vector<std::string>& names);
CLI::Validator memory_size();                                         // "4G"
CLI::Validator count();                                               // a whole number above 0
CLI::Validator finite_number(const char* expected, double smallest);  // from `smallest` on, `expected` in words
CLI::Validator tolerance();                                           // 0 or above
CLI::Validator assignment(const char* example);                       // "name=value", neither of them empty

}  // namespace sm::cli
