// Entries of sparse matrices: one tree a row, nodes from slabs, removal, and a model to hold them against.
#include <gtest/gtest.h>

#include "store/store_test.hpp"
#include "support/random_matrices.hpp"

namespace sm::test {
namespace {

class Trees : public StoreTest {
 protected:
  static void expect_spare(const SmMatrix* m, std::int64_t entered) {
    ASSERT_NE(m->spare_node, nullptr);
    EXPECT_EQ(m->next_node, m->spare_node + 1);
    EXPECT_EQ(m->slab_used, 32 * (entered % m->slab_nodes + 1)) << entered;
  }
};

TEST_P(Trees, a_new_key_takes_the_spare_node_and_an_old_one_does_not) {
  SmMatrix* m = make(kGeneralSparse, 3, 9);
  const NonzeroNode* first = m->spare_node;
  ASSERT_EQ(set(m, 1, 4, 2.0), SM_OK);
  EXPECT_EQ(m->nnz, 1);
  EXPECT_EQ(m->spare_node, first + 1);
  expect_spare(m, 1);
  ASSERT_EQ(set(m, 1, 4, 3.0), SM_OK);
  ASSERT_EQ(add(m, 1, 4, 0.25), SM_OK);
  EXPECT_EQ(m->nnz, 1);
  expect_spare(m, 1);
  ASSERT_EQ(add(m, 1, 5, -1.5), SM_OK) << "the spare node was offered in vain before";
  EXPECT_EQ(m->nnz, 2);
  expect_spare(m, 2);
  EXPECT_EQ(walk(m, m->row_roots), (Nonzeros{{{1, 4}, 3.25}, {{1, 5}, -1.5}}));
}

TEST_P(Trees, adding_to_an_absent_key_stores_the_value_as_given) {
  SmMatrix* m = make(kGeneralSparse, 3, 9);
  ASSERT_EQ(add(m, 0, 0, -0.0), SM_OK);
  EXPECT_EQ(bits(at(m, 0, 0)), bits(-0.0));
  EXPECT_EQ(m->nnz, 1);
  ASSERT_EQ(add(m, 0, 1, 0.0), SM_OK) << "a zero is an entry";
  EXPECT_EQ(m->nnz, 2);
}

TEST_P(Trees, the_seeded_diagonal_is_added_to_and_replaced) {
  SmMatrix* m = square(kSymmetricSparse, 4);
  ASSERT_EQ(add(m, 2, 2, 1.5), SM_OK);
  ASSERT_EQ(add(m, 2, 2, 1.5), SM_OK);
  ASSERT_EQ(set(m, 3, 3, -2.0), SM_OK);
  EXPECT_EQ(m->nnz, 4);
  ASSERT_EQ(set(m, 1, 2, 7.0), SM_OK);
  EXPECT_EQ(m->nnz, 5);
  EXPECT_EQ(walk(m, m->sym_roots),
            (Nonzeros{{{0, 0}, 0.0}, {{1, 1}, 0.0}, {{1, 2}, 7.0}, {{2, 2}, 3.0}, {{3, 3}, -2.0}}));
}

TEST_P(Trees, entries_void_rank_and_log_determinant) {
  for (const Shape shape : {kGeneralSparse, kSymmetricSparse, kGeneralRows}) {
    SmMatrix* m = square(shape, 3);
    for (const std::int32_t flag : {0, 1}) {
      m->rank = 3;
      m->log_det = 1.0;
      ASSERT_EQ(fn().qxsmassign(m, 0, 2, flag, 1.0), SM_OK);
      expect_voided(m);
    }
  }
}

TEST_P(Trees, slabs_follow_each_other) {
  for (const Shape shape : {kGeneralSparse, kSymmetricSparse}) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* m = square(shape, 50);
    std::int64_t entered = m->nnz;
    const std::int64_t blocks = host().live_blocks();
    ASSERT_EQ(m->slab_nodes, 1000);
    for (std::int64_t r = 0; r < 50; ++r) {
      for (std::int64_t c = r; c < 50; ++c) {
        if (shape.kind == SM_KIND_SYMMETRIC && c == r) continue;
        ASSERT_EQ(set(m, r, c, static_cast<double>(50 * r + c)), SM_OK);
        expect_spare(m, ++entered);
      }
    }
    EXPECT_EQ(m->nnz, 1275);
    EXPECT_EQ(host().live_blocks(), blocks + 1) << "one more slab";
    const Nonzeros stored = walk(m, shape.kind == SM_KIND_GENERAL ? m->row_roots : m->sym_roots);
    for (const auto& [place, value] : stored) {
      const auto [r, c] = place;
      EXPECT_EQ(value, shape.kind == SM_KIND_SYMMETRIC && r == c ? 0.0 : static_cast<double>(50 * r + c));
    }
  }
}

TEST_P(Trees, a_full_slab_is_followed_when_its_last_node_goes) {
  SmMatrix* m = make(kGeneralSparse, 20, 40);
  const std::int64_t blocks = host().live_blocks();
  ASSERT_EQ(m->slab_nodes, 400);
  for (std::int64_t k = 0; k < 399; ++k) ASSERT_EQ(set(m, k / 40, k % 40, 1.0), SM_OK);
  EXPECT_EQ(m->slab_used, m->slab_bytes);
  EXPECT_EQ(host().live_blocks(), blocks);
  ASSERT_EQ(set(m, 19, 39, 1.0), SM_OK);
  EXPECT_EQ(m->slab_used, 32);
  EXPECT_EQ(host().live_blocks(), blocks + 1);
  expect_spare(m, 400);
}

TEST_P(Trees, removal_unlinks_what_is_there_and_forgives_what_is_not) {
  SmMatrix* m = make(kGeneralSparse, 4, 9);
  for (const std::int64_t c : {5, 1, 8, 3, 7}) ASSERT_EQ(set(m, 2, c, static_cast<double>(c)), SM_OK);
  const std::int64_t used = m->slab_used;
  EXPECT_EQ(qxsmremove(m, 2, 4), SM_OK);
  EXPECT_EQ(qxsmremove(m, 0, 5), SM_OK) << "a row without a tree";
  EXPECT_EQ(m->nnz, 5);
  EXPECT_EQ(qxsmremove(m, 2, 5), SM_OK);
  EXPECT_EQ(qxsmremove(m, 2, 5), SM_OK);
  EXPECT_EQ(m->nnz, 4);
  EXPECT_EQ(at(m, 2, 5), 0.0);
  EXPECT_EQ(m->slab_used, used) << "the node stays in its slab";
  ASSERT_EQ(add(m, 2, 5, 50.0), SM_OK);
  EXPECT_EQ(walk(m, m->row_roots),
            (Nonzeros{{{2, 1}, 1.0}, {{2, 3}, 3.0}, {{2, 5}, 50.0}, {{2, 7}, 7.0}, {{2, 8}, 8.0}}));
  for (const std::int64_t c : {1, 3, 5, 7, 8}) EXPECT_EQ(qxsmremove(m, 2, c), SM_OK);
  EXPECT_EQ(m->nnz, 0);
  EXPECT_EQ(qxsmremove(m, 2, 1), SM_OK);
}

TEST_P(Trees, a_full_count_refuses_the_entry_and_keeps_the_trees_whole) {
  SmMatrix* m = make(kGeneralSparse, 3, 9);
  ASSERT_EQ(set(m, 1, 4, 4.0), SM_OK);
  m->nnz = SM_MAX_ELEMENTS;  // nobody can wait for so many
  EXPECT_EQ(set(m, 1, 6, 6.0), SM_TOO_LARGE);
  EXPECT_EQ(m->nnz, SM_MAX_ELEMENTS);
  EXPECT_EQ(set(m, 1, 4, 5.0), SM_OK) << "an old key is no new entry";
  m->nnz = 1;
  ASSERT_EQ(set(m, 1, 2, 2.0), SM_OK);
  ASSERT_EQ(set(m, 2, 0, 1.0), SM_OK);
  ASSERT_EQ(set(m, 1, 7, 7.0), SM_OK);
  std::int64_t last = -1;
  for (const NonzeroNode* node = m->tree->first(m->tree, &m->row_roots[1]); node; node = sm_node_next(node)) {
    ASSERT_GT(node->key, last);
    last = node->key;
  }
  EXPECT_EQ(at(m, 1, 4), 5.0);
  EXPECT_EQ(at(m, 1, 2), 2.0);
  EXPECT_EQ(at(m, 1, 7), 7.0);
  EXPECT_EQ(at(m, 2, 0), 1.0);
}

// Replace, add, remove and grow at random; `model` is what must be there.
TEST_P(Trees, agree_with_a_map_under_random_changes) {
  for (std::uint64_t seed = 1; seed <= 12; ++seed) {
    SCOPED_TRACE(seed);
    Random random(seed);
    SmMatrix* m = make(kGeneralSparse, 6, 6);
    Nonzeros model;
    std::int64_t rows = 6;
    std::int64_t cols = 6;
    const std::int64_t width = 8 + random.below(60);
    for (int step = 0; step < 1500; ++step) {
      const std::int64_t r = random.below(width);
      const std::int64_t c = random.below(width);
      const double value = random.dyadic();
      if (random.chance(30)) {
        const bool inside = r < rows && c < cols;
        ASSERT_EQ(qxsmremove(m, r, c), inside || model.empty() ? SM_OK : SM_OUTSIDE);
        if (inside) model.erase({r, c});
        continue;
      }
      const bool adds = random.chance(50);
      ASSERT_EQ(fn().qxsmassign(m, r, c, adds ? 1 : 0, value), SM_OK);
      double& stored = model[{r, c}];
      stored = adds ? stored + value : value;
      rows = std::max(rows, r + 1);
      cols = std::max(cols, c + 1);
    }
    EXPECT_EQ(m->rows, rows);
    EXPECT_EQ(m->cols, cols);
    EXPECT_EQ(m->value_count, static_cast<double>(rows * cols));
    EXPECT_EQ(walk(m, m->row_roots), model);
    for (std::int64_t r = 0; r < rows; ++r) {
      for (std::int64_t c = 0; c < cols; ++c) {
        const auto found = model.find({r, c});
        ASSERT_EQ(at(m, r, c), found == model.end() ? 0.0 : found->second) << r << ' ' << c;
      }
    }
  }
}

INSTANTIATE_BOTH_HOSTS(Trees);

}  // namespace
}  // namespace sm::test
