// Who descends from whom: the rows of a pedigree as indices, each animal after its parents.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace sm::mixed {

// One row of the table as written.
struct PedigreeRow {
  std::string id{};
  std::string sire{};
  std::string dam{};
  std::int64_t line = 0;  // of the file, from 1
};

constexpr std::int64_t kUnknownParent = -1;

struct Pedigree {
  std::vector<std::string> ids;          // in file order, then the parents that had no row of their own
  std::vector<std::int64_t> sire;        // of each animal, or kUnknownParent
  std::vector<std::int64_t> dam;         // likewise
  std::vector<std::int64_t> generation;  // 0 for founders, else one more than the later of the parents'
  std::vector<std::int64_t> order;       // all animals by generation, in file order within one: parents come first
  std::vector<std::string> notes;        // in words: what was found that may be meant and may be a slip

  std::int64_t size() const { return static_cast<std::int64_t>(ids.size()); }
};

// Empty, NA, 0 and a point stand for nobody.
bool is_unknown_animal(std::string_view id);

// Rows in any order. Throws ModelError, naming `file` and the line, for a row without an id, an id that has two rows,
// an animal that is its own parent, and animals that descend from themselves, which are named in order.
Pedigree make_pedigree(const std::vector<PedigreeRow>& rows, const std::string& file);

}  // namespace sm::mixed
