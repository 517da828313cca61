#include "bench/peers/lapack.hpp"

#include <algorithm>
#include <cstring>

#include "bench/harness/clock.hpp"

extern "C" {
void openblas_set_num_threads(int count);
char* openblas_get_corename();
void dpotrf_(const char* triangle, const int* n, double* a, const int* lda, int* info);
void dpotri_(const char* triangle, const int* n, double* a, const int* lda, int* info);
void dpptrf_(const char* triangle, const int* n, double* a, int* info);
void dgemm_(const char* trans_a, const char* trans_b, const int* m, const int* n, const int* k, const double* alpha,
            const double* a, const int* lda, const double* b, const int* ldb, const double* beta, double* c,
            const int* ldc);
}

namespace sm::bench {

void use_one_thread() { openblas_set_num_threads(1); }

const char* kernels() { return openblas_get_corename(); }

bool factor_full(std::vector<double>& a, int n) {
  int info = 0;
  dpotrf_("U", &n, a.data(), &n, &info);
  return info == 0;
}

bool invert_full(std::vector<double>& r, int n) {
  int info = 0;
  dpotri_("U", &n, r.data(), &n, &info);
  return info == 0;
}

bool factor_packed(std::vector<double>& a, int n) {
  int info = 0;
  dpptrf_("U", &n, a.data(), &info);
  return info == 0;
}

Rates measure_rates() {
  constexpr int kOrder = 2000;
  constexpr std::size_t kBytes = std::size_t{256} << 20;  // far beyond the caches
  constexpr int kTimes = 5;
  const int n = kOrder;
  const double one = 1.0, zero = 0.0;
  std::vector<double> a(std::size_t{kOrder} * kOrder, 0.5), b = a, c = a;
  std::vector<char> from(kBytes, 1), to(kBytes, 2);
  double gemm = 1e300, copy = 1e300;
  for (int k = 0; k < kTimes; ++k) {
    gemm = std::min(
        gemm, seconds_of([&] { dgemm_("N", "N", &n, &n, &n, &one, a.data(), &n, b.data(), &n, &zero, c.data(), &n); }));
    copy = std::min(copy, seconds_of([&] { std::memcpy(to.data(), from.data(), kBytes); }));
    from[static_cast<std::size_t>(k)] = to[kBytes - 1];  // the copy is read
  }
  return {.gemm = 2.0 * n * n * n / gemm, .copy = 2.0 * static_cast<double>(kBytes) / copy};
}

}  // namespace sm::bench
