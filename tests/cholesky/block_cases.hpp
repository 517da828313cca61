// Structures whose factors have blocks of rows of chosen widths.
#pragma once

#include "cholesky/cholesky_support.hpp"

namespace sm::test {

// Cliques one behind the other, each with edges to some vertices of some later ones.
Graph linked_cliques(Random& random, const Indices& sizes, std::int64_t percent);
// The same of a few sizes, mostly below ten.
Graph any_linked_cliques(Random& random);
// Every graph of one to three vertices.
std::vector<Graph> smallest_graphs();
// A clique whose every vertex touches `tail` vertices that follow it, after `gap` others that touch those only.
Graph bordered_clique(std::int64_t width, std::int64_t gap, std::int64_t tail);
// Cliques of up to `most_width` vertices one behind the other, most of them touching the next one, and some the one
// after that; some touch most of the `border` vertices, a clique behind them all, others few: rows further on have most
// columns of those before, and some more.
Graph growing_tails(Random& random, std::int64_t count, std::int64_t most_width, std::int64_t border);
// Subjects of `width` vertices each, cliques of their own; subject s touches the vertices of tails[s] among the
// `border` ones behind them all.
Graph subjects(const std::vector<Indices>& tails, std::int64_t width, std::int64_t border);
// Tails that are all of the border.
std::vector<Indices> whole_tails(std::int64_t count, std::int64_t border);
// Each one of a few parts of the border.
std::vector<Indices> mixed_tails(Random& random, std::int64_t count, std::int64_t border);
// Up to that many subjects of up to nine vertices, each touching one of a few parts of the border.
Graph mixed_subjects(Random& random, std::int64_t most, std::int64_t most_border);
// Subjects whose coefficients are in part copies of the one before, all touching the whole border. What is left of a
// copy is exactly 0, wherever it stands: the rank is given too.
struct Twins {
  Problem problem;
  std::int64_t rank;
};
Twins twin_subjects(Random& random, std::int64_t count, std::int64_t width, std::int64_t border);
// Counts of a design with an intercept and every level of two crossed factors: of rank 1 less than its order for each
// factor, when the design is connected.
Problem crossed_counts(Random& random, std::int64_t a, std::int64_t b);

}  // namespace sm::test
