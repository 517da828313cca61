// Sizing sparse matrices: roots, slabs, the zero diagonal, and what goes back.
#include <gtest/gtest.h>

#include <functional>

#include "store/store_test.hpp"

namespace sm::test {
namespace {

class SizingSparse : public StoreTest {
 protected:
  static std::int64_t nodes_of_a_slab(Shape shape, std::int64_t row_capacity) {
    if (shape.kind == SM_KIND_SYMMETRIC && row_capacity >= 50000) return 1000000;
    return row_capacity * 20;
  }

  static void expect_slabs(const SmMatrix* m, Shape shape, std::int64_t entered) {
    EXPECT_EQ(m->node_size, 32);
    EXPECT_EQ(m->slab_nodes, nodes_of_a_slab(shape, m->row_capacity));
    EXPECT_EQ(m->slab_bytes, 32 * m->slab_nodes);
    EXPECT_EQ(m->slab_used, 32 * (entered % m->slab_nodes + 1));
    ASSERT_NE(m->spare_node, nullptr);
    EXPECT_EQ(m->next_node, m->spare_node + 1);
  }

  static void expect_no_factor_fields(const SmMatrix* m) {
    EXPECT_EQ(m->row_start, nullptr);
    EXPECT_EQ(m->col_index, nullptr);
    EXPECT_EQ(m->work_capacity, 0);
    expect_no_factor(m);
    EXPECT_EQ(m->factor_block, 1);
  }

  SmMatrix* factored(std::int64_t n) {
    SmMatrix* m = square(kSymmetricSparse, n);
    for (std::int64_t i = 0; i < n; ++i) EXPECT_EQ(set(m, i, i, 4.0), SM_OK);
    for (std::int64_t i = 1; i < n; ++i) EXPECT_EQ(set(m, i - 1, i, 1.0), SM_OK);
    EXPECT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
    EXPECT_EQ(fn().qxsmfact(m, 0), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_FACTORED);
    return m;
  }
};

TEST_P(SizingSparse, a_general_matrix_begins_closed_and_empty) {
  for (const auto& [rows, cols] :
       {std::pair<std::int64_t, std::int64_t>{1, 1}, {5, 9}, {20, 3}, {21, 40}, {60000, 2}}) {
    SCOPED_TRACE(rows);
    SmMatrix* m = make(kGeneralSparse, rows, cols);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(m->rows, rows);
    EXPECT_EQ(m->cols, cols);
    EXPECT_EQ(m->nnz, 0);
    EXPECT_EQ(m->value_count, static_cast<double>(rows * cols));
    EXPECT_EQ(m->row_capacity, rows < 20 ? 20 : rows);
    EXPECT_EQ(m->assembly_pool, nullptr);
    EXPECT_EQ(m->rank, 0);
    EXPECT_TRUE(is_missing(m->log_det));
    expect_slabs(m, kGeneralSparse, 0);
    ASSERT_NE(m->row_roots, nullptr);
    for (std::int64_t k = 0; k < m->row_capacity; ++k) ASSERT_EQ(m->row_roots[k], 0U) << k;
  }
}

TEST_P(SizingSparse, a_symmetric_matrix_begins_open_with_a_zero_diagonal) {
  for (const std::int64_t n : {1, 2, 19, 20, 21, 400, 401}) {
    SCOPED_TRACE(n);
    SmMatrix* m = square(kSymmetricSparse, n);
    EXPECT_EQ(m->state, SM_STATE_OPEN);
    EXPECT_EQ(m->rows, n);
    EXPECT_EQ(m->cols, n);
    EXPECT_EQ(m->nnz, n);
    EXPECT_EQ(m->value_count, static_cast<double>(n * (n + 1) / 2));
    EXPECT_EQ(m->row_capacity, n < 20 ? 20 : n);
    EXPECT_NE(m->assembly_pool, nullptr);
    EXPECT_NE(m->assembly_pool, m->pool);
    EXPECT_EQ(m->rank, 0);
    expect_no_factor_fields(m);
    expect_slabs(m, kSymmetricSparse, n);
    ASSERT_NE(m->sym_roots, nullptr);
    const Nonzeros seeded = walk(m, m->sym_roots);
    EXPECT_EQ(static_cast<std::int64_t>(seeded.size()), n);
    for (std::int64_t i = 0; i < n; ++i) EXPECT_EQ(seeded.at({i, i}), 0.0);
    for (std::int64_t k = n; k < m->row_capacity; ++k) EXPECT_EQ(m->sym_roots[k], 0U);
  }
}

TEST_P(SizingSparse, slabs_of_large_symmetric_matrices_have_a_million_nodes) {
  for (const std::int64_t n : {49999, 50000, 50001}) {
    SCOPED_TRACE(n);
    SmMatrix* m = square(kSymmetricSparse, n);
    EXPECT_EQ(m->slab_nodes, n < 50000 ? n * 20 : 1000000);
    expect_slabs(m, kSymmetricSparse, n);
    EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
  }
}

TEST_P(SizingSparse, a_general_matrix_keeps_nothing_of_its_former_size) {
  SmMatrix* m = make(kGeneralSparse, 30, 30);
  const std::int64_t pools = host().live_pools();
  const std::int64_t blocks = host().live_blocks();
  for (std::int64_t k = 0; k < 1500; ++k) ASSERT_EQ(set(m, k / 40 % 30, k % 40, 1.0), SM_OK);
  ASSERT_EQ(fn().qxsmresize(m, 30, 30), SM_OK);
  EXPECT_EQ(m->nnz, 0);
  EXPECT_EQ(host().live_pools(), pools);
  EXPECT_EQ(host().live_blocks(), blocks);
  EXPECT_TRUE(walk(m, m->row_roots).empty());
  EXPECT_EQ(set(m, 29, 0, 2.0), SM_OK);
  EXPECT_EQ(at(m, 29, 0), 2.0);
  EXPECT_EQ(at(m, 0, 0), 0.0);
}

TEST_P(SizingSparse, destroyed_pools_are_forgotten) {
  SmMatrix* g = make(kGeneralSparse, 30, 30);
  SmMatrix* s = square(kSymmetricSparse, 30);
  const std::int64_t pools = host().live_pools();
  ASSERT_EQ(fn().qxsmresize(g, 0, 0), SM_OK);
  EXPECT_EQ(g->pool, nullptr);
  EXPECT_EQ(g->spare_node, nullptr);
  EXPECT_EQ(g->next_node, nullptr);
  EXPECT_EQ(g->row_roots, nullptr);
  EXPECT_EQ(g->row_capacity, 0);
  EXPECT_EQ(g->state, SM_STATE_CLOSED);
  ASSERT_EQ(fn().qxsmresize(s, 0, 0), SM_OK);
  EXPECT_EQ(s->assembly_pool, nullptr);
  EXPECT_EQ(s->spare_node, nullptr);
  EXPECT_EQ(s->next_node, nullptr);
  EXPECT_EQ(s->sym_roots, nullptr);
  EXPECT_EQ(s->row_capacity, 0);
  EXPECT_EQ(s->state, SM_STATE_OPEN);
  EXPECT_EQ(host().live_pools(), pools - 2);
  EXPECT_EQ(fn().qxsmresize(g, 3, 3), SM_OK);
  EXPECT_EQ(fn().qxsmresize(s, 3, 3), SM_OK);
  EXPECT_EQ(set(g, 2, 2, 1.0), SM_OK);
  EXPECT_EQ(set(s, 2, 2, 1.0), SM_OK);
}

TEST_P(SizingSparse, a_factored_matrix_is_open_again_and_its_factor_given_back) {
  SmMatrix* m = square(kSymmetricSparse, 25);
  const std::int64_t blocks = host().live_blocks();
  const std::int64_t pools = host().live_pools();
  EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
  for (const std::int64_t n : {25, 12, 40}) {
    SCOPED_TRACE(n);
    SmMatrix* f = factored(25);
    ASSERT_EQ(fn().qxsmresize(f, n, n), SM_OK);
    EXPECT_EQ(f->state, SM_STATE_OPEN);
    EXPECT_EQ(f->nnz, n);
    EXPECT_EQ(f->definite, -1);
    expect_voided(f);
    expect_no_factor_fields(f);
    EXPECT_EQ(host().live_blocks(), blocks);
    EXPECT_EQ(host().live_pools(), pools);
    EXPECT_EQ(set(f, 0, n - 1, 1.0), SM_OK);
    EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &f), SM_OK);
  }
}

TEST_P(SizingSparse, every_state_on_the_way_to_a_factor_can_be_sized_again) {
  for (int steps = 0; steps <= 4; ++steps) {
    SCOPED_TRACE(steps);
    SmMatrix* m = square(kSymmetricSparse, 6);
    const std::int64_t blocks = host().live_blocks();
    for (std::int64_t i = 0; i < 6; ++i) ASSERT_EQ(set(m, i, i, 4.0), SM_OK);
    ASSERT_EQ(set(m, 0, 5, 1.0), SM_OK);
    ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
    if (steps > 0) {
      ASSERT_EQ(qxsmmd(m), SM_OK);
    }
    if (steps > 1) {
      ASSERT_EQ(qxsmreorder(m), SM_OK);
    }
    if (steps > 2) {
      ASSERT_EQ(qxsmsymbfact(m), SM_OK);
    }
    if (steps > 3) {
      ASSERT_EQ(qxsmnumfact(m), SM_OK);
    }
    EXPECT_EQ(m->state, SM_STATE_CLOSED + steps);
    EXPECT_EQ(fn().qxsmresize(m, 6, 6), SM_OK);
    expect_no_factor_fields(m);
    EXPECT_EQ(m->state, SM_STATE_OPEN);
    EXPECT_EQ(host().live_blocks(), blocks);
    EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
  }
}

TEST_P(SizingSparse, an_open_matrix_made_unsquare_has_no_rows_to_read) {
  SmMatrix* m = square(kSymmetricSparse, 4);
  ASSERT_EQ(set(m, 0, 1, 2.0), SM_OK);
  ASSERT_EQ(fn().qxsmresize(m, 4, 5), SM_NOT_SQUARE);
  EXPECT_EQ(m->state, SM_STATE_CLOSED);
  EXPECT_EQ(refused_at(m, 0, 0), SM_NOT_CLOSED);
  EXPECT_EQ(refused_at(m, 0, 1), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmsetee(m, 1.0), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmfact(m, 0), SM_NOT_CLOSED);
  double out = 0.0;
  EXPECT_EQ(fn().qxsmlogdet(m, &out), SM_NOT_CLOSED);
  EXPECT_TRUE(is_missing(out));
  EXPECT_EQ(set(m, 0, 1, 3.0), SM_ALREADY_CLOSED);
  EXPECT_EQ(fn().qxsmresize(m, 4, 4), SM_OK);
  EXPECT_EQ(set(m, 0, 1, 3.0), SM_OK);
  EXPECT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(at(m, 0, 1), 3.0);
}

TEST_P(SizingSparse, a_closed_matrix_made_unsquare_is_still_read) {
  SmMatrix* m = square(kSymmetricSparse, 4);
  ASSERT_EQ(set(m, 0, 1, 2.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  ASSERT_EQ(fn().qxsmresize(m, 5, 4), SM_NOT_SQUARE);
  EXPECT_EQ(at(m, 0, 1), 2.0);
  EXPECT_EQ(compressed(m).size(), 5U);
}

TEST_P(SizingSparse, an_ordered_or_factored_matrix_made_unsquare_is_read_in_the_callers_order) {
  const std::function<SmStatus(SmMatrix*)> steps[] = {qxsmmd, qxsmreorder, qxsmsymbfact, qxsmnumfact};
  // A hub that minimum degree puts behind its leaves, so that the rows do move.
  const Nonzeros entries{{{0, 0}, 9.0}, {{0, 1}, 1.0}, {{0, 2}, 2.0}, {{0, 4}, 1.5}, {{1, 1}, 8.0},
                         {{2, 2}, 7.0}, {{2, 3}, 0.5}, {{3, 3}, 6.0}, {{4, 4}, 5.0}};
  double expected = 0.0;
  for (int done = 0; done <= 4; ++done) {
    SCOPED_TRACE(done);
    SmMatrix* m = square(kSymmetricSparse, 5);
    for (const auto& [place, value] : entries) ASSERT_EQ(set(m, place.first, place.second, value), SM_OK);
    ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
    for (int k = 0; k < done; ++k) ASSERT_EQ(steps[k](m), SM_OK);
    ASSERT_EQ(fn().qxsmresize(m, 6, 5), SM_NOT_SQUARE);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(compressed(m), entries);
    EXPECT_EQ(at(m, 0, 4), 1.5);
    double log_det = 0.0;
    EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
    if (done == 0) expected = log_det;
    EXPECT_NEAR(log_det, expected, 1e-13);
  }
}

TEST_P(SizingSparse, more_roots_or_nodes_than_can_be_counted_answer_105) {
  for (const std::int64_t n : {SM_MAX_ELEMENTS + 1, std::int64_t{1} << 61, kHuge}) {
    SmMatrix* g = typed(kGeneralSparse);
    EXPECT_EQ(fn().qxsmresize(g, n, 1), SM_TOO_LARGE) << n;
    EXPECT_EQ(g->nnz, 0);
    EXPECT_EQ(g->rows, n);
    EXPECT_EQ(set(g, 0, 0, 1.0), SM_NO_MEMORY);
    EXPECT_EQ(fn().qxsmresize(g, 3, 1), SM_OK);
    EXPECT_EQ(set(g, 2, 0, 1.0), SM_OK);
    SmMatrix* s = typed(kSymmetricSparse);
    EXPECT_EQ(fn().qxsmresize(s, n, n), SM_TOO_LARGE) << n;
    EXPECT_EQ(s->nnz, 0);
    EXPECT_EQ(s->rows, n);
    EXPECT_EQ(set(s, 0, n - 1, 1.0), SM_NO_MEMORY);
    EXPECT_EQ(fn().qxsmresize(s, 3, 3), SM_OK);
    EXPECT_EQ(set(s, 0, 2, 1.0), SM_OK);
  }
  SmMatrix* g = typed(kGeneralSparse);
  EXPECT_EQ(fn().qxsmresize(g, SM_MAX_ELEMENTS / 20 + 1, 1), SM_TOO_LARGE) << "twenty nodes a root";
}

TEST_P(SizingSparse, a_size_beyond_any_memory_answers_101_and_refuses_entries) {
  for (const Shape shape : {kGeneralSparse, kSymmetricSparse}) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = typed(shape);
    const std::int64_t n = std::int64_t{1} << (shape.kind == SM_KIND_GENERAL ? 46 : 50);
    EXPECT_EQ(fn().qxsmresize(m, n, n), SM_NO_MEMORY);
    EXPECT_EQ(m->rows, n);
    EXPECT_EQ(m->nnz, 0);
    EXPECT_EQ(set(m, 0, 0, 1.0), SM_NO_MEMORY);
    EXPECT_EQ(set(m, n - 1, n - 1, 1.0), SM_NO_MEMORY);
    EXPECT_EQ(add(m, 0, 1, 1.0), SM_NO_MEMORY);
    EXPECT_EQ(m->nnz, 0);
    EXPECT_EQ(fn().qxsmresize(m, 2, 2), SM_OK);
    EXPECT_EQ(set(m, 0, 1, 1.0), SM_OK);
  }
}

TEST_P(SizingSparse, columns_of_a_general_matrix_cost_nothing) {
  const std::int64_t cols = std::int64_t{1} << 60;
  SmMatrix* m = make(kGeneralSparse, 5, cols);
  EXPECT_EQ(m->value_count, 5.0 * static_cast<double>(cols));
  EXPECT_EQ(set(m, 4, cols - 1, 2.5), SM_OK);
  EXPECT_EQ(at(m, 4, cols - 1), 2.5);
  EXPECT_EQ(m->cols, cols);
  EXPECT_EQ(qxsmremove(m, 4, cols - 1), SM_OK);
  EXPECT_EQ(m->nnz, 0);
}

INSTANTIATE_BOTH_HOSTS(SizingSparse);

}  // namespace
}  // namespace sm::test
