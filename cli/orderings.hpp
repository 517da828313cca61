// The orders in which the rows of a symmetric matrix can be eliminated. All but the first are found here and handed to
// the module; AMD and METIS are libraries of the command, which the module knows nothing of.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace sm::cli {

enum class Ordering {
  md,       // the module's own minimum degree
  amd,      // approximate minimum degree
  metis,    // nested dissection
  natural,  // as the matrix stands
};

// As they are called on the command line: "md", "amd", "metis" and "natural".
std::vector<std::string> ordering_names();
Ordering ordering_named(const std::string& name);  // one of these
const char* ordering_name(Ordering ordering);
const char* ordering_text(Ordering ordering);  // "metis, nested dissection"

// The stored positions of a symmetric matrix: row i has the columns col[start[i]] .. col[start[i + 1] - 1], ascending
// and none below i.
struct UpperPattern {
  std::int64_t n = 0;
  const std::int64_t* start = nullptr;
  const std::int64_t* col = nullptr;
};

// What keeps METIS, which counts with idx_t, from a graph with so many rows and neighbours; empty when nothing does.
std::string metis_refusal(std::int64_t rows, std::int64_t neighbours);

// perm[k] is the row placed k-th; not for md. `limit` as in require_memory, here for what the libraries take, too.
// Throws CommandError.
std::vector<std::int64_t> find_order(Ordering ordering, const UpperPattern& upper, std::uint64_t limit);

}  // namespace sm::cli
