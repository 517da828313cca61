// The trace of a product with an inverse: qxsmtraceinvAB.
#include <gtest/gtest.h>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

// Sum over j from `start` on of element j of the inverse times row j of b as it is read from `start` on. What a row is
// short of is 0, and what it has too much meets nothing.
double expected(const Dense& inverse_a, const Filled& b, std::int64_t start) {
  const std::int64_t n = inverse_a.rows();
  long double sum = 0.0L;
  for (std::int64_t j = start; j < n; ++j) {
    const std::vector<double> row = row_from(b.shape, b.dense, j, start);
    for (std::int64_t k = 0; k < n && k < b.dense.cols(); ++k) sum += inverse_a(j, k) * row[at(k)];
  }
  return static_cast<double>(sum);
}

class InverseTrace : public ModuleTest {
 protected:
  double trace_of(SmMatrix* a, SmMatrix* b, std::int64_t start) {
    Output out(1);
    EXPECT_EQ(qxsmtraceinvAB(a, b, start, out.data()), SM_OK);
    return out.values()[0];
  }
  void expect_every_start(SmMatrix* a, const Dense& inverse_a, const Filled& b) {
    for (std::int64_t start = 0; start <= inverse_a.rows() + 1; ++start) {
      EXPECT_NEAR(trace_of(a, b.matrix, start), expected(inverse_a, b, start), 1e-10)
          << name_of({a->kind, a->format}) << ", " << name_of(b.shape) << ' ' << b.dense.rows() << " x "
          << b.dense.cols() << " from " << start;
    }
  }
};

TEST_P(InverseTrace, every_pair_of_shapes_is_summed_from_every_start) {
  Random random(1);
  for (const Shape sa : kInvertible)
    for (const Shape sb : kShapes)
      for (const std::int64_t n : {1, 2, 8}) {
        const Filled a = filled_definite(session(), sa, n, random);
        const Filled b = filled(session(), sb, n, n, random);
        expect_every_start(a.matrix, inverse(a.dense), b);
        EXPECT_EQ(a.matrix->state, SM_STATE_FACTORED);
        EXPECT_EQ(entries(b.matrix), b.stored);
        EXPECT_EQ(b.matrix->state, SM_STATE_CLOSED);
      }
}

TEST_P(InverseTrace, the_whole_sum_with_a_symmetric_matrix_is_the_trace_of_the_product) {
  Random random(2);
  for (const Shape sa : kInvertible)
    for (const Shape sb : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalRows}) {
      const Filled a = filled_definite(session(), sa, 12, random);
      const Filled b = filled(session(), sb, 12, 12, random);
      const Dense p = product(inverse(a.dense), b.dense);
      long double sum = 0.0L;
      for (std::int64_t i = 0; i < 12; ++i) sum += p(i, i);
      EXPECT_NEAR(trace_of(a.matrix, b.matrix, 0), static_cast<double>(sum), 1e-10)
          << name_of(sa) << ", " << name_of(sb);
    }
}

TEST_P(InverseTrace, a_diagonal_matrix_with_the_identity_sums_its_reciprocals) {
  for (const Shape sa : {kDiagonalColumns, kDiagonalRows})
    for (const Shape sb : kShapes) {
      const Filled a = filled_with(session(), sa, 3, 3, {{{0, 0}, 2.0}, {{1, 1}, 4.0}, {{2, 2}, 8.0}});
      const Filled one = filled_with(session(), sb, 3, 3, {{{0, 0}, 1.0}, {{1, 1}, 1.0}, {{2, 2}, 1.0}});
      EXPECT_NEAR(trace_of(a.matrix, one.matrix, 0), 0.875, 1e-15) << name_of(sa) << ", " << name_of(sb);
    }
}

TEST_P(InverseTrace, rows_that_come_moved_meet_the_inverse_where_they_are) {
  // The inverse is diag(1/2, 1/4, 1/8): row j adds its component j, which is column j + start of a moved row.
  Nonzeros elements;
  for (std::int64_t i = 0; i < 3; ++i)
    for (std::int64_t j = 0; j < 3; ++j) elements[{i, j}] = static_cast<double>(10 * i + j);
  const Filled a = filled_with(session(), kDiagonalRows, 3, 3, {{{0, 0}, 2.0}, {{1, 1}, 4.0}, {{2, 2}, 8.0}});
  SmMatrix* by_rows = filled_with(session(), kGeneralRows, 3, 3, elements).matrix;
  EXPECT_EQ(trace_of(a.matrix, by_rows, 0), 0.0 / 2.0 + 11.0 / 4.0 + 22.0 / 8.0);
  EXPECT_EQ(trace_of(a.matrix, by_rows, 1), 12.0 / 4.0) << "row 1 is {11, 12, 0} then, row 2 {21, 22, 0}";
  EXPECT_EQ(trace_of(a.matrix, by_rows, 2), 0.0);
  SmMatrix* by_columns = filled_with(session(), kGeneralColumns, 3, 3, elements).matrix;
  EXPECT_EQ(trace_of(a.matrix, by_columns, 1), 11.0 / 4.0 + 22.0 / 8.0) << "other rows stay where they are";
}

TEST_P(InverseTrace, rows_shorter_or_longer_than_the_order_are_filled_up_or_cut) {
  Random random(3);
  for (const Shape sa : kInvertible)
    for (const Shape sb : {kGeneralSparse, kGeneralColumns, kGeneralRows})
      for (const std::int64_t cols : {1, 3, 5, 7, 40}) {
        const Filled a = filled_definite(session(), sa, 5, random);
        expect_every_start(a.matrix, inverse(a.dense), filled(session(), sb, 5, cols, random));
      }
}

TEST_P(InverseTrace, a_start_behind_the_last_row_gives_0_and_a_factored_matrix) {
  Random random(4);
  for (const Shape sa : kInvertible) {
    const Filled a = filled_definite(session(), sa, 4, random);
    const Filled b = filled(session(), kSymmetricRows, 4, 4, random);
    for (const std::int64_t start : {std::int64_t{4}, std::int64_t{5}, kHuge}) {
      EXPECT_EQ(bits(trace_of(a.matrix, b.matrix, start)), 0U) << name_of(sa);
    }
    EXPECT_EQ(a.matrix->state, SM_STATE_FACTORED);
  }
}

TEST_P(InverseTrace, the_first_matrix_is_taken_from_the_state_it_is_in) {
  Random random(5);
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    const Filled a = filled_definite(session(), kSymmetricSparse, 10, random);
    ASSERT_EQ(bring_to(a.matrix, state), SM_OK);
    expect_every_start(a.matrix, inverse(a.dense), filled(session(), kGeneralColumns, 10, 10, random));
  }
  for (const Shape sa : kSquareFactored)
    for (const std::int32_t in_place : {0, 1}) {
      const Filled a = filled_definite(session(), sa, 6, random);
      ASSERT_EQ(fn().qxsmfact(a.matrix, in_place), SM_OK);
      expect_every_start(a.matrix, inverse(a.dense), filled(session(), kGeneralSparse, 6, 6, random));
    }
}

TEST_P(InverseTrace, the_second_matrix_is_read_in_every_state_that_has_rows) {
  Random random(6);
  for (const Shape sa : kInvertible) {
    const Filled a = filled_definite(session(), sa, 7, random);
    const Filled ordered = filled_definite(session(), kSymmetricSparse, 7, random);
    ASSERT_EQ(bring_to(ordered.matrix, SM_STATE_ORDERED), SM_OK);
    expect_every_start(a.matrix, inverse(a.dense), ordered);
    for (const Shape sb : kSquareFactored) {
      const Filled b = filled_definite(session(), sb, 7, random);
      ASSERT_EQ(fn().qxsmfact(b.matrix, 0), SM_OK);
      expect_every_start(a.matrix, inverse(a.dense), b);
      ASSERT_EQ(fn().qxsminv(b.matrix, 0, kNan), SM_OK);
      expect_every_start(a.matrix, inverse(a.dense), b);
    }
  }
}

TEST_P(InverseTrace, a_packed_matrix_may_be_both) {
  Random random(7);
  for (const Shape shape : kSquareFactored) {
    const Filled a = filled_definite(session(), shape, 6, random);
    EXPECT_NEAR(trace_of(a.matrix, a.matrix, 0), 6.0, 1e-10) << name_of(shape);
    expect_every_start(a.matrix, inverse(a.dense), a);
  }
}

TEST_P(InverseTrace, a_generalized_inverse_times_its_matrix_has_the_rank_as_its_trace) {
  for (std::uint64_t seed = 1; seed <= 8; ++seed) {
    Random random(seed);
    const Semidefinite s = cross_product(random, 6, 3, 2);
    for (const std::int32_t format : {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS}) {
      SmMatrix* a = new_packed(session(), s.problem, format);
      SmMatrix* again = new_packed(session(), s.problem, format);
      EXPECT_NEAR(trace_of(a, again, 0), static_cast<double>(s.rank), 1e-8);
    }
    SmMatrix* sparse = new_sparse(session(), s.problem);
    SmMatrix* again = new_sparse(session(), s.problem);
    EXPECT_NEAR(trace_of(sparse, again, 0), static_cast<double>(s.rank), 1e-8);
    EXPECT_EQ(sparse->rank, s.rank);
  }
  SmMatrix* a = new_diagonal(session(), {4.0, 0.0, 2.0});
  EXPECT_NEAR(trace_of(a, new_diagonal(session(), {4.0, 0.0, 2.0}), 0), 2.0, 1e-12);
}

TEST_P(InverseTrace, on_and_off_the_pattern_of_the_factor_it_is_the_same_sum) {
  for (std::uint64_t seed = 0; seed < 60; ++seed) {
    Random random(seed);
    const std::int64_t n = 2 + random.below(30);
    const Problem pa = positive_definite(random_graph(random, n, 8), random);
    SmMatrix* a = new_sparse(session(), pa);
    // A part of the entries of A, and in half of the cases one that may be anywhere.
    Problem pb{"part", n, {}};
    const std::int64_t stray = random.chance(50) ? random.below(n) : n;
    for (const Entry& e : pa.upper) {
      if (e.row == e.col || random.chance(60)) pb.upper.push_back({e.row, e.col, random.dyadic()});
      if (e.row == stray && e.col == stray && stray + 1 < n) pb.upper.push_back({stray, n - 1, 3.0});
    }
    for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_REORDERED; ++state) {
      SmMatrix* b = new_sparse(session(), pb);
      ASSERT_EQ(bring_to(b, state), SM_OK);
      Output out(1);
      const SmStatus status = qxsmtraceinvAB(a, b, 0, out.data());
      ASSERT_EQ(status, state <= SM_STATE_ORDERED ? SM_OK : SM_REORDERED) << "seed " << seed;
      if (status != SM_OK) continue;
      const Dense p = product(inverse(pa.dense()), dense_of_rows(b));
      long double sum = 0.0L;
      for (std::int64_t i = 0; i < n; ++i) sum += p(i, i);
      EXPECT_NEAR(out.values()[0], static_cast<double>(sum), 1e-10) << "seed " << seed << " state " << state;
    }
  }
}

TEST_P(InverseTrace, a_second_matrix_without_entries_gives_0) {
  Random random(8);
  SmMatrix* trees = new_sized(session(), kGeneralSparse, 4, 4);
  SmMatrix* narrow = new_sized(session(), kGeneralSparse, 4, 1);
  for (const Shape sa : kInvertible) {
    const Filled a = filled_definite(session(), sa, 4, random);
    EXPECT_EQ(trace_of(a.matrix, trees, 0), 0.0) << name_of(sa);
    EXPECT_EQ(trace_of(a.matrix, narrow, 0), 0.0) << name_of(sa);
  }
}

INSTANTIATE_BOTH_HOSTS(InverseTrace);

}  // namespace
}  // namespace sm::test
