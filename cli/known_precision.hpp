// The precision of a term of a model, from the files that the user names.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "cli/progress.hpp"
#include "mixed/model.hpp"
#include "mixed/module.hpp"

namespace sm::cli {

struct KnownPrecision {
  std::vector<std::string> ids;  // of the rows, in order
  std::shared_ptr<const mixed::Precision> precision;
  std::vector<std::string> notes;  // in words: what was found that may be a slip
};

// A Matrix Market file, symmetric in value, and a file with the ids of its rows, one a line; without one they are 1 to
// n. Throws CommandError and mixed::ModelError. `limit` as in require_memory.
KnownPrecision load_precision(const std::string& matrix, const std::string& ids, const mixed::Module& module,
                              std::uint64_t limit, Progress& progress);

// The inverse of the relationship matrix of a pedigree.
KnownPrecision load_pedigree(const std::string& path);

}  // namespace sm::cli
