#include "cli/dense.hpp"

#include <cmath>
#include <sstream>

#include "cli/command.hpp"

namespace sm::test {

DenseMatrix dense_of(const std::string& text, std::size_t rows, std::size_t cols, bool mirrored) {
  DenseMatrix a(rows, std::vector<long double>(cols, 0.0L));
  for (const auto& [row, col, value] : coordinate_entries(text)) {
    const auto i = static_cast<std::size_t>(row);
    const auto j = static_cast<std::size_t>(col);
    a.at(i).at(j) += value;
    if (mirrored && i != j) a.at(j).at(i) += value;
  }
  return a;
}

DenseMatrix dense_file(const std::string& text) {
  std::istringstream lines(text);
  std::string banner;
  std::getline(lines, banner);
  std::string line;
  while (std::getline(lines, line) && line[0] == '%') {
  }
  std::size_t rows = 0;
  std::size_t cols = 0;
  std::istringstream(line) >> rows >> cols;
  const bool symmetric = banner.find(" symmetric") != std::string::npos;
  if (banner.find(" coordinate ") != std::string::npos) return dense_of(text, rows, cols, symmetric);
  DenseMatrix a(rows, std::vector<long double>(cols, 0.0L));
  for (std::size_t j = 0; j < cols; ++j) {
    for (std::size_t i = symmetric ? j : 0; i < rows; ++i) {
      double value = 0.0;
      EXPECT_TRUE(lines >> value) << "the array ends early";
      a[i][j] = value;
      if (symmetric) a[j][i] = value;
    }
  }
  EXPECT_FALSE(lines >> line) << "the array has more than its size says";
  return a;
}

DenseMatrix dense_form(const DenseMatrix& x, const DenseMatrix& a) {
  const DenseMatrix product = dense_product(x, a);
  DenseMatrix form(x.size(), std::vector<long double>(x.size(), 0.0L));
  for (std::size_t i = 0; i < x.size(); ++i) {
    for (std::size_t j = 0; j < x.size(); ++j) {
      for (std::size_t k = 0; k < a.size(); ++k) form[i][j] += product[i][k] * x[j][k];
    }
  }
  return form;
}

void expect_near(const DenseMatrix& got, const DenseMatrix& want, double tolerance) {
  ASSERT_EQ(got.size(), want.size());
  for (std::size_t i = 0; i < got.size(); ++i) {
    ASSERT_EQ(got[i].size(), want[i].size());
    for (std::size_t j = 0; j < got[i].size(); ++j) {
      EXPECT_TRUE(std::fabs(got[i][j] - want[i][j]) <= tolerance)
          << i << ", " << j << ": " << got[i][j] << " for " << want[i][j];
    }
  }
}

DenseMatrix dense_inverse(DenseMatrix a) {
  const std::size_t n = a.size();
  DenseMatrix inverse(n, std::vector<long double>(n, 0.0L));
  for (std::size_t i = 0; i < n; ++i) inverse[i][i] = 1.0L;
  for (std::size_t k = 0; k < n; ++k) {
    std::size_t best = k;
    for (std::size_t i = k + 1; i < n; ++i) {
      if (std::fabs(a[i][k]) > std::fabs(a[best][k])) best = i;
    }
    std::swap(a[k], a[best]);
    std::swap(inverse[k], inverse[best]);
    const long double pivot = a[k][k];
    EXPECT_NE(pivot, 0.0L);
    for (std::size_t j = 0; j < n; ++j) {
      a[k][j] /= pivot;
      inverse[k][j] /= pivot;
    }
    for (std::size_t i = 0; i < n; ++i) {
      const long double factor = i == k ? 0.0L : a[i][k];
      if (factor == 0.0L) continue;
      for (std::size_t j = 0; j < n; ++j) {
        a[i][j] -= factor * a[k][j];
        inverse[i][j] -= factor * inverse[k][j];
      }
    }
  }
  return inverse;
}

DenseMatrix dense_product(const DenseMatrix& a, const DenseMatrix& b) {
  DenseMatrix c(a.size(), std::vector<long double>(b.at(0).size(), 0.0L));
  for (std::size_t i = 0; i < a.size(); ++i) {
    for (std::size_t k = 0; k < b.size(); ++k) {
      for (std::size_t j = 0; j < c[i].size(); ++j) c[i][j] += a[i].at(k) * b[k][j];
    }
  }
  return c;
}

long double dense_trace(const DenseMatrix& a) {
  long double sum = 0.0L;
  for (std::size_t i = 0; i < a.size(); ++i) sum += a[i].at(i);
  return sum;
}

DenseMatrix inverse_without(const DenseMatrix& a, std::size_t left_out) {
  DenseMatrix regular = a;
  for (std::size_t i = 0; i < a.size(); ++i) regular[i][left_out] = regular[left_out][i] = 0.0L;
  regular[left_out][left_out] = 1.0L;
  DenseMatrix inverse = dense_inverse(std::move(regular));
  inverse[left_out][left_out] = 0.0L;
  return inverse;
}

}  // namespace sm::test
