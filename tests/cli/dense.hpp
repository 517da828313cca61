// Small dense matrices in long double, to hold the command's numbers against.
#pragma once

#include <string>
#include <vector>

namespace sm::test {

using DenseMatrix = std::vector<std::vector<long double>>;

// A coordinate file as a dense matrix; `mirrored` when the file holds one triangle of a symmetric one.
DenseMatrix dense_of(const std::string& text, std::size_t rows, std::size_t cols, bool mirrored);

// Any real file as a dense matrix, by the words in its first line.
DenseMatrix dense_file(const std::string& text);

// By elimination with row pivots; a regular matrix.
DenseMatrix dense_inverse(DenseMatrix a);

DenseMatrix dense_product(const DenseMatrix& a, const DenseMatrix& b);

// X A X'
DenseMatrix dense_form(const DenseMatrix& x, const DenseMatrix& a);

// Every element of `got` within `tolerance` of that of `want`; a NaN is not.
void expect_near(const DenseMatrix& got, const DenseMatrix& want, double tolerance);

long double dense_trace(const DenseMatrix& a);

// The inverse without row and column `left_out`, which are 0 in the answer: what is left of a singular matrix of rank
// n - 1 when that pivot was dropped.
DenseMatrix inverse_without(const DenseMatrix& a, std::size_t left_out);

}  // namespace sm::test
