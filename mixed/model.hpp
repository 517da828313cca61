// A linear mixed model as numbers: y = X beta + Z u + e, Var(e) = sigma^2 W^-1, each term of u with a covariance of its
// own. What a formula and a table are turned into, and all that fitting needs to know.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace sm::mixed {

// A matrix by columns: column j has its entries at places start[j] to start[j + 1] - 1, rows ascending.
struct SparseColumns {
  std::int64_t rows = 0;
  std::vector<std::int64_t> start{0};
  std::vector<std::int64_t> row;
  std::vector<double> value;

  std::int64_t cols() const { return static_cast<std::int64_t>(start.size()) - 1; }
};

// The precision of the levels of a term, up to the variance: the inverse of a relationship matrix, or the structure
// matrix of a Gaussian field. Positive semidefinite.
struct Precision {
  std::int64_t order = 0;
  std::vector<std::int64_t> row_start;  // upper triangle by rows, the diagonal first, columns ascending
  std::vector<std::int64_t> col;
  std::vector<double> value;
  double log_det = 0.0;  // of the product of the nonzero eigenvalues
  std::int64_t nullity = 0;
  std::vector<double> null_basis;               // order x nullity by columns, orthonormal
  std::vector<std::int64_t> null_rows;          // `nullity` rows without which the rest is regular, ascending
  std::vector<double> inverse_diagonal_excess;  // F of each animal of a pedigree; empty elsewhere
};

// Random effects of one grouping factor: k correlated coefficients for each level. (x || g) makes two of them.
struct RandomTerm {
  std::string group;                           // "Block:Variety"
  std::vector<std::string> coefs;              // "(Intercept)", "Days"; k names
  std::vector<std::string> levels;             // in order; with a precision these are its rows, with or without records
  std::vector<std::int64_t> level;             // of each row of the data, 0-based
  std::vector<double> z;                       // rows x k by rows: the coefficients' covariates
  std::shared_ptr<const Precision> precision;  // null: the levels are independent
  std::string known{};                         // the name of the precision in the formula: "pedigree"

  std::int64_t coef_count() const { return static_cast<std::int64_t>(coefs.size()); }
  std::int64_t level_count() const { return static_cast<std::int64_t>(levels.size()); }
};

// The columns of X in formula order. An aliased one depends on those before it that are kept.
struct FixedDesign {
  SparseColumns x;
  std::vector<std::string> names;       // "(Intercept)", "VarietyMarvellous:nitrofn0.6"
  std::vector<std::int64_t> term;       // which term of the formula a column belongs to; the intercept is 0
  std::vector<std::string> term_names;  // "(Intercept)", "Variety", "Variety:nitrof"
  std::vector<std::int64_t> kept;       // columns that are not aliased, ascending
  std::vector<std::int64_t> aliased;    // the others, ascending
  std::vector<double> dependence;  // kept x aliased by columns: X_aliased = X_kept * dependence, exact zeros where none

  std::int64_t rank() const { return static_cast<std::int64_t>(kept.size()); }
};

// A column of the table that stands as a factor in the fixed part.
struct ModelFactor {
  std::string name;
  std::vector<std::string> levels;  // in order; the first is the reference of treatment contrasts
};

struct DesignRecipe;  // mixed/design.hpp: how rows of data become rows of X and Z

struct Model {
  std::string formula;          // as written
  std::string response;         // "y", "log(y)"
  std::vector<double> y;        // n
  std::vector<double> weights;  // n, positive; empty: all 1
  FixedDesign fixed;
  std::vector<RandomTerm> random;  // most levels first, then as in the formula
  std::vector<std::int64_t> row;   // the row of the table (0-based) that each observation comes from
  std::int64_t rows_dropped = 0;   // for missing values
  std::vector<std::pair<std::string, std::int64_t>> missing{};  // how many each variable lacks, where it lacks any
  std::vector<ModelFactor> factors{};
  bool sum_contrasts = false;        // else treatment contrasts
  std::vector<std::string> notes{};  // in words: what a user may want to know about data and formula
  std::shared_ptr<const DesignRecipe> recipe{};

  std::int64_t rows() const { return static_cast<std::int64_t>(y.size()); }
};

}  // namespace sm::mixed
