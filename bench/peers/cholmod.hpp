// CHOLMOD of SuiteSparse, with 32-bit indices, the faster of its two.
#pragma once

#include <cholmod.h>

#include <vector>

#include "bench/harness/upper_rows.hpp"

namespace sm::bench {

enum class Ordering { given, amd, metis };
enum class Kind { simplicial, supernodal };  // LDL' and LL'

struct Fill {
  double entries = 0.0;  // of L, with its diagonal
  double flops = 0.0;    // the sum over columns of the square of their length
};

class Cholmod {
 public:
  // `rows` must outlive it, as must `permutation`, which is for Ordering::given.
  Cholmod(const UpperRows& rows, Ordering ordering, Kind kind, const std::vector<int>* permutation = nullptr);
  ~Cholmod();
  Cholmod(const Cholmod&) = delete;
  Cholmod& operator=(const Cholmod&) = delete;

  // Ordering, unless it is given, and symbolic factorization; what was there before goes back.
  void analyse();
  // False when the matrix is not definite.
  bool factorize();
  // Other values on the same pattern, for the next factorize. They must outlive it.
  void refill(const std::vector<double>& values);
  // x <- A^-1 b for `count` right-hand sides; x is valid until the next solve.
  const double* solve(const double* b, int count);
  [[nodiscard]] double log_determinant() const;
  [[nodiscard]] Fill fill() const { return {common_.lnz, common_.fl}; }
  // A numeric supernodal factor turns into LDL'.
  void make_simplicial();
  [[nodiscard]] const cholmod_factor& factor() const { return *factor_; }
  [[nodiscard]] double peak_bytes() const { return static_cast<double>(common_.memory_usage); }

 private:
  void give_back_factor();

  cholmod_common common_{};
  cholmod_sparse matrix_{};
  std::vector<int> permutation_;
  cholmod_factor* factor_ = nullptr;
  cholmod_dense *x_ = nullptr, *y_ = nullptr, *e_ = nullptr;
};

// The fill of an ordering, without factoring.
Fill fill_of(const UpperRows& rows, const std::vector<int>& permutation);

}  // namespace sm::bench
