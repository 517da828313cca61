// AMD and METIS by themselves. order[k] is the row placed k-th.
#pragma once

#include <vector>

#include "bench/harness/upper_rows.hpp"

namespace sm::bench {

// Throws std::runtime_error when it fails.
void order_by_amd(const UpperRows& rows, std::vector<int>& order);

// The graph that METIS wants, made beforehand: both triangles, no diagonal.
struct Graph {
  explicit Graph(const UpperRows& rows);
  std::vector<int> start, neighbour;
};
void order_by_metis(Graph& graph, std::vector<int>& order);

// What keeps `order` from being a permutation of 0 .. n-1, or nothing.
std::string permutation_fault(const std::vector<int>& order, int n);

}  // namespace sm::bench
