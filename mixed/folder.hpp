// A folder that the files of a fit are written into.
#pragma once

#include <string>
#include <vector>

namespace sm::mixed {

struct NamedText {
  std::string name;  // of the file, without a folder
  std::string text;
};

// Creates the folder, with those above it, unless it exists. Throws ModelError when it cannot hold files. To be called
// before the work whose results shall be written there.
void prepare_folder(const std::string& folder);

// Prepares the folder, writes all files under temporary names, and renames them when all are complete: a file of such a
// name is replaced by a whole one or stays as it was. Files of the names in `outdated`, left by an earlier run, are
// removed. Throws ModelError.
void write_files(const std::string& folder, const std::vector<NamedText>& files,
                 const std::vector<std::string>& outdated = {});

}  // namespace sm::mixed
