#include "mixed/vectors.hpp"

#include <cmath>
#include <numeric>

namespace sm::mixed {

double dot(std::span<const double> a, std::span<const double> b) {
  return std::inner_product(a.begin(), a.end(), b.begin(), 0.0);
}

double norm(std::span<const double> a) { return std::sqrt(dot(a, a)); }

}  // namespace sm::mixed
