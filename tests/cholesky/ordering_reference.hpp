// An independent minimum-degree ordering for comparison: explicit lists and sets, no shared storage, no tags.
#pragma once

#include <cstdint>
#include <vector>

#include "support/random_matrices.hpp"

namespace sm::test {

// The vertices in elimination order. Edges are entered in the order given; an edge given twice counts once.
std::vector<std::int64_t> minimum_degree_reference(const Graph& graph);

}  // namespace sm::test
