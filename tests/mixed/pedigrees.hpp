// Pedigrees for tests: written out, and at random.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "mixed/pedigree.hpp"

namespace sm::mixed::test {

// "5 4 3" on each line: animal, sire, dam; a point for an unknown parent. Lines are numbered from 2, behind a heading.
std::vector<PedigreeRow> rows_of(const std::string& text);

struct RandomPedigree {
  std::uint64_t seed = 1;
  int founders = 6;
  int animals = 60;       // in all
  int selfed = 0;         // percent of the animals with one animal as both parents
  int unknown = 10;       // percent of the parents
  int recent = 0;         // parents are among that many animals before; 0: among all
  bool rowless = false;   // founders have no rows
  bool shuffled = false;  // rows in any order
};
std::vector<PedigreeRow> random_rows(const RandomPedigree& kind);

}  // namespace sm::mixed::test
