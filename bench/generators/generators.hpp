// The families of systems that are measured. Every one is made from a fixed seed, so that a name stands for the same
// numbers everywhere.
#pragma once

#include "bench/generators/problem.hpp"

namespace sm::bench {

// Family a: the 5-point Laplacian of a k x k grid.
Problem plane_grid(int k);

// Family b: the 7-point Laplacian of a k x k x k grid.
Problem cube_grid(int k);

// Family e: the square of the 5-point Laplacian of a k x k grid, plus 0.05 on the diagonal: 13 points.
Problem squared_grid(int k);

// Family c: mixed-model equations of ratings. A student rates fewest to most lecturers; each of these comes from a
// department at random and is chosen within it by a skewed popularity. Fixed effects: mean, department, service, age of
// the student, age of the lecturer. With all dummies kept, each of the four factors costs one rank.
struct Ratings {
  int students = 0, lecturers = 0, fewest = 0, most = 0;
  bool all_dummies = false;
};
Problem crossed_ratings(const Ratings& size);

// Family d: animal model of a population of 12 birth years, with herd-year effects and a record on 60 % of the animals.
Problem animal_model(int animals);

// Family f: six correlated coefficients for each subject, bordered by ten fixed effects that touch all of them.
Problem random_coefficients(int subjects);

// A full first row and the diagonal.
Problem arrowhead(int n);

// An intercept and two crossed factors, the second with `meetings` levels of the first for each of its own.
Problem crossed_factors(int first, int second, int meetings);

// A path of n vertices, each of which touches three (at most `hubs`) hubs at random.
Problem path_with_hubs(int n, int hubs);

// One row of n entries and the diagonal: for assembly.
Problem hub_row(int n);

}  // namespace sm::bench
