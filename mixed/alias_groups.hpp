// Columns of X with what they share with some before them taken off, where that costs little: numbers that go with the
// same dummy, and numbers over all rows. The spans of the first j columns stay what they are, for every j; normal
// equations of such columns keep the digits that years, their squares and their products with factors would lose.
#pragma once

#include <cstdint>
#include <utility>
#include <vector>

#include "mixed/alias_roads.hpp"

namespace sm::mixed {

struct GroupedColumn {
  bool dense = false;
  std::vector<std::int32_t> row;  // of the entries, ascending; empty when dense
  std::vector<double> value;      // of norm 1, or all 0
  double size = 0.0;              // the norm of the column itself
  double scale = 0.0;             // value * scale = column - sum of share * (grouped column as it stands)
  std::vector<std::pair<std::int64_t, double>> shares;
  double noise = 0.0;    // rounding in `value`
  bool nothing = false;  // what is left is rounding: the column depends on the shares alone

  template <class Visit>
  void for_each(Visit&& visit) const {
    for (std::size_t p = 0; p < value.size(); ++p) visit(dense ? p : static_cast<std::size_t>(row[p]), value[p]);
  }
};

std::vector<GroupedColumn> group_columns(const WeightedColumns& x);

}  // namespace sm::mixed
