// The ids of the rows of a matrix.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace sm::mixed {

// The lines of a file of ids, one for each row of a matrix of that order; blanks around an id do not count. Throws
// ModelError for an empty line, an id that is there twice, and another number of ids. Without lines the ids are 1 to n.
std::vector<std::string> row_ids(const std::vector<std::string>& lines, std::int64_t order, const std::string& file);

// The same from a file, plain or gzip; "-" is standard input, and an empty path means 1 to n.
std::vector<std::string> read_row_ids(const std::string& path, std::int64_t order);

}  // namespace sm::mixed
