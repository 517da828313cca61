// The precision of a term of a model, from the files that the user names.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "cli/progress.hpp"
#include "mixed/design.hpp"
#include "mixed/module.hpp"

namespace sm::cli {

// A Matrix Market file, symmetric in value, and a file with the ids of its rows, one a line; with an empty path for it
// they are 1 to n. Throws CommandError and mixed::ModelError. `limit` as in require_memory.
mixed::KnownPrecision load_precision(const std::string& matrix, const std::string& ids, const mixed::Module& module,
                                     std::uint64_t limit, Progress& progress);

// The inverse of the relationship matrix of a pedigree. What may be a slip in it is added to `notes`, in words.
mixed::KnownPrecision load_pedigree(const std::string& path, std::vector<std::string>& notes);

}  // namespace sm::cli
