// Graphs of designs in which some vertices touch very many others: fixed effects, factors with few levels, sires.
#pragma once

#include "support/random_matrices.hpp"

namespace sm::test {

// A mean, a factor of `few` levels and one of `many` with that many records each.
Graph crossed(Random& random, std::int64_t few, std::int64_t many, std::int64_t records);
// Animals with a sire and a dam born before them, mates linked, one of `groups` effects on most of them.
Graph pedigree(Random& random, std::int64_t animals, std::int64_t groups);
// Records of a subject with an item, a mean and three factors of few levels.
Graph mixed_model(Random& random, std::int64_t subjects, std::int64_t items, std::int64_t records);
// `hubs` more vertices, each of which touches that part of the rest, and sometimes each other.
Graph with_hubs(Random& random, const Graph& graph, std::int64_t hubs, std::int64_t percent);
// A path whose vertices all touch vertex 0.
Graph wheel(std::int64_t n);
// Chains that hang on one vertex, some of them closed, some linked to the one before.
Graph chained(Random& random, std::int64_t chains, std::int64_t length);
// The seven-point grid.
Graph brick(std::int64_t width, std::int64_t height, std::int64_t depth);
// One of these, of an order in the neighbourhood of `size`.
Graph any_hub_graph(Random& random, std::int64_t size);

}  // namespace sm::test
