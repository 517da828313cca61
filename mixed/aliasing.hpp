// Which columns of X depend on those before them.
#pragma once

#include <vector>

#include "mixed/model.hpp"

namespace sm::mixed {

// Fills kept, aliased and dependence from x; rows are weighted (empty: all alike). A column is aliased when what is
// left of it behind the kept ones before it is no more than rounding: the last of a dependent set, in the order of
// columns.
void find_aliased(FixedDesign& design, const std::vector<double>& weights);

}  // namespace sm::mixed
