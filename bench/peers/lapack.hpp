// OpenBLAS: the dense factorization and inversion, full and packed, and the machine's rates.
#pragma once

#include <vector>

namespace sm::bench {

// One thread, whatever the environment says.
void use_one_thread();

// Upper triangle of a column-major n x n array: R with R'R = A; then the inverse from R. False when it failed.
bool factor_full(std::vector<double>& a, int n);
bool invert_full(std::vector<double>& r, int n);
// The same with the upper triangle packed by columns.
bool factor_packed(std::vector<double>& a, int n);

// The set of kernels that OpenBLAS works with.
const char* kernels();

struct Rates {
  double gemm = 0.0;  // multiplications and additions a second
  double copy = 0.0;  // bytes a second, read and written
};
Rates measure_rates();

}  // namespace sm::bench
