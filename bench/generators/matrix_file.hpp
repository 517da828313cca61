// A symmetric matrix from a Matrix Market file, for --matrix.
#pragma once

#include <string>

#include "bench/generators/problem.hpp"

namespace sm::bench {

// Coordinate, real or integer, symmetric; not compressed. b = A * 1; the rank is that of a plain factorization in the
// order of the file. Throws std::runtime_error when it is anything else.
Problem read_matrix(const std::string& file);

}  // namespace sm::bench
