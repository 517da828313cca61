// The random terms of a formula over the rows of a table.
#pragma once

#include <vector>

#include "mixed/design.hpp"
#include "mixed/variables.hpp"

namespace sm::mixed {

struct RandomDesign {
  std::vector<RandomTerm> terms;      // most levels first, then as in the formula
  std::vector<RandomRecipe> recipes;  // of each
};

RandomDesign make_random(const Formula& formula, const Frame& frame, Variables& variables,
                         const DesignOptions& options);

}  // namespace sm::mixed
