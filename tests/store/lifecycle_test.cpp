// Typing records: qxsmnew and the four operations built on it.
#include <gtest/gtest.h>

#include "frame/recorded_test.hpp"
#include "store/store_test.hpp"

namespace sm::test {
namespace {

class Lifecycle : public StoreTest {
 protected:
  SmMatrix* last_registered() { return instance()->registry[instance()->matrix_count - 1]; }
  // Ends a tree manager that no matrix knows any more.
  static void let_go(NonzeroTree* tree) {
    if (TreeInner* inner = tree->inner) {
      inner->reset(inner, 1, 1);
      tree->cleared_word = nullptr;
      inner->release(inner);
    }
    tree->destroy(tree);
  }
};

void expect_fresh(const SmMatrix* m, Shape shape) {
  EXPECT_EQ(m->kind, shape.kind);
  EXPECT_EQ(m->format, shape.format);
  EXPECT_EQ(m->state, SM_STATE_OPEN);
  EXPECT_EQ(m->definite, -1);
  EXPECT_EQ(m->rank, -1);
  EXPECT_TRUE(is_missing(m->log_det));
  EXPECT_EQ(m->rows, 0);
  EXPECT_EQ(m->cols, 0);
  EXPECT_EQ(m->nnz, 0);
  EXPECT_EQ(m->value_count, 0.0);
  EXPECT_EQ(m->solver_word, 0);
  EXPECT_EQ(m->node_size, 32);
  EXPECT_NE(m->pool, nullptr);
  EXPECT_EQ(m->assembly_pool, nullptr);
  EXPECT_EQ(m->values, nullptr);
  EXPECT_EQ(m->row_start, nullptr);
  EXPECT_EQ(m->tree != nullptr, is_sparse(shape));
  expect_no_factor(m);
  EXPECT_EQ(m->sym_roots, nullptr);
  if (shape.kind == SM_KIND_SYMMETRIC && is_sparse(shape)) {
    EXPECT_EQ(m->col_index, nullptr);
    EXPECT_EQ(m->factor_block, 1);
  } else if (!is_sparse(shape)) {
    EXPECT_EQ(m->owns_values, 0);
  }
}

TEST_P(Lifecycle, types_a_record_of_every_kind_and_format) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = nullptr;
    ASSERT_EQ(fn().qxsmnew(instance(), &m, shape.kind, shape.format), SM_OK);
    expect_fresh(m, shape);
    EXPECT_EQ(m->instance, instance());
    EXPECT_EQ(m->registry_index, instance()->matrix_count);
    EXPECT_EQ(last_registered(), m);
  }
}

TEST_P(Lifecycle, refuses_formats_that_the_kind_does_not_have) {
  const Shape refused[] = {{SM_KIND_GENERAL, 20},   {SM_KIND_GENERAL, 24},   {SM_KIND_GENERAL, SM_FORMAT_NONE},
                           {SM_KIND_SYMMETRIC, 20}, {SM_KIND_SYMMETRIC, 24}, {SM_KIND_SYMMETRIC, 0},
                           {SM_KIND_DIAGONAL, 21},  {SM_KIND_DIAGONAL, 20},  {SM_KIND_DIAGONAL, 24},
                           {SM_KIND_GENERAL, -22},  {SM_KIND_SYMMETRIC, 54}, {SM_KIND_DIAGONAL, -1}};
  for (const Shape shape : refused) {
    SmMatrix* m = nullptr;
    EXPECT_EQ(fn().qxsmnew(instance(), &m, shape.kind, shape.format), SM_BAD_FORMAT) << name_of(shape);
    EXPECT_EQ(m, nullptr);
  }
}

TEST_P(Lifecycle, refuses_kinds_that_do_not_exist_whatever_the_format) {
  for (const std::int32_t kind : {-1, 0, 1, 4, 5, 7}) {
    for (const std::int32_t format : {21, 22, 23, 99}) {
      SmMatrix* m = nullptr;
      EXPECT_EQ(fn().qxsmnew(instance(), &m, kind, format), SM_UNAVAILABLE) << kind << ' ' << format;
      EXPECT_EQ(m, nullptr);
    }
  }
}

TEST_P(Lifecycle, a_refused_type_leaves_a_registered_record_without_a_kind_or_a_pool) {
  for (const Shape refused : {Shape{SM_KIND_DIAGONAL, SM_FORMAT_SPARSE}, Shape{SM_KIND_GENERAL, 24}, Shape{5, 22}}) {
    SCOPED_TRACE(name_of(refused));
    const std::int64_t pools = host().live_pools();
    const std::int64_t count = instance()->matrix_count;
    SmMatrix* m = nullptr;
    EXPECT_NE(fn().qxsmnew(instance(), &m, refused.kind, refused.format), SM_OK);
    EXPECT_EQ(host().live_pools(), pools);
    ASSERT_EQ(instance()->matrix_count, count + 1);
    SmMatrix* left = last_registered();
    ASSERT_NE(left, nullptr);
    EXPECT_EQ(left->kind, SM_KIND_NONE);
    EXPECT_EQ(left->format, SM_FORMAT_NONE);
    EXPECT_EQ(left->state, SM_STATE_OPEN);
    EXPECT_EQ(left->pool, nullptr);
    EXPECT_EQ(left->nnz, 0);
    EXPECT_EQ(left->registry_index, count + 1);
    EXPECT_EQ(fn().qxsmresize(left, 2, 2), SM_UNTYPED);
    EXPECT_EQ(fn().qxsmnew(instance(), &left, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_OK);
    EXPECT_EQ(instance()->matrix_count, count + 1);
  }
}

TEST_P(Lifecycle, a_refused_type_on_a_record_in_use_keeps_the_handle_and_gives_nothing_of_it_back) {
  SmMatrix* m = square(kGeneralRows, 3);
  MemoryPool* held = m->pool;
  double* values = m->values;
  const std::int64_t pools = host().live_pools();
  const std::int64_t blocks = host().live_blocks();
  SmMatrix* same = m;
  EXPECT_EQ(fn().qxsmnew(instance(), &same, SM_KIND_DIAGONAL, SM_FORMAT_SPARSE), SM_BAD_FORMAT);
  EXPECT_EQ(same, m);
  EXPECT_EQ(m->kind, SM_KIND_NONE);
  EXPECT_EQ(m->pool, nullptr);
  EXPECT_EQ(host().live_pools(), pools);
  EXPECT_EQ(host().live_blocks(), blocks);
  values[8] = 1.0;  // still ours to write
  EXPECT_EQ(instance()->registry[m->registry_index - 1], m);
  held->destroy(held);
}

TEST_P(Lifecycle, a_record_in_use_is_typed_again_as_it_stands) {
  SmMatrix* m = square(kGeneralRows, 3);
  MemoryPool* held = m->pool;
  const std::int64_t pools = host().live_pools();
  const std::int64_t count = instance()->matrix_count;
  SmMatrix* same = m;
  ASSERT_EQ(fn().qxsmnew(instance(), &same, SM_KIND_SYMMETRIC, SM_FORMAT_COLUMNS), SM_OK);
  EXPECT_EQ(same, m);
  expect_fresh(m, kSymmetricColumns);
  EXPECT_NE(m->pool, held);
  EXPECT_EQ(host().live_pools(), pools + 1);
  EXPECT_EQ(instance()->matrix_count, count);
  held->destroy(held);
}

TEST_P(Lifecycle, a_factored_record_typed_again_points_at_nothing_it_had) {
  for (const Shape shape : kShapes) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = definite(kSymmetricSparse);
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    MemoryPool* held = m->pool;
    NonzeroTree* tree = m->tree;
    ASSERT_EQ(fn().qxsmnew(instance(), &m, shape.kind, shape.format), SM_OK);
    EXPECT_EQ(m->kind, shape.kind);
    EXPECT_EQ(m->row_start, nullptr);
    EXPECT_EQ(m->values, nullptr);
    EXPECT_EQ(m->solver_word, 0);
    const bool tree_is_left = m->tree != tree;
    if (is_sparse(shape)) {
      EXPECT_TRUE(tree_is_left) << "a type of its own, a tree of its own";
    }
    if (shape.kind == SM_KIND_SYMMETRIC && is_sparse(shape)) expect_fresh(m, shape);
    EXPECT_EQ(fn().qxsmresize(m, 3, 3), SM_OK);
    EXPECT_EQ(fn().qxsmdelete(m), SM_OK);
    held->destroy(held);
    if (tree_is_left) let_go(tree);
  }
}

TEST_P(Lifecycle, an_open_record_typed_again_points_at_nothing_it_had) {
  SmMatrix* m = square(kSymmetricSparse, 3);
  MemoryPool* held[] = {m->pool, m->assembly_pool};
  NonzeroTree* tree = m->tree;
  ASSERT_EQ(fn().qxsmnew(instance(), &m, SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE), SM_OK);
  expect_fresh(m, kSymmetricSparse);
  for (MemoryPool* pool : held) pool->destroy(pool);
  let_go(tree);
  EXPECT_EQ(fn().qxsmresize(m, 4, 4), SM_OK);
  EXPECT_EQ(m->nnz, 4);
}

TEST_P(Lifecycle, a_record_of_another_instance_is_not_typed_and_changes_nothing) {
  SmInstance* other = CreateInstance(session().extension());
  ASSERT_NE(other, nullptr);
  SmMatrix* theirs = nullptr;
  ASSERT_EQ(fn().qxsmnewsd(other, &theirs, 3), SM_OK);
  SmMatrix* m = typed(kGeneralRows);  // the same registry index
  ASSERT_EQ(m->registry_index, theirs->registry_index);
  ASSERT_EQ(fn().qxsmdelete(m), SM_OK);
  SmMatrix* handle = m;
  EXPECT_EQ(fn().qxsmnew(other, &handle, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_BAD_ARGUMENT);
  EXPECT_EQ(handle, m);
  EXPECT_EQ(m->kind, SM_KIND_NONE);
  EXPECT_EQ(m->instance, instance());
  EXPECT_EQ(other->registry[theirs->registry_index - 1], theirs);
  EXPECT_EQ(qxsmDestroyInstance(&other), SM_OK);
  EXPECT_EQ(fn().qxsmnew(instance(), &handle, SM_KIND_GENERAL, SM_FORMAT_ROWS), SM_OK);
}

TEST_P(Lifecycle, a_record_destroyed_through_another_instance_goes_back_to_its_own) {
  SmInstance* other = CreateInstance(session().extension());
  ASSERT_NE(other, nullptr);
  SmMatrix* m = typed(kGeneralRows);
  EXPECT_EQ(fn().qxsmDestroyMatrix(other, &m), SM_OK);
  EXPECT_EQ(m, nullptr);
  EXPECT_EQ(qxsmDestroyInstance(&other), SM_OK);
  // The fixture counts a block given to the wrong pool.
}

TEST_P(Lifecycle, a_reset_record_gets_its_registry_slot_back) {
  SmMatrix* m = square(kGeneralSparse, 3);
  SmMatrix* other = square(kGeneralSparse, 3);
  const std::int64_t index = m->registry_index;
  ASSERT_EQ(fn().qxsmdelete(m), SM_OK);
  EXPECT_EQ(instance()->registry[index - 1], nullptr);
  EXPECT_EQ(m->registry_index, index);
  for (const Shape shape : kShapes) {
    SmMatrix* again = m;
    ASSERT_EQ(fn().qxsmnew(instance(), &again, shape.kind, shape.format), SM_OK);
    EXPECT_EQ(again, m);
    expect_fresh(m, shape);
    EXPECT_EQ(m->registry_index, index);
    EXPECT_EQ(instance()->registry[index - 1], m);
    EXPECT_EQ(instance()->registry[other->registry_index - 1], other);
    ASSERT_EQ(fn().qxsmresize(m, 4, 4), SM_OK);
    ASSERT_EQ(fn().qxsmdelete(m), SM_OK);
  }
  EXPECT_EQ(instance()->matrix_count, 2);
}

TEST_P(Lifecycle, typing_voids_what_a_reset_record_still_held) {
  SmMatrix* m = reset_record();
  m->rank = 7;
  m->log_det = 1.0;
  m->definite = 1;
  m->solver_word = 9;
  m->state = 4;
  ASSERT_EQ(fn().qxsmnew(instance(), &m, SM_KIND_SYMMETRIC, SM_FORMAT_SPARSE), SM_OK);
  expect_fresh(m, kSymmetricSparse);
}

TEST_P(Lifecycle, without_a_tree_manager_creation_succeeds_and_entries_are_refused) {
  for (const Shape shape : {kGeneralSparse, kSymmetricSparse}) {
    SCOPED_TRACE(name_of(shape));
    const std::int64_t first_use = instance()->matrix_capacity == 0 ? 1 : 0;
    SmMatrix* m = nullptr;
    host().fail_request(2 + first_use, false);  // after the record, the registry and the pool
    EXPECT_EQ(fn().qxsmnew(instance(), &m, shape.kind, shape.format), SM_OK);
    EXPECT_EQ(host().stop_failing(), 1);
    ASSERT_NE(m, nullptr);
    EXPECT_EQ(m->tree, nullptr);
    EXPECT_EQ(m->kind, shape.kind);
    // A symmetric matrix enters its zero diagonal when it is sized, a general one has nothing to enter.
    EXPECT_EQ(fn().qxsmresize(m, 3, 3), shape.kind == SM_KIND_GENERAL ? SM_OK : SM_NO_MEMORY);
    EXPECT_EQ(set(m, 1, 2, 1.0), SM_NO_MEMORY);
    EXPECT_EQ(add(m, 0, 0, 1.0), SM_NO_MEMORY);
    EXPECT_EQ(m->nnz, 0);
    EXPECT_EQ(qxsmremove(m, 1, 2), SM_OK);
    EXPECT_EQ(fn().qxsmclose(m, 1.0), SM_OK);
    EXPECT_EQ(fn().qxsmdelete(m), SM_OK);
  }
}

TEST_P(Lifecycle, the_four_short_forms_type_and_size_at_once) {
  SmMatrix* ss = nullptr;
  SmMatrix* ds = nullptr;
  SmMatrix* sg = nullptr;
  SmMatrix* sd = nullptr;
  ASSERT_EQ(fn().qxsmnewss(instance(), &ss, 4), SM_OK);
  ASSERT_EQ(fn().qxsmnewds(instance(), &ds, 4), SM_OK);
  ASSERT_EQ(fn().qxsmnewsg(instance(), &sg, 4, 6), SM_OK);
  ASSERT_EQ(fn().qxsmnewsd(instance(), &sd, 4), SM_OK);
  const auto expect = [](const SmMatrix* m, Shape shape, std::int64_t cols, std::int64_t nnz, std::int32_t state) {
    SCOPED_TRACE(name_of(shape));
    EXPECT_EQ(m->kind, shape.kind);
    EXPECT_EQ(m->format, shape.format);
    EXPECT_EQ(m->rows, 4);
    EXPECT_EQ(m->cols, cols);
    EXPECT_EQ(m->nnz, nnz);
    EXPECT_EQ(m->state, state);
  };
  expect(ss, kSymmetricSparse, 4, 4, SM_STATE_OPEN);
  expect(ds, kSymmetricColumns, 4, 10, SM_STATE_CLOSED);
  expect(sg, kGeneralSparse, 6, 0, SM_STATE_CLOSED);
  expect(sd, kDiagonalRows, 4, 4, SM_STATE_CLOSED);
}

TEST_P(Lifecycle, the_short_forms_answer_what_sizing_answers) {
  SmMatrix* made[4] = {};
  EXPECT_EQ(fn().qxsmnewss(instance(), &made[0], -1), SM_BAD_SIZE);
  EXPECT_EQ(fn().qxsmnewds(instance(), &made[1], -1), SM_BAD_SIZE);
  EXPECT_EQ(fn().qxsmnewsg(instance(), &made[2], 0, 5), SM_BAD_SIZE);
  EXPECT_EQ(fn().qxsmnewsd(instance(), &made[3], -7), SM_BAD_SIZE);
  for (SmMatrix* m : made) {
    ASSERT_NE(m, nullptr);
    EXPECT_NE(m->kind, SM_KIND_NONE);
    EXPECT_EQ(m->rows, 0);
    EXPECT_EQ(fn().qxsmresize(m, 2, 2), SM_OK);
  }
}

class LifecycleRecorded : public RecordedTest {};

TEST_P(LifecycleRecorded, pools_and_trees_are_asked_for_with_their_parameters) {
  start();
  const std::size_t before = record().pools.size();
  SmMatrix* m = nullptr;
  ASSERT_EQ(instance_->functions->qxsmnewss(instance_, &m, 3), SM_OK);
  ASSERT_EQ(record().pools.size(), before + 2) << "its own and the one of the assembly";
  for (std::size_t k = before; k < record().pools.size(); ++k) {
    EXPECT_EQ(record().pools[k].parms.flag, SM_POOL_MATRIX);
    EXPECT_EQ(record().pools[k].parms.reserved[0], 0U);
    EXPECT_EQ(record().pools[k].parms.reserved[1], 0U);
    EXPECT_EQ(record().pools[k].owner, nullptr);
    EXPECT_FALSE(record().pools[k].named);
  }
  ASSERT_EQ(record().trees.size(), 1U);
  EXPECT_EQ(record().trees[0].parms.first, 1U);
  EXPECT_EQ(record().trees[0].parms.key_offset, 16U);
  EXPECT_EQ(record().trees[0].parms.third, 10U);
  EXPECT_EQ(record().trees[0].parms.fourth, 1U);
  EXPECT_EQ(record().trees[0].zero, nullptr);
  EXPECT_EQ(record().trees[0].label, "Nonzero Tree");
}

TEST_P(LifecycleRecorded, dense_and_diagonal_matrices_have_no_tree_manager) {
  start();
  for (const Shape shape : kDense) {
    SmMatrix* m = nullptr;
    ASSERT_EQ(instance_->functions->qxsmnew(instance_, &m, shape.kind, shape.format), SM_OK);
  }
  EXPECT_TRUE(record().trees.empty());
}

INSTANTIATE_BOTH_HOSTS(Lifecycle);
INSTANTIATE_BOTH_HOSTS(LifecycleRecorded);

}  // namespace
}  // namespace sm::test
