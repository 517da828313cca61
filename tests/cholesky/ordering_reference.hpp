// An independent minimum-degree ordering for comparison: explicit lists and sets, no shared storage, no tags.
#pragma once

#include <cstdint>
#include <vector>

#include "support/random_matrices.hpp"

namespace sm::test {

// The vertices in elimination order. Edges are entered in the order given; an edge given twice counts once.
std::vector<std::int64_t> minimum_degree_reference(const Graph& graph);

// Column subscripts of the rows of U after elimination in that order, by dense boolean elimination.
std::vector<std::vector<std::int64_t>> true_fill(const Graph& graph, const std::vector<std::int64_t>& perm);

}  // namespace sm::test
