// Pedigrees as they stand in files.
#pragma once

#include <string>

#include "mixed/pedigree.hpp"

namespace sm::mixed {

// A CSV or TSV table with a heading, plain or gzip; "-" is standard input. The columns are those that the heading calls
// id, sire and dam, in any case of letters, else the first three, which a note then says. Throws ModelError for what is
// no such table, and whatever make_pedigree refuses.
Pedigree read_pedigree(const std::string& path);

// The same for text that is there.
Pedigree parse_pedigree(const std::string& text, const std::string& name);

}  // namespace sm::mixed
