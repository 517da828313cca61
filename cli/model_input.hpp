// From what the user typed and the files that are named there to a model.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "cli/commands.hpp"
#include "cli/known_precision.hpp"
#include "cli/module_session.hpp"
#include "mixed/design.hpp"
#include "mixed/estimate.hpp"
#include "mixed/model.hpp"
#include "mixed/module.hpp"
#include "mixed/table.hpp"

namespace sm::cli {

// "a,b,c" in its parts; one with a comma in it stands in double quotes.
std::vector<std::string> split_list(std::string_view text);

// "name=value"; blanks around both do not count.
std::pair<std::string, std::string> split_assignment(std::string_view text);

// The precisions of a formula by their names, each read once. Throws CommandError for a name without a file, a file
// that no term asks for, and two files of one name.
class KnownPrecisions {
 public:
  KnownPrecisions(const ModelOptions& options, const mixed::Formula& formula);
  mixed::KnownPrecision get(const std::string& name, const mixed::Module& module, std::uint64_t limit,
                            Progress& progress);
  const std::vector<std::string>& notes() const { return notes_; }

 private:
  struct Source {
    std::string path;
    std::string ids;
    bool pedigree = false;
  };
  std::map<std::string, Source> sources_;
  std::map<std::string, mixed::KnownPrecision> read_;
  std::vector<std::string> notes_;
};

mixed::DesignOptions design_options(const ModelOptions& options);

// The variance components of a model without values, as in Fit::varcomp.
std::vector<mixed::VarianceComponent> components_of(const mixed::Model& model);

// --var as values of these components. Throws CommandError.
std::vector<double> given_variances(const std::vector<std::string>& texts, const mixed::Model& model,
                                    const mixed::Formula& formula);

std::vector<mixed::ContrastRequest> contrast_requests(const std::vector<std::string>& texts, const mixed::Model& model);

// Those that are asked for; where none is, each variance over their total when `defaults`.
std::vector<mixed::RatioRequest> ratio_requests(const std::vector<std::string>& texts, const mixed::Model& model,
                                                bool defaults);

}  // namespace sm::cli
