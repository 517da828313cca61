// A symmetric system as a caller meets it: contributions to the upper triangle, several to one place where several
// records meet there, in the order in which a program would come across them.
#pragma once

#include <cstddef>
#include <string>
#include <utility>
#include <vector>

namespace sm::bench {

struct Triplets {
  std::vector<int> row, col;
  std::vector<double> value;

  [[nodiscard]] std::size_t size() const { return value.size(); }
  // Adds to (i, j) or (j, i), whichever is in the upper triangle.
  void add(int i, int j, double v) {
    if (i > j) std::swap(i, j);
    row.push_back(i);
    col.push_back(j);
    value.push_back(v);
  }
};

struct Problem {
  std::string family;  // a letter or a word of the command line
  std::string name;    // its size, as people say it
  int n = 0;
  int rank = 0;  // what it is by construction
  Triplets upper;
  std::vector<double> rhs;  // in the range of the matrix

  [[nodiscard]] bool definite() const { return rank == n; }
};

// The same contributions in random order.
Triplets shuffled(const Triplets& entries);

}  // namespace sm::bench
