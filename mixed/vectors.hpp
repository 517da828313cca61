// Products of vectors.
#pragma once

#include <span>

namespace sm::mixed {

double dot(std::span<const double> a, std::span<const double> b);
double norm(std::span<const double> a);

}  // namespace sm::mixed
