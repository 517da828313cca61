// weight * z * z' into a symmetric matrix: qxsmzscp.
#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

#include "store/store_test.hpp"
#include "support/random_matrices.hpp"

namespace sm::test {
namespace {

constexpr Shape kTargets[] = {kSymmetricSparse, kSymmetricColumns, kSymmetricRows};

class OuterProduct : public StoreTest {
 protected:
  SmStatus enter(SmMatrix* m, const std::vector<double>& z, double weight) {
    return fn().qxsmzscp(m, z.data(), nullptr, static_cast<std::int64_t>(z.size()), weight);
  }
  SmStatus enter(SmMatrix* m, const std::vector<double>& z, const std::vector<std::int64_t>& index, double weight) {
    return fn().qxsmzscp(m, z.data(), index.data(), static_cast<std::int64_t>(z.size()), weight);
  }
  // What is stored, absent elements left out, without the module's help.
  Nonzeros stored(SmMatrix* m) {
    const Shape shape{m->kind, m->format};
    if (is_sparse(shape)) return walk(m, m->sym_roots);
    Nonzeros out;
    for (std::int64_t r = 0; r < m->rows; ++r) {
      for (std::int64_t c = r; c < m->cols; ++c) out[{r, c}] = m->values[slot_of(shape, m->rows, m->cols, r, c)];
    }
    return out;
  }
};

double value_at(const Nonzeros& stored, std::int64_t r, std::int64_t c) {
  const auto found = stored.find({r, c});
  return found == stored.end() ? 0.0 : found->second;
}

TEST_P(OuterProduct, refuses_in_order) {
  const std::vector<double> z(8, 1.0);
  const std::int64_t index[] = {0, 1, -1, 3};
  SmMatrix* empty = typed(kGeneralRows);
  EXPECT_EQ(fn().qxsmzscp(empty, nullptr, nullptr, 9, 1.0), SM_OK);
  EXPECT_EQ(fn().qxsmzscp(reset_record(), z.data(), nullptr, 4, 1.0), SM_OK);
  for (const Shape shape : {kGeneralRows, kDiagonalRows, kDiagonalColumns, kGeneralColumns}) {
    SmMatrix* m = square(shape, 3);
    EXPECT_EQ(fn().qxsmzscp(m, z.data(), nullptr, 4, 1.0), SM_BAD_ARGUMENT) << "longer than the matrix";
    EXPECT_EQ(fn().qxsmzscp(m, nullptr, nullptr, 3, 1.0), SM_BAD_ARGUMENT) << "no vector";
    EXPECT_EQ(fn().qxsmzscp(m, nullptr, index, 1, 1.0), SM_BAD_ARGUMENT) << "no vector";
    EXPECT_EQ(fn().qxsmzscp(m, z.data(), nullptr, 3, 1.0), SM_UNAVAILABLE);
    EXPECT_EQ(fn().qxsmzscp(m, z.data(), index, 3, 1.0), SM_UNAVAILABLE);
    EXPECT_EQ(fn().qxsmzscp(m, z.data(), nullptr, kHuge, 1.0), SM_BAD_ARGUMENT);
  }
  SmMatrix* sparse = make(kGeneralSparse, 3, 3);
  ASSERT_EQ(set(sparse, 0, 0, 1.0), SM_OK);
  EXPECT_EQ(enter(sparse, {1.0, 2.0}, 1.0), SM_UNAVAILABLE);
  SmMatrix* closed = square(kSymmetricSparse, 3);
  ASSERT_EQ(fn().qxsmclose(closed, 0.0), SM_OK);
  EXPECT_EQ(fn().qxsmzscp(closed, z.data(), nullptr, 4, 1.0), SM_BAD_ARGUMENT);
  EXPECT_EQ(fn().qxsmzscp(closed, nullptr, nullptr, 2, 1.0), SM_BAD_ARGUMENT);
  EXPECT_EQ(fn().qxsmzscp(closed, z.data(), index, 3, 1.0), SM_ALREADY_CLOSED) << "before the negative index is met";
  EXPECT_EQ(fn().qxsmzscp(closed, nullptr, nullptr, 0, 1.0), SM_ALREADY_CLOSED);
}

TEST_P(OuterProduct, nothing_times_nothing_adds_nothing) {
  for (const Shape shape : kTargets) {
    SmMatrix* m = square(shape, 3);
    const Nonzeros before = stored(m);
    const double z = 1.0;
    EXPECT_EQ(fn().qxsmzscp(m, nullptr, nullptr, 0, 2.0), SM_OK);
    EXPECT_EQ(fn().qxsmzscp(m, nullptr, nullptr, -5, 2.0), SM_OK);
    EXPECT_EQ(fn().qxsmzscp(m, &z, nullptr, -kHuge - 1, 2.0), SM_OK);
    EXPECT_EQ(stored(m), before);
  }
}

TEST_P(OuterProduct, without_index_lies_along_the_first_rows) {
  for (const Shape shape : kTargets) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 4);
    ASSERT_EQ(set(m, 0, 1, 10.0), SM_OK);
    ASSERT_EQ(enter(m, {2.0, -3.0, 0.5}, 4.0), SM_OK);
    const Nonzeros out = stored(m);
    const double z[] = {2.0, -3.0, 0.5, 0.0};
    for (std::int64_t r = 0; r < 4; ++r) {
      for (std::int64_t c = r; c < 4; ++c) {
        EXPECT_EQ(value_at(out, r, c), 4.0 * z[r] * z[c] + (r == 0 && c == 1 ? 10.0 : 0.0)) << r << ' ' << c;
      }
    }
  }
}

TEST_P(OuterProduct, without_index_zeros_of_the_vector_make_no_entries) {
  SmMatrix* m = square(kSymmetricSparse, 5);
  ASSERT_EQ(enter(m, {0.0, 2.0, -0.0, 3.0, 0.0}, 1.0), SM_OK);
  EXPECT_EQ(m->nnz, 6) << "the diagonal and (1, 3)";
  ASSERT_EQ(enter(m, {1.0, 2.0, 0.0}, 0.0), SM_OK);
  EXPECT_EQ(m->nnz, 7) << "a weight of zero still enters (0, 1)";
  EXPECT_EQ(
      walk(m, m->sym_roots),
      (Nonzeros{
          {{0, 0}, 0.0}, {{0, 1}, 0.0}, {{1, 1}, 4.0}, {{1, 3}, 6.0}, {{2, 2}, 0.0}, {{3, 3}, 9.0}, {{4, 4}, 0.0}}));
}

TEST_P(OuterProduct, a_nan_is_not_a_zero) {
  SmMatrix* m = square(kSymmetricSparse, 3);
  ASSERT_EQ(enter(m, {kNan, 1.0, 0.0}, 1.0), SM_OK);
  EXPECT_EQ(m->nnz, 4);
  const NonzeroNode* node = m->tree->first(m->tree, &m->sym_roots[0]);
  EXPECT_NE(node->value, node->value);
}

TEST_P(OuterProduct, with_index_every_pair_is_entered_zeros_included) {
  SmMatrix* m = square(kSymmetricSparse, 6);
  ASSERT_EQ(enter(m, {0.0, 2.0, 0.0}, {1, 3, 5}, 1.0), SM_OK);
  EXPECT_EQ(m->nnz, 6 + 3);
  const Nonzeros out = walk(m, m->sym_roots);
  EXPECT_EQ(out.count({1, 3}), 1U);
  EXPECT_EQ(out.count({1, 5}), 1U);
  EXPECT_EQ(out.count({3, 5}), 1U);
  EXPECT_EQ(out.at({3, 3}), 4.0);
}

TEST_P(OuterProduct, indices_in_any_order_reach_the_upper_triangle) {
  for (const Shape shape : kTargets) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 6);
    ASSERT_EQ(enter(m, {2.0, 3.0, 5.0}, {4, 0, 2}, 0.5), SM_OK);
    const Nonzeros out = stored(m);
    EXPECT_EQ(value_at(out, 0, 4), 3.0);
    EXPECT_EQ(value_at(out, 2, 4), 5.0);
    EXPECT_EQ(value_at(out, 0, 2), 7.5);
    EXPECT_EQ(value_at(out, 4, 4), 2.0);
    EXPECT_EQ(value_at(out, 0, 0), 4.5);
    EXPECT_EQ(value_at(out, 2, 2), 12.5);
    EXPECT_EQ(value_at(out, 1, 1), 0.0);
  }
}

TEST_P(OuterProduct, a_repeated_index_adds_each_pair_once) {
  for (const Shape shape : kTargets) {
    SmMatrix* m = square(shape, 4);
    ASSERT_EQ(enter(m, {2.0, 3.0, 5.0}, {1, 1, 2}, 1.0), SM_OK);
    const Nonzeros out = stored(m);
    EXPECT_EQ(value_at(out, 1, 1), 4.0 + 6.0 + 9.0);
    EXPECT_EQ(value_at(out, 1, 2), 10.0 + 15.0);
    EXPECT_EQ(value_at(out, 2, 2), 25.0);
  }
}

TEST_P(OuterProduct, the_product_of_the_elements_is_rounded_before_the_weight) {
  // (0.1 * 0.3) * 0.7 differs in the last place from 0.1 * (0.3 * 0.7), and a weight of 1 must not touch the product.
  ASSERT_NE((0.1 * 0.3) * 0.7, 0.1 * (0.3 * 0.7));
  for (const Shape shape : kTargets) {
    SmMatrix* weighted = square(shape, 2);
    ASSERT_EQ(enter(weighted, {0.1, 0.3}, 0.7), SM_OK);
    EXPECT_EQ(bits(stored(weighted).at({0, 1})), bits((0.3 * 0.1) * 0.7));
    SmMatrix* plain = square(shape, 2);
    ASSERT_EQ(enter(plain, {0.1, 0.3}, {1, 0}, 1.0), SM_OK);
    EXPECT_EQ(bits(stored(plain).at({0, 1})), bits(0.3 * 0.1));
  }
}

TEST_P(OuterProduct, the_first_refusal_ends_it_and_earlier_pairs_stay) {
  for (const Shape shape : kTargets) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 6);
    EXPECT_EQ(enter(m, {2.0, 3.0, 5.0}, {1, -1, 3}, 1.0), SM_BAD_ARGUMENT);
    const Nonzeros out = stored(m);
    EXPECT_EQ(value_at(out, 1, 1), 4.0);
    EXPECT_EQ(value_at(out, 1, 3), 0.0);
    EXPECT_EQ(value_at(out, 3, 3), 0.0);
    EXPECT_EQ(enter(m, {1.0, 1.0}, {-kHuge - 1, 2}, 1.0), SM_BAD_ARGUMENT);
  }
  for (const Shape shape : kPacked) {
    SmMatrix* m = square(shape, 6);
    EXPECT_EQ(enter(m, {2.0, 3.0, 5.0}, {1, 6, 3}, 1.0), SM_BAD_ARGUMENT);
    EXPECT_EQ(enter(m, {2.0, 3.0, 5.0}, {1, kHuge, 3}, 1.0), SM_BAD_ARGUMENT);
    EXPECT_EQ(value_at(stored(m), 1, 1), 8.0);
    EXPECT_EQ(value_at(stored(m), 3, 3), 0.0);
  }
  SmMatrix* sparse = square(kSymmetricSparse, 6);
  EXPECT_EQ(enter(sparse, {2.0, 3.0, 5.0}, {1, kHuge, 3}, 1.0), SM_TOO_LARGE);
  EXPECT_EQ(value_at(walk(sparse, sparse->sym_roots), 1, 1), 4.0);
}

TEST_P(OuterProduct, an_index_past_the_size_makes_a_sparse_matrix_grow) {
  SmMatrix* m = square(kSymmetricSparse, 3);
  ASSERT_EQ(enter(m, {2.0, 3.0}, {30, 1}, 1.0), SM_OK);
  EXPECT_EQ(m->rows, 31);
  EXPECT_EQ(value_at(walk(m, m->sym_roots), 1, 30), 6.0);
  EXPECT_EQ(value_at(walk(m, m->sym_roots), 30, 30), 4.0);
}

TEST_P(OuterProduct, entered_again_and_again_it_makes_a_cross_product) {
  for (const Shape shape : kTargets) {
    for (const bool indexed : {false, true}) {
      SCOPED_TRACE(name_of(shape) + (indexed ? " indexed" : ""));
      Random random(static_cast<std::uint64_t>(shape.format) + (indexed ? 7 : 0));
      SmMatrix* m = square(shape, 9);
      std::vector<double> model(81, 0.0);
      for (int row = 0; row < 60; ++row) {
        const std::int64_t length = 1 + random.below(9);
        std::vector<double> z = random.vector(length);
        for (double& element : z) element = random.chance(30) ? 0.0 : element;
        std::vector<std::int64_t> index = random.permutation(9);
        if (!indexed) std::sort(index.begin(), index.end());
        const double weight = random.chance(40) ? 1.0 : random.dyadic();
        for (std::size_t i = 0; i < z.size(); ++i) {
          for (std::size_t j = 0; j < z.size(); ++j) {
            model[static_cast<std::size_t>(9 * index[i] + index[j])] += weight * z[i] * z[j];
          }
        }
        ASSERT_EQ(indexed ? enter(m, z, index, weight) : enter(m, z, weight), SM_OK);
      }
      const Nonzeros out = stored(m);
      for (std::int64_t r = 0; r < 9; ++r) {
        for (std::int64_t c = r; c < 9; ++c) {
          EXPECT_EQ(value_at(out, r, c), model[static_cast<std::size_t>(9 * r + c)]) << r << ' ' << c;
        }
      }
    }
  }
}

INSTANTIATE_BOTH_HOSTS(OuterProduct);

}  // namespace
}  // namespace sm::test
