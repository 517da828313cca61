// Assembly in one std::map per row, the obvious container.
#pragma once

#include <map>
#include <vector>

#include "bench/harness/upper_rows.hpp"

namespace sm::bench {

class MapAssembly {
 public:
  explicit MapAssembly(int n) : rows_(static_cast<std::size_t>(n)) {}
  void enter(const Triplets& entries) {
    for (std::size_t k = 0; k < entries.size(); ++k) {
      rows_[static_cast<std::size_t>(entries.row[k])][entries.col[k]] += entries.value[k];
    }
  }
  // Into compressed rows with every diagonal.
  void close(UpperRows& out);

 private:
  std::vector<std::map<long, double>> rows_;
};

// What differs between two sets of rows beyond rounding, or nothing.
std::string rows_fault(const UpperRows& got, const UpperRows& want);

}  // namespace sm::bench
