// The design of a model in coordinates in which it is well conditioned, and products with it.
//
// Sums of squares of covariates such as years and their squares lose all digits in the equations. Columns of X that are
// no indicators are therefore made orthogonal to the well-filled columns before them, X = X~ R with R upper triangular;
// the coefficients of a random term are transformed likewise, Z = Z~ B^-1 with B upper triangular, which maps its
// covariance on another one of the same family. The response is taken as the deviation from a rough fit of X, which
// changes neither the (restricted) likelihood nor the random effects.
#pragma once

#include <cstdint>
#include <span>
#include <vector>

#include "mixed/model.hpp"

namespace sm::mixed {

// k x k matrices by columns, one for each random term: relative covariance factors, their derivatives.
using Factors = std::vector<std::vector<double>>;

struct DesignTerm {
  std::int64_t k = 0;
  std::int64_t levels = 0;
  std::int64_t first = 0;                            // its first unknown: those of a level stand together
  const std::vector<std::int64_t>* level = nullptr;  // of each observation
  std::vector<double> z;                             // observations x k by rows, transformed
  std::vector<double> basis;                         // B: z = (z of the model) * B
  const Precision* precision = nullptr;
};

// X = X~ R of the kept columns; aliased ones are scaled only. Column j of R above its diagonal.
struct FixedBasis {
  struct Part {
    std::int64_t column;
    long double factor;
  };
  std::vector<std::vector<Part>> above;
  std::vector<long double> norm;  // the diagonal of R

  std::vector<double> solve(std::span<const double> transformed) const;             // R^-1 of coefficients
  std::vector<double> solve_transposed(std::span<const double> combination) const;  // R^-T of a linear function
};

class ScaledDesign {
 public:
  explicit ScaledDesign(const Model& model);  // keeps a reference to the model

  const Model& model() const { return model_; }
  std::int64_t rows() const { return model_.rows(); }
  std::int64_t random_count() const { return random_count_; }
  std::int64_t fixed_count() const { return x_.cols(); }
  std::int64_t unknowns() const { return random_count_ + fixed_count(); }
  const std::vector<DesignTerm>& terms() const { return terms_; }
  const SparseColumns& x() const { return x_; }  // X~
  const FixedBasis& basis() const { return basis_; }
  const std::vector<double>& y() const { return y_; }            // the response less X~ offset
  const std::vector<double>& offset() const { return offset_; }  // transformed coefficients taken out of y
  double weight(std::size_t i) const { return model_.weights.empty() ? 1.0 : model_.weights[i]; }
  double log_weights() const { return log_weights_; }

  // Rows of X~: entries of row i at start[i] .. start[i + 1] - 1, columns ascending.
  const std::vector<std::int64_t>& row_start() const { return row_start_; }
  const std::vector<std::int32_t>& row_col() const { return row_col_; }
  const std::vector<double>& row_value() const { return row_value_; }

  // r <- r - [Z~ X~] v
  void subtract_product(std::span<const double> v, std::span<double> r) const;
  // W times each row: r_i <- w_i r_i
  void weigh(std::span<double> r) const;
  // [Z~ X~]' r
  std::vector<double> transposed_product(std::span<const double> r) const;

 private:
  void transform_term(const RandomTerm& term);
  void transform_fixed();
  void take_fit_out(const std::vector<std::int64_t>& well_filled);
  void store_rows();

  const Model& model_;
  std::int64_t random_count_ = 0;
  std::vector<DesignTerm> terms_;
  SparseColumns x_;
  FixedBasis basis_;
  std::vector<double> y_;
  std::vector<double> offset_;
  double log_weights_ = 0.0;
  std::vector<std::int64_t> row_start_;
  std::vector<std::int32_t> row_col_;
  std::vector<double> row_value_;
};

// Lambda v: each level's part of v times its term's factor; what follows the random effects stays. And its transpose.
void multiply_factors(const ScaledDesign& design, const Factors& factors, std::span<double> v);
void multiply_factors_transposed(const ScaledDesign& design, const Factors& factors, std::span<double> v);

// y <- y + scale * K v for the random part of v, K the precisions of the terms, identity where a term has none.
void add_precision_product(const ScaledDesign& design, std::span<const double> v, double scale, std::span<double> y);

}  // namespace sm::mixed
