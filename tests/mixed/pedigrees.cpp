#include "mixed/pedigrees.hpp"

#include <algorithm>
#include <random>
#include <sstream>

namespace sm::mixed::test {

std::vector<PedigreeRow> rows_of(const std::string& text) {
  std::vector<PedigreeRow> rows;
  std::istringstream words(text);
  for (PedigreeRow row; words >> row.id >> row.sire >> row.dam;) {
    row.line = static_cast<std::int64_t>(rows.size()) + 2;
    rows.push_back(row);
  }
  return rows;
}

std::vector<PedigreeRow> random_rows(const RandomPedigree& kind) {
  std::mt19937_64 random(kind.seed);
  const auto below = [&](int bound) { return static_cast<int>(random() % static_cast<std::uint64_t>(bound)); };
  const auto parent_of = [&](int animal) {
    const int range = kind.recent > 0 ? std::min(kind.recent, animal) : animal;
    return below(100) < kind.unknown ? std::string(".") : "a" + std::to_string(animal - 1 - below(range));
  };
  std::vector<PedigreeRow> rows;
  for (int i = 0; i < kind.animals; ++i) {
    PedigreeRow row{.id = "a" + std::to_string(i)};
    if (i >= kind.founders) {
      row.sire = parent_of(i);
      row.dam = below(100) < kind.selfed ? row.sire : parent_of(i);
    } else if (kind.rowless) {
      continue;
    }
    rows.push_back(row);
  }
  if (kind.shuffled) std::shuffle(rows.begin(), rows.end(), random);
  for (std::size_t i = 0; i < rows.size(); ++i) rows[i].line = static_cast<std::int64_t>(i) + 2;
  return rows;
}

}  // namespace sm::mixed::test
