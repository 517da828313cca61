#include "bench/peers/maps.hpp"

#include <algorithm>
#include <cmath>

namespace sm::bench {

void MapAssembly::close(UpperRows& out) {
  out = {.n = static_cast<int>(rows_.size()), .start = {0}, .col = {}, .value = {}};
  for (long i = 0; i < out.n; ++i) {
    auto& row = rows_[static_cast<std::size_t>(i)];
    row[i];
    for (const auto& [col, value] : row) {
      if (value == 0.0 && col != i) continue;
      out.col.push_back(static_cast<int>(col));
      out.value.push_back(value);
    }
    out.start.push_back(static_cast<int>(out.col.size()));
  }
}

std::string rows_fault(const UpperRows& got, const UpperRows& want) {
  if (got.n != want.n || got.start != want.start || got.col != want.col) return "another pattern";
  double largest = 0.0;
  for (const double v : want.value) largest = std::max(largest, std::fabs(v));
  for (std::size_t p = 0; p < want.value.size(); ++p) {
    if (!(std::fabs(got.value[p] - want.value[p]) <= 1e-12 * largest)) return "another value";
  }
  return "";
}

}  // namespace sm::bench
