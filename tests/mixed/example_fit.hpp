// Fits made up for tests of what is written of them: small numbers that are known, no model behind them.
#pragma once

#include <string>

#include "mixed/fit.hpp"
#include "mixed/model.hpp"

namespace sm::mixed::test {

struct Example {
  Model model;
  Fit fit;
};

// y ~ x + f + (x | g): two correlated coefficients of three levels, an aliased column, an estimable contrast and one
// that is not, a ratio, four observations.
Example example_fit();

// y ~ 1 + (1 | g) with so many levels and observations, drawn from a fixed seed.
Example drawn_fit(std::size_t levels, std::size_t observations);

// Names that break formats: quotes, commas, markup, line breaks, control characters, bytes that are not UTF-8, wide and
// combining characters, and 3,000 letters.
std::vector<std::string> hostile_names();

}  // namespace sm::mixed::test
