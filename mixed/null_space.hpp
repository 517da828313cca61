// Which rows of the equations singular precisions make superfluous. A null vector of a precision is one of the
// equations too when the data cannot tell it from the fixed effects, or from a null vector of another term. The factor
// would find such a row by a pivot of zero, but where factors are small the pivot drowns in rounding; so the rows are
// found beforehand, once for all factors, and taken out.
#pragma once

#include "mixed/equations.hpp"
#include "mixed/factor_algebra.hpp"

namespace sm::mixed {

class NullSpace {
 public:
  // `part` of the unknowns; `equations` are those of all.
  NullSpace(const ScaledDesign& design, Equations& equations, Part part);

  // Unknowns to take out, chosen so that what is left is as well determined as it can be.
  std::vector<std::int64_t> superfluous(const Factors& factors) const;

 private:
  const ScaledDesign& design_;
  struct Unknown {
    std::int64_t place;
    std::size_t term;
    std::size_t coef;
    std::size_t first;  // the unknown of the same level and the first coefficient, in this list
  };
  std::vector<Unknown> unknowns_;  // of the rows that may be superfluous
  Dense gram_;                     // of the data's view of the null vectors, one for each of those unknowns
  std::size_t rank_ = 0;
};

}  // namespace sm::mixed
