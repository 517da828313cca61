// From a table and a formula to a model.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "mixed/coding.hpp"
#include "mixed/formula.hpp"
#include "mixed/frame.hpp"
#include "mixed/model.hpp"
#include "mixed/table.hpp"

namespace sm::mixed {

// What (x | g; name) refers to. `labels` are the levels in the order of the rows of the precision.
struct KnownPrecision {
  std::vector<std::string> labels;
  std::shared_ptr<const Precision> precision;
};
// Throws ModelError for a name that it does not know.
using KnownPrecisionLookup = std::function<KnownPrecision(const std::string& name)>;

struct DesignOptions {
  std::string weights{};                                                   // column of positive weights; empty: none
  std::vector<std::string> factors{};                                      // columns of numbers to take as factors
  std::vector<std::pair<std::string, std::vector<std::string>>> levels{};  // column, its levels in order
  Contrasts contrasts = Contrasts::treatment;
  MissingValues missing = MissingValues::drop;
  bool variances_given = false;  // then a term may have as many levels as there are observations
  KnownPrecisionLookup known{};
};

// How a random term was made, to make its rows from other data.
struct RandomRecipe {
  Coding coding;
  std::vector<Node> group;
  std::string label;
  std::vector<std::string> levels;
};

struct DesignRecipe {
  std::string formula;
  Coding fixed;
  std::vector<RandomRecipe> random;  // as in the model
};

// Throws ModelError for whatever the user can mend. Model::recipe is set.
Model build_model(const Table& table, const Formula& formula, const DesignOptions& options = {});

// Rows of other data for a model that was made before.
struct NewRows {
  std::vector<std::int64_t> row;  // of the table; rows with missing values are left out
  std::int64_t rows_dropped = 0;
  SparseColumns x;
  struct Term {
    std::vector<std::int64_t> level;  // -1: not among those of the model, to be predicted with 0
    std::vector<double> z;            // rows x k by rows
    std::int64_t unseen = 0;          // rows with such a level
  };
  std::vector<Term> random;
};

// Throws ModelError for a level of a fixed factor that the model does not have.
NewRows new_rows(const DesignRecipe& recipe, const Table& table);

}  // namespace sm::mixed
