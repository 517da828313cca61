// Ending assembly: tolerances, the order of refusals, and what closing leaves behind.
#include <gtest/gtest.h>

#include <cmath>
#include <vector>

#include "store/store_test.hpp"

namespace sm::test {
namespace {

class Closing : public StoreTest {
 protected:
  SmStatus close(SmMatrix* m, double tolerance) { return fn().qxsmclose(m, tolerance); }

  // Reset records are tied to `values` and so in state 0, where closing drops.
  SmMatrix* open_dense(Shape shape, std::vector<double>& values) {
    SmMatrix* m = reset_record();
    const std::int64_t n = shape.kind == SM_KIND_SYMMETRIC ? 3 : static_cast<std::int64_t>(values.size());
    const std::int64_t rows = shape.kind == SM_KIND_GENERAL ? 1 : n;
    EXPECT_EQ(qxsmtie(m, values.data(), rows, n, shape.kind, shape.format), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_OPEN);
    EXPECT_EQ(m->nnz, static_cast<std::int64_t>(values.size()));
    return m;
  }

  // Six entries in row 1 of a general sparse matrix put back to state 0, where closing drops.
  SmMatrix* open_trees(const std::vector<double>& values) {
    SmMatrix* m = make(kGeneralSparse, 3, static_cast<std::int64_t>(values.size()));
    for (std::size_t k = 0; k < values.size(); ++k) {
      EXPECT_EQ(set(m, 1, static_cast<std::int64_t>(k), values[k]), SM_OK);
    }
    m->state = SM_STATE_OPEN;
    return m;
  }

  // The columns above the diagonal of row 0 that are left when `values` stand there.
  SmMatrix* open_symmetric(const std::vector<double>& values) {
    SmMatrix* m = square(kSymmetricSparse, static_cast<std::int64_t>(values.size()) + 1);
    for (std::size_t k = 0; k < values.size(); ++k) {
      EXPECT_EQ(set(m, 0, static_cast<std::int64_t>(k) + 1, values[k]), SM_OK);
    }
    return m;
  }

  // Closes `values` in every form that drops, and expects that exactly those of `kept` are left.
  void expect_kept(const std::vector<double>& values, double tolerance, const std::vector<bool>& kept) {
    SmMatrix* trees = open_trees(values);
    SmMatrix* rows = open_symmetric(values);
    ASSERT_EQ(close(trees, tolerance), SM_OK);
    ASSERT_EQ(close(rows, tolerance), SM_OK);
    EXPECT_EQ(trees->state, SM_STATE_CLOSED);
    const Nonzeros from_trees = walk(trees, trees->row_roots);
    const Nonzeros from_rows = compressed(rows);
    for (std::size_t k = 0; k < values.size(); ++k) {
      const auto col = static_cast<std::int64_t>(k);
      EXPECT_EQ(from_trees.count({1, col}) == 1, kept[k]) << "tree, " << values[k];
      EXPECT_EQ(from_rows.count({0, col + 1}) == 1, kept[k]) << "compressed, " << values[k];
    }
    for (const Shape shape : kDense) {
      SCOPED_TRACE(name_of(shape));
      std::vector<double> mine = values;
      SmMatrix* m = open_dense(shape, mine);
      ASSERT_EQ(close(m, tolerance), SM_OK);
      EXPECT_EQ(m->nnz, static_cast<std::int64_t>(values.size())) << "slots stay";
      for (std::size_t k = 0; k < values.size(); ++k) {
        EXPECT_EQ(bits(mine[k]), kept[k] ? bits(values[k]) : 0U) << values[k];
      }
    }
  }
};

TEST_P(Closing, drops_what_is_at_or_below_the_tolerance) {
  expect_kept({0.5, -0.5, std::nextafter(0.5, 1.0), -std::nextafter(0.5, 1.0), 0.25, -4.0}, 0.5,
              {false, false, true, true, false, true});
}

TEST_P(Closing, a_tolerance_of_zero_drops_exact_zeros_only) {
  for (const double zero : {0.0, -0.0}) {
    expect_kept({0.0, -0.0, 5e-324, -5e-324, 1e-300, 2.0}, zero, {false, false, true, true, true, true});
  }
}

TEST_P(Closing, a_nan_as_tolerance_drops_nothing) {
  std::uint64_t pattern = SM_MISSING_BITS;
  double missing = 0.0;
  __builtin_memcpy(&missing, &pattern, sizeof missing);
  for (const double nan : {kNan, -kNan, missing}) {
    expect_kept({0.0, -0.0, 5e-324, 1.0, -1.0, kInfinity}, nan, {true, true, true, true, true, true});
  }
}

TEST_P(Closing, a_nan_as_value_is_never_dropped) {
  expect_kept({kNan, -kNan, 1.0, -1e300, 0.0, kNan}, kInfinity, {true, true, false, false, false, true});
  expect_kept({kNan, -kNan, 1.0, -1e300, 0.0, kNan}, 0.5, {true, true, true, true, false, true});
}

TEST_P(Closing, a_negative_tolerance_stands_for_setting_3) {
  const double setting = instance()->tolerances[3];
  ASSERT_EQ(bits(setting), SM_DROP_TOLERANCE_BITS);
  for (const double negative : {-1.0, -5e-324, -kInfinity}) {
    expect_kept({setting, -setting, std::nextafter(setting, 1.0), 0.0, 1.0, 1e-200}, negative,
                {false, false, true, false, true, false});
  }
}

TEST_P(Closing, setting_3_is_read_from_the_instance) {
  const double before = instance()->tolerances[3];
  instance()->tolerances[3] = 0.25;
  expect_kept({0.25, -0.25, 0.5, -0.5, 0.125, 0.0}, -1.0, {false, false, true, true, false, false});
  instance()->tolerances[3] = before;
}

TEST_P(Closing, refuses_in_order) {
  SmMatrix* none = reset_record();
  EXPECT_EQ(close(none, 0.0), SM_OK) << "empty comes first";
  none->nnz = 1;  // only a record that was tampered with has entries and no kind
  none->state = SM_STATE_CLOSED;
  EXPECT_EQ(close(none, 0.0), SM_UNTYPED);
  none->nnz = 0;
  none->state = SM_STATE_OPEN;
  SmMatrix* other = square(kGeneralRows, 3);
  other->kind = 5;
  EXPECT_EQ(close(other, 0.0), SM_OK) << "closed already";
  other->state = SM_STATE_OPEN;
  EXPECT_EQ(close(other, 0.0), SM_UNAVAILABLE);
  EXPECT_EQ(other->state, SM_STATE_OPEN);
  other->kind = SM_KIND_GENERAL;
}

TEST_P(Closing, a_count_of_entries_beyond_any_array_answers_105) {
  SmMatrix* m = square(kSymmetricSparse, 3);
  m->nnz = kHuge;  // nobody can wait for so many
  EXPECT_EQ(close(m, kNan), SM_TOO_LARGE);
  EXPECT_EQ(m->state, SM_STATE_OPEN);
  m->nnz = 3;
  EXPECT_EQ(set(m, 0, 1, 2.0), SM_OK);
  EXPECT_EQ(close(m, kNan), SM_OK);
  EXPECT_EQ(compressed(m).size(), 4U);
}

TEST_P(Closing, an_empty_matrix_is_simply_closed) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = typed(shape);
    host().fail_request(0, true);
    EXPECT_EQ(close(m, 1.0), SM_OK);
    EXPECT_EQ(host().stop_failing(), 0);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(m->nnz, 0);
  }
  SmMatrix* emptied = make(kGeneralSparse, 3, 3);
  emptied->state = SM_STATE_OPEN;
  EXPECT_EQ(close(emptied, 1.0), SM_OK);
  EXPECT_EQ(emptied->state, SM_STATE_CLOSED);
}

TEST_P(Closing, a_matrix_past_state_0_drops_nothing) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 3);
    ASSERT_EQ(set(m, 1, 1, 0.5), SM_OK);
    if (m->state == SM_STATE_OPEN) {
      ASSERT_EQ(close(m, 0.0), SM_OK);
    }
    const std::int64_t nnz = m->nnz;
    for (const double tolerance : {1e9, kInfinity, -1.0, kNan}) EXPECT_EQ(close(m, tolerance), SM_OK);
    EXPECT_EQ(m->nnz, nnz);
    EXPECT_EQ(at(m, 1, 1), 0.5);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
  }
  SmMatrix* factored = definite(kSymmetricSparse);
  ASSERT_EQ(fn().qxsmfact(factored, 0), SM_OK);
  EXPECT_EQ(close(factored, 1e9), SM_OK);
  EXPECT_EQ(factored->state, SM_STATE_FACTORED);
  EXPECT_EQ(factored->nnz, 4);
}

TEST_P(Closing, a_matrix_without_entries_closes_to_a_zero_diagonal) {
  for (const double tolerance : {0.0, 1.0, -1.0, kNan}) {
    for (const std::int64_t n : {1, 2, 33}) {
      SmMatrix* m = square(kSymmetricSparse, n);
      ASSERT_EQ(close(m, tolerance), SM_OK);
      EXPECT_EQ(m->nnz, n);
      for (std::int64_t i = 0; i <= n; ++i) EXPECT_EQ(m->row_start[i], i);
      for (const auto& [place, value] : compressed(m)) {
        EXPECT_EQ(place.first, place.second);
        EXPECT_EQ(bits(value), 0U);
      }
    }
  }
}

TEST_P(Closing, a_small_diagonal_stays_as_zero) {
  SmMatrix* m = square(kSymmetricSparse, 4);
  ASSERT_EQ(set(m, 0, 0, 0.25), SM_OK);
  ASSERT_EQ(set(m, 1, 1, -0.25), SM_OK);
  ASSERT_EQ(set(m, 2, 2, 0.75), SM_OK);
  ASSERT_EQ(set(m, 3, 3, kNan), SM_OK);
  ASSERT_EQ(set(m, 0, 2, 0.25), SM_OK);
  ASSERT_EQ(set(m, 0, 3, 1.0), SM_OK);
  ASSERT_EQ(close(m, 0.5), SM_OK);
  EXPECT_EQ(m->nnz, 5);
  EXPECT_EQ(bits(at(m, 0, 0)), 0U);
  EXPECT_EQ(bits(at(m, 1, 1)), 0U);
  EXPECT_EQ(at(m, 2, 2), 0.75);
  EXPECT_TRUE(std::isnan(at(m, 3, 3)));
  EXPECT_EQ(at(m, 0, 2), 0.0);
  EXPECT_EQ(at(m, 0, 3), 1.0);
}

TEST_P(Closing, the_trees_of_a_symmetric_matrix_go_back_at_once) {
  SmMatrix* m = square(kSymmetricSparse, 30);
  const std::int64_t pools = host().live_pools();
  const std::int64_t blocks = host().live_blocks();
  for (std::int64_t k = 0; k < 30; ++k) {
    for (std::int64_t j = k; j < 30; ++j) ASSERT_EQ(set(m, k, j, 1.0), SM_OK);
  }
  ASSERT_EQ(close(m, 0.0), SM_OK);
  EXPECT_EQ(m->assembly_pool, nullptr);
  EXPECT_EQ(m->sym_roots, nullptr);
  EXPECT_EQ(m->spare_node, nullptr);
  EXPECT_EQ(m->next_node, nullptr);
  EXPECT_EQ(host().live_pools(), pools - 1);
  EXPECT_EQ(host().live_blocks(), blocks - 2 + 3) << "slab and roots for three arrays";
  EXPECT_EQ(m->nnz, 465);
  EXPECT_EQ(compressed(m).size(), 465U);
}

TEST_P(Closing, dropped_nodes_leave_whole_trees) {
  SmMatrix* m = make(kGeneralSparse, 4, 64);
  Nonzeros expected;
  for (std::int64_t k = 0; k < 64; ++k) {
    const std::int64_t c = k * 37 % 64;
    const double value = c % 3 == 0 ? 0.125 : static_cast<double>(c);
    ASSERT_EQ(set(m, 2, c, value), SM_OK);
    if (std::fabs(value) > 0.5) expected[{2, c}] = value;
    ASSERT_EQ(set(m, 3, c, 0.5), SM_OK);
  }
  m->state = SM_STATE_OPEN;
  ASSERT_EQ(close(m, 0.5), SM_OK);
  EXPECT_EQ(walk(m, m->row_roots), expected);
  EXPECT_EQ(set(m, 3, 7, 2.0), SM_OK) << "a row that lost everything takes entries again";
  EXPECT_EQ(at(m, 3, 7), 2.0);
}

INSTANTIATE_BOTH_HOSTS(Closing);

}  // namespace
}  // namespace sm::test
