// Copies of symmetric sparse matrices with their ordering and factor: qxsmclone.
#include <gtest/gtest.h>

#include <cmath>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

// Where a factor pointer lies in its own workspace; -1: nowhere.
std::int64_t offset(const SmMatrix* m, const void* p) {
  return p ? (static_cast<const char*>(p) - reinterpret_cast<const char*>(m->work)) : -1;
}

void expect_same_results(const SmMatrix* source, const SmMatrix* target) {
  EXPECT_EQ(target->state, source->state);
  EXPECT_EQ(target->rows, source->rows);
  EXPECT_EQ(target->cols, source->cols);
  EXPECT_EQ(target->nnz, source->nnz);
  EXPECT_EQ(target->value_count, source->value_count);
  EXPECT_EQ(target->rank, source->rank);
  EXPECT_EQ(bits(target->log_det), bits(source->log_det));
  EXPECT_EQ(target->definite, source->definite);
  EXPECT_EQ(target->solver_word, source->solver_word);
}

// The same rows, ordering and factor, in other arrays.
void expect_same_arrays(const SmMatrix* source, const SmMatrix* target) {
  EXPECT_EQ(rows_of(target), rows_of(source));
  EXPECT_NE(target->row_start, source->row_start);
  EXPECT_NE(target->col_index, source->col_index);
  EXPECT_NE(target->nz_values, source->nz_values);
  EXPECT_EQ(target->factor_block, source->factor_block);
  EXPECT_EQ(target->work_capacity, source->work_capacity);
  ASSERT_EQ(target->perm != nullptr, source->perm != nullptr);
  ASSERT_EQ(target->inv_perm != nullptr, source->inv_perm != nullptr);
  if (source->perm) {
    EXPECT_NE(target->perm, source->perm);
    EXPECT_NE(target->inv_perm, source->inv_perm);
    EXPECT_EQ(words(target->perm, target->rows), words(source->perm, source->rows));
    EXPECT_EQ(words(target->inv_perm, target->rows), words(source->inv_perm, source->rows));
  }
  ASSERT_EQ(target->work != nullptr, source->work != nullptr);
  if (!source->work) return;
  EXPECT_NE(target->work, source->work);
  EXPECT_EQ(offset(target, target->factor_scratch), offset(source, source->factor_scratch));
  EXPECT_EQ(offset(target, target->factor_diag), offset(source, source->factor_diag));
  EXPECT_EQ(offset(target, target->factor_values), offset(source, source->factor_values));
  EXPECT_EQ(offset(target, target->factor_iju), offset(source, source->factor_iju));
  EXPECT_EQ(offset(target, target->factor_iu), offset(source, source->factor_iu));
  EXPECT_EQ(offset(target, target->factor_ju), offset(source, source->factor_ju));
  if (source->state < SM_STATE_SYMBOLIC) return;
  EXPECT_EQ(stored_structure(target), stored_structure(source));
  if (source->state < SM_STATE_FACTORED) return;
  EXPECT_EQ(stored_reciprocals(target), stored_reciprocals(source));
  EXPECT_EQ(words(target->work, target->work_capacity), words(source->work, source->work_capacity));
}

class Clone : public ModuleTest {
 protected:
  SmMatrix* target(Shape shape = kSymmetricSparse) {
    SmMatrix* m = nullptr;
    EXPECT_EQ(fn().qxsmnew(instance(), &m, shape.kind, shape.format), SM_OK);
    return m;
  }
  Problem problem(std::int64_t n, std::uint64_t seed) {
    Random random(seed);
    return positive_definite(random_graph(random, n, 30), random);
  }
  // A matrix of the problem that is factored now or soon: its log-determinant and its solutions.
  void expect_factors_as(SmMatrix* m, const Dense& dense) {
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    EXPECT_TRUE(near(solved_identity(m), inverse(dense), 1e-9));
    double log_det = 0.0;
    EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
    EXPECT_NEAR(log_det, static_cast<double>(log_determinant(dense)), 1e-9 * static_cast<double>(dense.rows()));
    std::int64_t rank = -1;
    EXPECT_EQ(fn().qxsmrank(m, &rank), SM_OK);
    EXPECT_EQ(rank, dense.rows());
  }
};

TEST_P(Clone, a_copy_in_every_state_has_the_rows_the_ordering_and_the_factor_of_its_source) {
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    for (const std::int64_t n : {1, 2, 9, 40}) {
      SCOPED_TRACE("state " + std::to_string(state) + ", order " + std::to_string(n));
      SmMatrix* source = new_sparse(session(), problem(n, 11));
      ASSERT_EQ(bring_to(source, state), SM_OK);
      source->solver_word = 4711;
      SmMatrix* copy = target();
      ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
      expect_same_results(source, copy);
      EXPECT_EQ(copy->state, state);
      EXPECT_EQ(copy->solver_word, 4711);
      expect_same_arrays(source, copy);
      EXPECT_EQ(copy->assembly_pool, nullptr) << "the trees that sizing made go as in closing";
      EXPECT_EQ(copy->sym_roots, nullptr);
      EXPECT_NE(copy->tree, nullptr) << "the tree manager stays";
      EXPECT_EQ(fn().qxsmassign(copy, 0, 0, 0, 1.0), SM_ALREADY_CLOSED);
    }
  }
}

TEST_P(Clone, a_copy_in_every_state_outlives_its_source) {
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SCOPED_TRACE(state);
    const Problem p = problem(25, 12);
    SmMatrix* source = new_sparse(session(), p);
    ASSERT_EQ(bring_to(source, state), SM_OK);
    SmMatrix* copy = target();
    ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
    ASSERT_EQ(fn().qxsmDestroyMatrix(instance(), &source), SM_OK);
    EXPECT_TRUE(same(dense_of_rows(copy), p.dense()));
    expect_factors_as(copy, p.dense());
  }
}

TEST_P(Clone, a_source_in_every_state_outlives_its_copy) {
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SCOPED_TRACE(state);
    const Problem p = problem(25, 13);
    SmMatrix* source = new_sparse(session(), p);
    ASSERT_EQ(bring_to(source, state), SM_OK);
    const StoredRows before = rows_of(source);
    SmMatrix* copy = target();
    ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
    ASSERT_EQ(fn().qxsmsetee(copy, 1.0), SM_OK);
    EXPECT_EQ(rows_of(source), before);
    ASSERT_EQ(fn().qxsmDestroyMatrix(instance(), &copy), SM_OK);
    EXPECT_EQ(rows_of(source), before);
    expect_factors_as(source, p.dense());
  }
}

TEST_P(Clone, a_factored_copy_solves_to_the_bit_as_its_source) {
  const Problem p = problem(40, 14);
  SmMatrix* source = new_sparse(session(), p);
  double log_det = 0.0;
  ASSERT_EQ(fn().qxsmlogdet(source, &log_det), SM_OK);
  SmMatrix* copy = target();
  ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
  Random random(15);
  const std::vector<double> b = random.vector(p.n * 3);
  std::vector<double> of_source(b.size());
  std::vector<double> of_copy(b.size());
  ASSERT_EQ(fn().qxsmsubst(source, b.data(), of_source.data(), 3), SM_OK);
  ASSERT_EQ(fn().qxsmsubst(copy, b.data(), of_copy.data(), 3), SM_OK);
  EXPECT_EQ(bits(of_copy), bits(of_source));
  double copied = 0.0;
  EXPECT_EQ(fn().qxsmlogdet(copy, &copied), SM_OK);
  EXPECT_EQ(bits(copied), bits(log_det));
  expect_factors_as(copy, p.dense());
}

TEST_P(Clone, a_copy_of_a_copy_and_of_a_changed_source_follow_their_own_values) {
  const Problem p = problem(12, 16);
  SmMatrix* source = new_sparse(session(), p);
  ASSERT_EQ(fn().qxsmfact(source, 0), SM_OK);
  SmMatrix* first = target();
  SmMatrix* second = target();
  ASSERT_EQ(fn().qxsmclone(source, first, 0), SM_OK);
  ASSERT_EQ(fn().qxsmmults(source, 4.0), SM_OK);
  ASSERT_EQ(fn().qxsmclone(first, second, 0), SM_OK);
  ASSERT_EQ(fn().qxsmDestroyMatrix(instance(), &first), SM_OK);
  expect_factors_as(second, p.dense());
}

TEST_P(Clone, a_matrix_that_could_not_be_factored_is_copied_as_it_stands) {
  SmMatrix* source = new_sparse(session(), problem_of({{1.0, 2.0}, {2.0, 1.0}}));
  ASSERT_EQ(fn().qxsmfact(source, 0), SM_NOT_DEFINITE);
  ASSERT_EQ(source->definite, 0);
  SmMatrix* copy = target();
  ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
  EXPECT_EQ(copy->definite, 0);
  EXPECT_EQ(copy->state, SM_STATE_SYMBOLIC);
  expect_same_arrays(source, copy);
  EXPECT_EQ(fn().qxsmfact(copy, 0), SM_NOT_DEFINITE);
}

TEST_P(Clone, a_factored_matrix_whose_values_changed_is_copied_to_be_factored_again) {
  SmMatrix* source = new_sparse(session(), problem_of({{4.0, 0.0}, {0.0, 9.0}}));
  ASSERT_EQ(fn().qxsmfact(source, 0), SM_OK);
  ASSERT_EQ(fn().qxsmsetee(source, 2.0), SM_OK);
  ASSERT_EQ(source->state, SM_STATE_SYMBOLIC);
  SmMatrix* copy = target();
  ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
  EXPECT_EQ(copy->rank, 0);
  EXPECT_TRUE(is_missing(copy->log_det));
  Dense twice(2, 2);
  twice(0, 0) = twice(1, 1) = 2.0;
  expect_factors_as(copy, twice);
}

TEST_P(Clone, a_copy_replaces_all_that_its_target_held) {
  for (std::int32_t held = SM_STATE_OPEN; held <= SM_STATE_FACTORED; ++held) {
    SCOPED_TRACE(held);
    SmMatrix* copy = new_sparse(session(), problem(30, 17), held != SM_STATE_OPEN);
    ASSERT_EQ(bring_to(copy, held), SM_OK);
    const Problem p = problem(12, 18);
    SmMatrix* source = new_sparse(session(), p);
    ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
    expect_same_results(source, copy);
    expect_same_arrays(source, copy);
    expect_factors_as(copy, p.dense());
  }
}

TEST_P(Clone, copying_again_and_again_takes_no_more_memory) {
  SmMatrix* source = new_sparse(session(), problem(30, 19));
  ASSERT_EQ(fn().qxsmfact(source, 0), SM_OK);
  SmMatrix* copy = target();
  std::int64_t pools = 0;
  std::int64_t blocks = 0;
  for (int k = 0; k < 4; ++k) {
    ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
    if (k > 0) {
      EXPECT_EQ(host().live_pools(), pools);
      EXPECT_EQ(host().live_blocks(), blocks);
    }
    pools = host().live_pools();
    blocks = host().live_blocks();
  }
  EXPECT_EQ(owned_blocks(copy), 6);
}

TEST_P(Clone, a_reassembled_copy_is_open_and_holds_the_rows_of_its_source) {
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SCOPED_TRACE(state);
    Random random(20);
    const Filled a = filled_definite(session(), kSymmetricSparse, 30, random);
    ASSERT_EQ(bring_to(a.matrix, state), SM_OK);
    a.matrix->solver_word = 12;
    SmMatrix* copy = target();
    ASSERT_EQ(fn().qxsmclone(a.matrix, copy, 1), SM_OK);
    EXPECT_EQ(copy->state, SM_STATE_OPEN);
    EXPECT_EQ(copy->solver_word, 12);
    EXPECT_EQ(copy->nnz, a.matrix->nnz) << "counted, not preset";
    expect_voided(copy);
    EXPECT_EQ(entries(copy), a.stored) << "in the caller's order";
    EXPECT_EQ(copy->perm, nullptr);
    EXPECT_EQ(copy->work, nullptr);
    ASSERT_EQ(fn().qxsmassign(copy, 0, 29, 1, 0.25), SM_OK) << "more can be added";
    ASSERT_EQ(fn().qxsmclose(copy, kNan), SM_OK);
    Nonzeros expected = a.stored;
    expected[{0, 29}] += 0.25;
    EXPECT_EQ(compressed(copy), expected);
    EXPECT_EQ(a.matrix->state, state);
  }
}

TEST_P(Clone, a_reassembled_copy_keeps_stored_zeros_and_needs_more_than_one_slab) {
  constexpr std::int64_t n = 60;
  Nonzeros elements;
  for (std::int64_t r = 0; r < n; ++r)
    for (std::int64_t c = r; c < n; ++c) elements[{r, c}] = (r + c) % 7 == 0 ? 0.0 : static_cast<double>(r * n + c);
  const Filled a = filled_with(session(), kSymmetricSparse, n, n, elements);
  SmMatrix* copy = target();
  ASSERT_EQ(fn().qxsmclone(a.matrix, copy, -1), SM_OK);
  ASSERT_GT(copy->nnz, copy->slab_nodes);
  EXPECT_EQ(entries(copy), a.stored);
  ASSERT_EQ(fn().qxsmclose(copy, kNan), SM_OK);
  EXPECT_EQ(compressed(copy), a.stored);
}

TEST_P(Clone, values_are_copied_to_the_bit) {
  const double odd[] = {-0.0, kNan, -kNan, kInfinity, -kInfinity, 5e-324, -1.7976931348623157e308};
  Nonzeros elements;
  for (std::int64_t k = 0; k < 7; ++k) elements[{0, k}] = odd[at(k)];
  SmMatrix* source = filled_with(session(), kSymmetricSparse, 7, 7, elements).matrix;
  SmMatrix* copy = target();
  ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
  EXPECT_EQ(rows_of(copy), rows_of(source));
  ASSERT_EQ(fn().qxsmclone(source, copy, 1), SM_OK);
  ASSERT_EQ(fn().qxsmclose(copy, kNan), SM_OK);
  EXPECT_EQ(rows_of(copy), rows_of(source));
}

TEST_P(Clone, an_empty_copy_takes_the_state_of_its_source_unless_it_is_reassembled) {
  SmMatrix* source = new_sized(session(), kSymmetricSparse, 0, 0);
  ASSERT_EQ(fn().qxsmclose(source, 0.0), SM_OK);
  ASSERT_EQ(source->state, SM_STATE_CLOSED);
  source->solver_word = 3;
  SmMatrix* copy = new_sized(session(), kSymmetricSparse, 4, 4);
  ASSERT_EQ(fn().qxsmclone(source, copy, 0), SM_OK);
  EXPECT_EQ(copy->state, SM_STATE_CLOSED);
  EXPECT_EQ(copy->rows, 0);
  EXPECT_EQ(copy->nnz, 0);
  EXPECT_EQ(copy->solver_word, 3);
  ASSERT_EQ(fn().qxsmclone(source, copy, 1), SM_OK);
  EXPECT_EQ(copy->state, SM_STATE_OPEN);
  EXPECT_EQ(copy->rows, 0);
}

INSTANTIATE_BOTH_HOSTS(Clone);

}  // namespace
}  // namespace sm::test
