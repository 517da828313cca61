// The structure of U by other means: dense boolean elimination, and the compression of its subscripts from the result.
#pragma once

#include <cstdint>
#include <vector>

#include "support/random_matrices.hpp"

namespace sm::test {

// Column subscripts of the rows of U after elimination in that order.
std::vector<std::vector<std::int64_t>> true_fill(const Graph& graph, const std::vector<std::int64_t>& perm);

// The subscripts that are stored for those rows. A row stores none when it is the tail of a row that updates it, or is
// found in the last block stored; one that begins inside the last block and goes on behind it stores the rest.
std::vector<std::int64_t> compressed_subscripts(const Graph& graph, const std::vector<std::int64_t>& perm);

}  // namespace sm::test
