// A fit in words and tables, for a person at a terminal.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "mixed/fit.hpp"
#include "mixed/model.hpp"

namespace sm::mixed {

// How a factor of the fixed part is coded: with treatment contrasts against `level`, with sum contrasts leaving it out.
struct FactorReference {
  std::string factor;
  std::string level;
  bool sum = false;
};

struct SummaryOptions {
  std::string data;                         // the table's name; empty: not printed
  std::vector<FactorReference> references;  // of the factors of the fixed part
  std::size_t most_correlations = 12;       // the fixed effects' correlations are printed up to so many of them
};

// Ends in a newline; UTF-8 even where names are not. Lines keep to 100 columns but for long names.
std::string summary(const Model& model, const Fit& fit, const SummaryOptions& options = {});

}  // namespace sm::mixed
