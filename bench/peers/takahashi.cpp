#include "bench/peers/takahashi.hpp"

#include <algorithm>

namespace sm::bench {
namespace {

std::size_t at(int i) { return static_cast<std::size_t>(i); }

}  // namespace

Takahashi::Takahashi(const Cholmod& factored) : n_(static_cast<int>(factored.factor().n)), start_(at(n_) + 1) {
  const cholmod_factor& f = factored.factor();
  const auto* first = static_cast<const int*>(f.p);
  const auto* count = static_cast<const int*>(f.nz);
  const auto* row = static_cast<const int*>(f.i);
  const auto* value = static_cast<const double*>(f.x);
  const auto* order = static_cast<const int*>(f.Perm);
  for (int j = 0; j < n_; ++j) {
    row_.insert(row_.end(), row + first[j], row + first[j] + count[j]);
    l_.insert(l_.end(), value + first[j], value + first[j] + count[j]);
    start_[at(j) + 1] = static_cast<int>(row_.size());
  }
  work_.resize(at(n_));
  sum_.resize(at(n_));
  place_.resize(at(n_));
  for (int k = 0; k < n_; ++k) place_[at(order[k])] = k;
}

double Takahashi::work() const {
  double count = 0.0;
  for (std::size_t p = 0; p < row_.size(); ++p) count += 2.0 * (start_[at(row_[p]) + 1] - start_[at(row_[p])]);
  return count;
}

void Takahashi::run() {
  z_.resize(l_.size());
  for (int j = n_ - 1; j >= 0; --j) column(j);
}

// z[i][j] = -sum over k of z[i][k] l[k][j], i and k below the diagonal of column j; z[j][j] = 1/d - the same sum for j.
void Takahashi::column(int j) {
  const int begin = start_[at(j)];
  const int end = start_[at(j) + 1];
  for (int p = begin + 1; p < end; ++p) {
    work_[at(row_[at(p)])] = l_[at(p)];
    sum_[at(row_[at(p)])] = 0.0;
  }
  for (int p = begin + 1; p < end; ++p) {
    const int k = row_[at(p)];
    const double l = l_[at(p)];
    double across = z_[at(start_[at(k)])] * l;
    for (int q = start_[at(k)] + 1; q < start_[at(k) + 1];
         ++q) {  // rows outside column j have work 0, their sum is idle
      sum_[at(row_[at(q)])] += z_[at(q)] * l;
      across += z_[at(q)] * work_[at(row_[at(q)])];
    }
    sum_[at(k)] += across;
  }
  double diagonal = 1.0 / l_[at(begin)];
  for (int p = begin + 1; p < end; ++p) {
    z_[at(p)] = -sum_[at(row_[at(p)])];
    diagonal -= l_[at(p)] * z_[at(p)];
    work_[at(row_[at(p)])] = 0.0;
  }
  z_[at(begin)] = diagonal;
}

std::vector<double> Takahashi::diagonal() const {
  std::vector<double> d(at(n_));
  for (int i = 0; i < n_; ++i) d[at(i)] = z_[at(start_[at(place_[at(i)])])];
  return d;
}

double Takahashi::element(int i, int j) const {
  const int col = std::min(place_[at(i)], place_[at(j)]);
  const int row = std::max(place_[at(i)], place_[at(j)]);
  const auto begin = row_.begin() + start_[at(col)];
  const auto end = row_.begin() + start_[at(col) + 1];
  return z_[static_cast<std::size_t>(std::lower_bound(begin, end, row) - row_.begin())];
}

std::vector<double> Takahashi::on_pattern(const UpperRows& rows) const {
  std::vector<double> z;
  z.reserve(rows.col.size());
  for (int i = 0; i < rows.n; ++i) {
    for (int p = rows.start[at(i)]; p < rows.start[at(i) + 1]; ++p) z.push_back(element(i, rows.col[at(p)]));
  }
  return z;
}

double Takahashi::trace_with(const UpperRows& b) const {
  const std::vector<double> z = on_pattern(b);
  double trace = 0.0;
  for (int i = 0; i < b.n; ++i) {
    for (int p = b.start[at(i)]; p < b.start[at(i) + 1]; ++p) {
      trace += (b.col[at(p)] == i ? 1.0 : 2.0) * b.value[at(p)] * z[at(p)];
    }
  }
  return trace;
}

}  // namespace sm::bench
