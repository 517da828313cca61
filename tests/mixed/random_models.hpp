// Small mixed models from seeds.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "mixed/model.hpp"

namespace sm::mixed::test {

class Random {
 public:
  explicit Random(std::uint64_t seed) : state_(seed * UINT64_C(0x9E3779B97F4A7C15) + 1) {}
  double uniform();  // in (0, 1)
  double normal();
  std::int64_t below(std::int64_t count);

 private:
  std::uint64_t state_;
};

enum class Field { independent, chain, ring };  // a precision: none, a regular one, one singular along the ones

struct TermShape {
  std::int64_t coefs = 1;
  std::int64_t levels = 5;
  Field field = Field::independent;
  double sd = 1.0;
  bool centred = true;  // the covariate; else it lies around 2005
};

struct ModelShape {
  std::int64_t rows = 40;
  std::int64_t numeric = 1;  // covariates beside the intercept
  std::int64_t aliased = 0;  // columns that are sums of others
  std::int64_t factor = 0;   // levels of a factor
  bool intercept = true;
  bool weighted = false;
  double offset = 0.0;  // added to the covariates, with their squares as further columns when not 0
  double response_offset = 0.0;
  double noise = 1.0;
  std::vector<TermShape> terms{TermShape{}};
};

Model random_model(const ModelShape& shape, std::uint64_t seed);

}  // namespace sm::mixed::test
