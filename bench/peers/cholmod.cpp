#include "bench/peers/cholmod.hpp"

#include <cmath>
#include <stdexcept>

namespace sm::bench {
namespace {

int method_of(Ordering ordering) {
  switch (ordering) {
    case Ordering::amd:
      return CHOLMOD_AMD;
    case Ordering::metis:
      return CHOLMOD_METIS;
    case Ordering::given:
      break;
  }
  return CHOLMOD_GIVEN;
}

cholmod_sparse lower_columns(const UpperRows& rows) {
  cholmod_sparse a{};
  a.nrow = a.ncol = static_cast<std::size_t>(rows.n);
  a.nzmax = rows.value.size();
  a.p = const_cast<int*>(rows.start.data());  // CHOLMOD only reads them
  a.i = const_cast<int*>(rows.col.data());
  a.x = const_cast<double*>(rows.value.data());
  a.stype = -1;
  a.itype = CHOLMOD_INT;
  a.xtype = CHOLMOD_REAL;
  a.dtype = CHOLMOD_DOUBLE;
  a.sorted = a.packed = 1;
  return a;
}

}  // namespace

Cholmod::Cholmod(const UpperRows& rows, Ordering ordering, Kind kind, const std::vector<int>* permutation)
    : matrix_(lower_columns(rows)) {
  cholmod_start(&common_);
  common_.print = 0;
  common_.nmethods = 1;
  common_.method[0].ordering = method_of(ordering);
  common_.supernodal = kind == Kind::supernodal ? CHOLMOD_SUPERNODAL : CHOLMOD_SIMPLICIAL;
  if (permutation) permutation_ = *permutation;
}

Cholmod::~Cholmod() {
  give_back_factor();
  cholmod_free_dense(&x_, &common_);
  cholmod_free_dense(&y_, &common_);
  cholmod_free_dense(&e_, &common_);
  cholmod_finish(&common_);
}

void Cholmod::give_back_factor() { cholmod_free_factor(&factor_, &common_); }

void Cholmod::analyse() {
  give_back_factor();
  factor_ = cholmod_analyze_p(&matrix_, permutation_.empty() ? nullptr : permutation_.data(), nullptr, 0, &common_);
  if (!factor_) throw std::runtime_error("CHOLMOD could not analyse");
}

bool Cholmod::factorize() {
  cholmod_factorize(&matrix_, factor_, &common_);
  return common_.status == CHOLMOD_OK && factor_->minor == factor_->n;
}

void Cholmod::refill(const std::vector<double>& values) { matrix_.x = const_cast<double*>(values.data()); }

const double* Cholmod::solve(const double* b, int count) {
  cholmod_dense right{};
  right.nrow = right.d = factor_->n;
  right.ncol = static_cast<std::size_t>(count);
  right.nzmax = right.nrow * right.ncol;
  right.x = const_cast<double*>(b);
  right.xtype = CHOLMOD_REAL;
  right.dtype = CHOLMOD_DOUBLE;
  if (!cholmod_solve2(CHOLMOD_A, factor_, &right, nullptr, &x_, nullptr, &y_, &e_, &common_)) {
    throw std::runtime_error("CHOLMOD could not solve");
  }
  return static_cast<const double*>(x_->x);
}

double Cholmod::log_determinant() const {
  const auto* x = static_cast<const double*>(factor_->x);
  double sum = 0.0;
  if (!factor_->is_super) {
    const auto* start = static_cast<const int*>(factor_->p);
    for (std::size_t j = 0; j < factor_->n; ++j) sum += (factor_->is_ll ? 2.0 : 1.0) * std::log(x[start[j]]);
    return sum;
  }
  const auto* first = static_cast<const int*>(factor_->super);
  const auto* rows = static_cast<const int*>(factor_->pi);
  const auto* values = static_cast<const int*>(factor_->px);
  for (std::size_t s = 0; s < factor_->nsuper; ++s) {
    const std::ptrdiff_t height = rows[s + 1] - rows[s];
    for (std::ptrdiff_t k = 0; k < first[s + 1] - first[s]; ++k) sum += 2.0 * std::log(x[values[s] + k + k * height]);
  }
  return sum;
}

void Cholmod::make_simplicial() {
  if (!cholmod_change_factor(CHOLMOD_REAL, 0, 0, 1, 1, factor_, &common_)) {
    throw std::runtime_error("CHOLMOD could not convert its factor");
  }
}

Fill fill_of(const UpperRows& rows, const std::vector<int>& permutation) {
  Cholmod counter(rows, Ordering::given, Kind::simplicial, &permutation);
  counter.analyse();
  return counter.fill();
}

}  // namespace sm::bench
