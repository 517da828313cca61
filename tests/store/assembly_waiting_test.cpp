// Entries of an open symmetric sparse matrix that wait to be linked in together.
#include <gtest/gtest.h>

#include <iterator>
#include <map>
#include <memory>
#include <utility>
#include <vector>

#include "store/nodes.hpp"
#include "store/store_test.hpp"
#include "support/random_matrices.hpp"

namespace sm::test {
namespace {

struct Entry {
  std::int64_t row, col;
  bool add;
  double value;
};

class Waiting : public StoreTest {
 protected:
  static WaitingEntries& waiting(SmMatrix* m) { return open_rows(*m).waiting; }

  // From here on entries wait, whatever the machine finds faster.
  static void make_wait(SmMatrix* m) {
    waiting(m).wait = true;
    waiting(m).entries = INT64_MAX / 2;
    waiting(m).limit = kMostWaiting;
    waiting(m).until = 0;
  }

  SmStatus enter(SmMatrix* m, const Entry& e) { return fn().qxsmassign(m, e.row, e.col, e.add ? 1 : 0, e.value); }

  static void note(Nonzeros& model, const Entry& e) {
    double& stored = model[{e.row, e.col}];
    stored = e.add ? stored + e.value : e.value;
  }

  static Nonzeros diagonal(std::int64_t n) {
    Nonzeros model;
    for (std::int64_t i = 0; i < n; ++i) model[{i, i}] = 0.0;
    return model;
  }

  // All over a matrix of order n; every fourth entry comes to one of few places, so that keys meet while they wait.
  static std::vector<Entry> scattered(std::int64_t n, std::int64_t count, std::uint64_t seed) {
    Random random(seed);
    std::vector<Entry> entries;
    for (std::int64_t k = 0; k < count; ++k) {
      const std::int64_t width = k % 4 == 0 ? 7 : n;
      const std::int64_t a = random.below(width);
      const std::int64_t b = random.below(width);
      entries.push_back({std::min(a, b), std::max(a, b), random.chance(70), random.dyadic()});
    }
    return entries;
  }
};

TEST_P(Waiting, entries_are_counted_when_they_are_linked_in) {
  SmMatrix* m = square(kSymmetricSparse, 300);
  make_wait(m);
  for (std::int64_t k = 0; k < kMostWaiting - 1; ++k) ASSERT_EQ(set(m, k, 299, 1.0), SM_OK);
  EXPECT_EQ(m->nnz, 300);
  EXPECT_EQ(waiting(m).count, kMostWaiting - 1);
  ASSERT_EQ(set(m, 100, 299, 1.0), SM_OK);
  EXPECT_EQ(m->nnz, 300 + kMostWaiting);
  EXPECT_EQ(waiting(m).count, 0);
  ASSERT_EQ(set(m, 101, 299, 1.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(m->nnz, 301 + kMostWaiting) << "closing links in the last ones";
}

TEST_P(Waiting, entries_take_effect_in_the_order_in_which_they_came) {
  SmMatrix* m = square(kSymmetricSparse, 9);
  make_wait(m);
  for (const Entry& e : {Entry{2, 5, true, 1.0},
                         {2, 5, false, 0.1},
                         {2, 5, true, 0.2},
                         {3, 3, true, 4.0},
                         {2, 5, true, 0.3},
                         {3, 3, false, -1.0}}) {
    ASSERT_EQ(enter(m, e), SM_OK);
  }
  EXPECT_EQ(waiting(m).count, 6);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(at(m, 2, 5), 0.1 + 0.2 + 0.3);
  EXPECT_EQ(at(m, 3, 3), -1.0);
}

TEST_P(Waiting, trees_are_those_of_entries_that_do_not_wait) {
  for (const std::int64_t n : {1, 20, 700}) {
    SCOPED_TRACE(n);
    SmMatrix* waits = square(kSymmetricSparse, n);
    SmMatrix* at_once = square(kSymmetricSparse, n);
    Nonzeros model = diagonal(n);
    make_wait(waits);
    for (const Entry& e : scattered(n, 5'000, static_cast<std::uint64_t>(n))) {
      if (e.col >= n) continue;
      ASSERT_EQ(enter(waits, e), SM_OK);
      ASSERT_EQ(enter(at_once, e), SM_OK);
      note(model, e);
    }
    while (waiting(waits).count > 0) ASSERT_EQ(add(waits, 0, 0, 0.0), SM_OK);
    EXPECT_EQ(walk(waits, waits->sym_roots), model);
    EXPECT_EQ(waits->nnz, at_once->nnz);
    EXPECT_EQ(waits->slab_used, at_once->slab_used);
    for (std::int64_t row = 0; row < n; ++row) {
      // The place of a row's top node in its slab tells when it came.
      const auto top = [row](SmMatrix* m) { return reinterpret_cast<NonzeroNode*>(m->sym_roots[row] & ~SM_LINK_TAGS); };
      ASSERT_EQ(top(waits) - open_rows(*waits).diagonal, top(at_once) - open_rows(*at_once).diagonal) << row;
    }
  }
}

// Large enough for both ways to be timed; whichever is faster here, the entries are the same.
TEST_P(Waiting, large_matrices_hold_what_a_map_holds) {
  constexpr std::int64_t n = 20'000;
  SmMatrix* m = square(kSymmetricSparse, n);
  Nonzeros model = diagonal(n);
  for (const Entry& e : scattered(n, 60'000, 3)) {
    ASSERT_EQ(enter(m, e), SM_OK);
    note(model, e);
  }
  EXPECT_GE(waiting(m).interval, 4096) << "the ways were compared";
  ASSERT_EQ(fn().qxsmclose(m, kNan), SM_OK);
  EXPECT_EQ(compressed(m), model);
}

TEST_P(Waiting, a_slab_is_taken_by_an_entry_that_does_not_wait) {
  SmMatrix* m = square(kSymmetricSparse, 60);
  make_wait(m);
  ASSERT_EQ(m->slab_nodes, 1200);
  const std::int64_t blocks = host().live_blocks();
  Nonzeros model = diagonal(60);
  for (std::int64_t row = 0; row < 60; ++row) {
    for (std::int64_t col = row + 1; col < 60; ++col) {
      const Entry e{row, col, true, static_cast<double>(60 * row + col)};
      ASSERT_EQ(enter(m, e), SM_OK);
      note(model, e);
      EXPECT_NE(m->spare_node, nullptr);
    }
  }
  EXPECT_EQ(host().live_blocks(), blocks + 1);
  EXPECT_GT(waiting(m).limit, 0) << "the next ones wait again";
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(compressed(m), model);
}

TEST_P(Waiting, a_slab_that_cannot_be_had_is_told_to_the_entry_that_needed_it) {
  SmMatrix* m = square(kSymmetricSparse, 60);
  make_wait(m);
  Nonzeros model = diagonal(60);
  host().fail_request(0, true);
  SmStatus status = SM_OK;
  for (std::int64_t row = 0; row < 60 && status == SM_OK; ++row) {
    for (std::int64_t col = row + 1; col < 60 && status == SM_OK; ++col) {
      const Entry e{row, col, true, 1.0};
      status = enter(m, e);
      note(model, e);
    }
  }
  EXPECT_EQ(host().stop_failing(), 1);
  EXPECT_EQ(status, SM_NO_MEMORY);
  EXPECT_EQ(m->nnz, m->slab_nodes) << "the last one is in and counted";
  EXPECT_EQ(waiting(m).count, 0);
  EXPECT_EQ(set(m, 58, 59, 1.0), SM_NO_MEMORY);
  EXPECT_EQ(walk(m, m->sym_roots), model);
}

TEST_P(Waiting, refused_entries_leave_those_that_wait_alone) {
  SmMatrix* m = square(kSymmetricSparse, 9);
  make_wait(m);
  ASSERT_EQ(set(m, 1, 7, 2.0), SM_OK);
  EXPECT_EQ(set(m, 7, 1, 3.0), SM_OUTSIDE);
  EXPECT_EQ(set(m, -1, 1, 3.0), SM_BAD_ARGUMENT);
  ASSERT_EQ(add(m, 1, 7, 0.5), SM_OK);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(at(m, 1, 7), 2.5);
  EXPECT_EQ(m->nnz, 10);
}

TEST_P(Waiting, growth_links_in_what_waits) {
  SmMatrix* m = square(kSymmetricSparse, 25);
  make_wait(m);
  ASSERT_EQ(set(m, 3, 24, 1.5), SM_OK);
  ASSERT_EQ(set(m, 3, 90, 2.5), SM_OK) << "beyond the root words";
  EXPECT_EQ(m->rows, 91);
  ASSERT_EQ(add(m, 3, 24, 1.0), SM_OK);
  ASSERT_EQ(add(m, 80, 90, 4.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(at(m, 3, 24), 2.5);
  EXPECT_EQ(at(m, 3, 90), 2.5);
  EXPECT_EQ(at(m, 80, 90), 4.0);
}

TEST_P(Waiting, a_matrix_added_to_itself_is_scaled_with_what_waits) {
  SmMatrix* m = square(kSymmetricSparse, 9);
  make_wait(m);
  ASSERT_EQ(set(m, 2, 4, 3.0), SM_OK);
  ASSERT_EQ(set(m, 4, 4, 5.0), SM_OK);
  ASSERT_EQ(fn().qxsmAddSS(m, m, 2.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(at(m, 2, 4), 9.0);
  EXPECT_EQ(at(m, 4, 4), 15.0);
}

TEST_P(Waiting, a_block_is_added_to_saved_and_cleared_with_what_waits) {
  SmMatrix* m = square(kSymmetricSparse, 9);
  make_wait(m);
  ASSERT_EQ(set(m, 7, 7, 3.0), SM_OK);
  ASSERT_EQ(set(m, 7, 8, 0.25), SM_OK);
  ASSERT_EQ(set(m, 8, 8, 0.5), SM_OK);
  SmMatrix* b = square(kSymmetricRows, 2);
  ASSERT_EQ(set(b, 0, 0, -2.5), SM_OK);
  ASSERT_EQ(set(b, 1, 1, 5.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(b, 0.0), SM_OK);
  SmMatrix* before = square(kSymmetricRows, 2);
  ASSERT_EQ(waiting(m).count, 3);
  ASSERT_EQ(qxsmAddGinv(m, b, before, 7, 1.0, 1.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(at(m, 7, 7), 0.0) << "3 - 2.5 is at most the tolerance";
  EXPECT_EQ(at(m, 7, 8), 0.0);
  EXPECT_EQ(at(m, 8, 8), 5.5) << "0.5 and 5 are one element";
  EXPECT_EQ(at(before, 0, 0), 3.0);
  EXPECT_EQ(at(before, 0, 1), 0.25);
  EXPECT_EQ(at(before, 1, 1), 0.5);
}

TEST_P(Waiting, an_outer_product_waits_like_single_entries) {
  SmMatrix* m = square(kSymmetricSparse, 5);
  make_wait(m);
  const std::vector<double> z{1.0, 0.0, 2.0, -1.0, 0.5};
  ASSERT_EQ(fn().qxsmzscp(m, z.data(), nullptr, 5, 2.0), SM_OK);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  for (std::int64_t i = 0; i < 5; ++i) {
    for (std::int64_t j = i; j < 5; ++j) {
      EXPECT_EQ(at(m, i, j), 2.0 * z[static_cast<std::size_t>(i)] * z[static_cast<std::size_t>(j)]) << i << ' ' << j;
    }
  }
}

TEST_P(Waiting, what_waits_goes_with_a_new_size) {
  SmMatrix* m = square(kSymmetricSparse, 9);
  make_wait(m);
  ASSERT_EQ(set(m, 2, 4, 3.0), SM_OK);
  ASSERT_EQ(fn().qxsmresize(m, 6, 6), SM_OK);
  EXPECT_EQ(waiting(m).count, 0);
  ASSERT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  EXPECT_EQ(m->nnz, 6);
}

// A tree manager of another host: a root word holds an address less one of a list that is not a node at all.
struct ListManager {
  NonzeroTree tree{};  // first, so that the one is at the address of the other
  std::vector<std::unique_ptr<std::map<std::int64_t, NonzeroNode*>>> lists;

  static auto& list_of(std::uint64_t root) {
    return *reinterpret_cast<std::map<std::int64_t, NonzeroNode*>*>(root + 1);
  }
  static NonzeroNode* insert(NonzeroTree* tree, std::uint64_t* root, NonzeroNode* node) {
    if (*root == 0) {
      auto& lists = reinterpret_cast<ListManager*>(tree)->lists;
      lists.push_back(std::make_unique<std::map<std::int64_t, NonzeroNode*>>());
      *root = reinterpret_cast<std::uintptr_t>(lists.back().get()) - 1;
    }
    auto& list = list_of(*root);
    const auto [place, is_new] = list.emplace(node->key, node);
    if (!is_new) return place->second;
    const auto thread = [](NonzeroNode* to) { return reinterpret_cast<std::uintptr_t>(to) | SM_LINK_THREAD; };
    node->left = thread(place == list.begin() ? nullptr : std::prev(place)->second);
    node->right = thread(std::next(place) == list.end() ? nullptr : std::next(place)->second);
    if (place != list.begin()) std::prev(place)->second->right = thread(node);
    if (std::next(place) != list.end()) std::next(place)->second->left = thread(node);
    return node;
  }
  static NonzeroNode* first(NonzeroTree*, std::uint64_t* root) {
    return *root == 0 ? nullptr : list_of(*root).begin()->second;
  }
};

TEST_P(Waiting, root_words_that_do_not_lead_to_nodes_are_not_followed) {
  constexpr std::int64_t n = 20'000;
  ListManager manager;
  manager.tree.insert = ListManager::insert;
  manager.tree.first = ListManager::first;
  SmMatrix* m = typed(kSymmetricSparse);
  NonzeroTree* const own = std::exchange(m->tree, &manager.tree);
  ASSERT_EQ(fn().qxsmresize(m, n, n), SM_OK);
  Nonzeros model = diagonal(n);
  for (const Entry& e : scattered(n, 30'000, 4)) {
    ASSERT_EQ(enter(m, e), SM_OK);
    note(model, e);
  }
  EXPECT_EQ(waiting(m).interval, 0) << "no way was compared with the other";
  ASSERT_EQ(fn().qxsmclose(m, kNan), SM_OK);
  EXPECT_EQ(compressed(m), model);
  m->tree = own;
}

INSTANTIATE_BOTH_HOSTS(Waiting);

}  // namespace
}  // namespace sm::test
