// Large trees of dense keys: the manager keeps their nodes by key while keys come in, lets their heights go meanwhile,
// and must never do so for a tree that is another one by now.
#include <algorithm>
#include <array>
#include <limits>
#include <memory>
#include <numeric>
#include <vector>

#include "avl/support.hpp"

namespace sm::test {
namespace {

constexpr std::int64_t kMin = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();

class HubTest : public TreeTest {
 protected:
  // Each hub has a pool of its own, beside that of the extension.
  [[nodiscard]] std::int64_t hubs() const { return host.live_pools - 1; }
  [[nodiscard]] NonzeroNode* find(CheckedTree& tree, std::int64_t key) const {
    return manager->find(manager, tree.root, &key);
  }
  // Enters `count` keys below `range` (all of them for an equal count) in random order; they make a hub.
  void make_hub(CheckedTree& tree, std::int64_t count, std::int64_t range, std::uint64_t seed) const {
    const std::int64_t before = hubs();
    for (const std::int64_t key : Dice(seed).permutation(range)) {
      tree.insert(key);
      if (static_cast<std::int64_t>(tree.model.size()) == count) break;
    }
    ASSERT_EQ(before + 1, hubs());
  }
  std::uint64_t root = 0;
};

NonzeroNode* address(std::uint64_t link) { return reinterpret_cast<NonzeroNode*>(link & ~SM_LINK_TAGS); }
bool is_thread(std::uint64_t link) { return (link & SM_LINK_THREAD) != 0; }

// Everything but heights, found from the root word alone, without a call of the manager.
testing::AssertionResult is_threaded_in_order(const CheckedTree& tree) {
  std::vector<NonzeroNode*> open;
  std::vector<NonzeroNode*> nodes;
  for (NonzeroNode* at = address(*tree.root); at || !open.empty();) {
    if (nodes.size() + open.size() > tree.model.size()) return testing::AssertionFailure() << "too many nodes";
    if (at) {
      open.push_back(at);
      at = is_thread(at->left) ? nullptr : address(at->left);
    } else {
      nodes.push_back(open.back());
      open.pop_back();
      at = is_thread(nodes.back()->right) ? nullptr : address(nodes.back()->right);
    }
  }
  if (nodes.size() != tree.model.size()) return testing::AssertionFailure() << nodes.size() << " nodes";
  auto expected = tree.model.begin();
  for (std::size_t i = 0; i < nodes.size(); ++i, ++expected) {
    if (nodes[i] != expected->second.node || nodes[i]->key != expected->first) {
      return testing::AssertionFailure() << "node " << i;
    }
    NonzeroNode* before = i == 0 ? nullptr : nodes[i - 1];
    NonzeroNode* after = i + 1 == nodes.size() ? nullptr : nodes[i + 1];
    if (is_thread(nodes[i]->left) && address(nodes[i]->left) != before) {
      return testing::AssertionFailure() << "left thread of " << nodes[i]->key;
    }
    if (sm_node_next(nodes[i]) != after) return testing::AssertionFailure() << "successor of " << nodes[i]->key;
  }
  return testing::AssertionSuccess();
}

TEST_F(HubTest, links_and_threads_hold_at_any_moment_and_heights_when_somebody_asks) {
  for (const std::int64_t range : {8000, 20000, 60000}) {
    CheckedTree tree(manager, &root);
    make_hub(tree, 7999, range, 1);
    const std::uint64_t word = root;
    Dice dice(2);
    for (int step = 0; step < 3000; ++step) {
      tree.insert(dice.below(range));
      if (step % 500 == 0) {
        ASSERT_TRUE(is_threaded_in_order(tree)) << step;
      }
    }
    EXPECT_EQ(word, root) << "a hub leaves the root alone";
    EXPECT_EQ(1, hubs());
    ASSERT_TRUE(is_threaded_in_order(tree));
    ASSERT_TRUE(tree.check()) << "first() balances";
    EXPECT_EQ(0, hubs());
  }
}

TEST_F(HubTest, every_size_is_balanced) {
  for (std::int64_t count = 7900; count < 7900 + 40; ++count) {
    CheckedTree tree(manager, &root);
    make_hub(tree, count, 8192, static_cast<std::uint64_t>(count));
    ASSERT_TRUE(tree.check()) << count;
  }
}

TEST_F(HubTest, a_search_ends_no_hub_and_sees_what_is_there) {
  CheckedTree tree(manager, &root);
  make_hub(tree, 9000, 12000, 3);
  for (std::int64_t key = -100; key < 12100; ++key) {
    const auto held = tree.model.find(key);
    ASSERT_EQ(held == tree.model.end() ? nullptr : held->second.node, find(tree, key)) << key;
  }
  for (const std::int64_t key : {kMin, kMax}) EXPECT_EQ(nullptr, find(tree, key));
  EXPECT_EQ(1, hubs());
}

TEST_F(HubTest, a_removal_ends_the_hub) {
  CheckedTree tree(manager, &root);
  make_hub(tree, 8000, 9000, 4);
  tree.remove(tree.model.begin()->first);
  EXPECT_EQ(0, hubs());
  EXPECT_TRUE(tree.check());
  for (const std::int64_t key : Dice(5).permutation(9000)) tree.remove(key);
  EXPECT_EQ(0U, root);
}

TEST_F(HubTest, keys_beyond_the_table_widen_it_on_either_side) {
  for (const std::int64_t sign : {1, -1}) {
    CheckedTree tree(manager, &root);
    make_hub(tree, 8000, 8000, 6);
    const std::uint64_t word = root;
    for (std::int64_t key = 8000; key < 30000; ++key) tree.insert(sign * (key - 4000) + 4000);
    tree.insert(sign * 100'000);
    EXPECT_EQ(1, hubs());
    EXPECT_EQ(word, root);
    ASSERT_TRUE(is_threaded_in_order(tree));
    ASSERT_TRUE(tree.check());
  }
}

TEST_F(HubTest, a_key_too_far_away_ends_the_hub_and_is_entered) {
  for (const std::int64_t far : {kMin, kMin + 1, std::int64_t{-10'000'000}, std::int64_t{10'000'000}, kMax}) {
    CheckedTree tree(manager, &root);
    make_hub(tree, 8000, 9000, 7);
    tree.insert(far);
    EXPECT_EQ(0, hubs()) << far;
    ASSERT_TRUE(tree.check()) << far;
    // With that key in it the tree is no hub again, however many follow.
    for (const std::int64_t key : Dice(8).permutation(12000)) tree.insert(key);
    EXPECT_EQ(0, hubs());
    ASSERT_TRUE(tree.check());
  }
}

TEST_F(HubTest, keys_at_the_ends_of_the_range_have_their_hub_too) {
  for (const std::int64_t base : {kMin, kMax - 8999}) {
    CheckedTree tree(manager, &root);
    for (const std::int64_t key : Dice(9).permutation(9000)) tree.insert(base + key);
    EXPECT_EQ(1, hubs());
    EXPECT_EQ(nullptr, find(tree, base == kMin ? kMin + 9000 : kMax - 9000));
    EXPECT_EQ(tree.node(base), find(tree, base));
    ASSERT_TRUE(is_threaded_in_order(tree));
    ASSERT_TRUE(tree.check());
  }
}

TEST_F(HubTest, sparse_keys_make_no_hub) {
  CheckedTree tree(manager, &root);
  for (const std::int64_t key : Dice(10).permutation(20000)) tree.insert(100 * key);
  EXPECT_EQ(0, hubs());
  EXPECT_TRUE(tree.check());
}

TEST_F(HubTest, long_random_sequences_agree_with_a_map) {
  Dice dice(11);
  CheckedTree tree(manager, &root);
  std::int64_t begun = 0;
  std::int64_t before = 0;
  for (int step = 0; step < 400'000; ++step) {
    // Mostly insertions; a removal now and then, many of them in between; keys drift upwards.
    const bool emptying = step / 20'000 % 5 == 4;
    const std::int64_t key = step / 20 + dice.below(30'000);
    if (dice.below(1000) < (emptying ? 700 : 0) || dice.below(20'000) == 0) {
      tree.remove(key);
    } else if (dice.below(4) == 0) {
      const auto held = tree.model.find(key);
      ASSERT_EQ(held == tree.model.end() ? nullptr : held->second.node, find(tree, key)) << step;
    } else {
      tree.insert(key);
    }
    if (hubs() > before) ++begun;
    before = hubs();
    if (step % 9999 == 0) {
      ASSERT_TRUE(is_threaded_in_order(tree)) << step;
    }
    if (step % 49'999 == 0) {
      ASSERT_TRUE(tree.check()) << step;
    }
    ASSERT_FALSE(HasFailure()) << step;
  }
  EXPECT_GT(begun, 4) << "a hub begins again after it has ended";
}

TEST_F(HubTest, hubs_and_small_trees_whose_root_words_move_keep_apart) {
  constexpr std::int64_t count = 12;  // more than there are hubs
  std::array<std::array<std::uint64_t, count>, 2> arrays = {};
  const auto trees = trees_at(arrays[0]);
  std::size_t current = 0;
  std::int64_t most = 0;
  Dice dice(12);
  for (int step = 0; step < 250'000; ++step) {
    if (dice.below(500) == 0) {
      const std::vector<std::int64_t> order = dice.permutation(count);
      std::array<std::uint64_t, count> words = {};
      for (std::size_t i = 0; i < count; ++i) words[static_cast<std::size_t>(order[i])] = *trees[i]->root;
      arrays[current].fill(0xDBDBDBDBDBDBDBDB);
      current = 1 - current;
      arrays[current] = words;
      for (std::size_t i = 0; i < count; ++i) trees[i]->root = &arrays[current][static_cast<std::size_t>(order[i])];
    }
    const std::int64_t which = dice.below(count);
    CheckedTree& tree = *trees[static_cast<std::size_t>(which)];
    if (which == 0) {
      tree.insert(dice.below(40));
      tree.remove(dice.below(40));
    } else {
      tree.insert(dice.below(25'000));
    }
    if (dice.below(60'000) == 0) tree.abandon();
    most = std::max(most, hubs());
    ASSERT_FALSE(HasFailure()) << step;
  }
  EXPECT_EQ(8, most);
  for (const auto& tree : trees) {
    ASSERT_TRUE(is_threaded_in_order(*tree));
    ASSERT_TRUE(tree->check());
  }
}

// Trees whose nodes all come from one array, so that the root node of a dropped one serves again, as a root or below
// one.
TEST_F(HubTest, a_dropped_tree_is_forgotten_when_its_root_node_serves_again) {
  constexpr std::size_t n = 9000;
  std::vector<NonzeroNode> nodes(n);
  Dice dice(13);
  for (int round = 0; round < 30; ++round) {
    root = 0;
    const std::int64_t shift = 1000 * dice.below(5);
    const std::vector<std::int64_t> keys = dice.permutation(n);
    std::vector<std::int64_t> order = dice.permutation(n);
    if (round % 3 == 0) std::iota(order.begin(), order.end(), 0);  // the same first node, and the same root on the way
    for (std::size_t k = 0; k < n; ++k) {
      NonzeroNode& node = nodes[static_cast<std::size_t>(order[k])];
      node = {0xDB, 0xDB, keys[k] + shift, 0.0};
      ASSERT_EQ(&node, manager->insert(manager, &root, &node)) << round << ' ' << k;
    }
    std::int64_t last = shift - 1;
    const bool settles = round % 2 == 0;  // else the tree is dropped as a hub
    if (!settles) continue;
    for (NonzeroNode* node = manager->first(manager, &root); node; node = sm_node_next(node)) {
      ASSERT_EQ(++last, node->key);
    }
    ASSERT_EQ(shift + static_cast<std::int64_t>(n), last + 1);
  }
}

TEST_F(HubTest, a_node_that_balancing_makes_the_root_brings_no_hint_from_a_tree_it_was_the_root_of) {
  constexpr std::size_t n = 9000;
  constexpr std::size_t kPlaces = 64;  // hints lie by the place of the root node, modulo that
  struct alignas(sizeof(NonzeroNode) * kPlaces) Slab {
    std::array<NonzeroNode, 2 * n> nodes;
  };
  const auto slab = std::make_unique<Slab>();
  constexpr std::size_t kPlace = 5;
  NonzeroNode& top = slab->nodes[kPlace];
  NonzeroNode& stale = slab->nodes[1];
  std::uint64_t dropped = 0;
  top.key = 1;
  stale.key = 2;
  manager->insert(manager, &dropped, &top);
  manager->insert(manager, &dropped, &stale);
  dropped = 0;
  stale = {SM_LINK_THREAD, SM_LINK_THREAD, n, 0.0};
  // The hub's other nodes have other places.
  std::size_t used = kPlace;
  for (const std::int64_t rank : Dice(17).permutation(n)) {
    if (rank == n / 2) continue;
    if (++used % kPlaces == kPlace) ++used;
    NonzeroNode& node = slab->nodes[used];
    node.key = 2 * rank;
    ASSERT_EQ(&node, manager->insert(manager, &root, &node));
  }
  ASSERT_EQ(1, hubs());
  top.key = n;
  ASSERT_EQ(&top, manager->insert(manager, &root, &top));
  ASSERT_NE(nullptr, manager->first(manager, &root));
  ASSERT_EQ(reinterpret_cast<std::uint64_t>(&top), root);
  NonzeroNode beside = {0, 0, n + 1, 0.0};
  ASSERT_EQ(&beside, manager->insert(manager, &root, &beside));
  EXPECT_EQ(&beside, manager->find(manager, &root, &beside.key));
  EXPECT_EQ(&beside, sm_node_next(&top));
}

TEST_F(HubTest, without_memory_for_a_table_trees_stay_as_they_are) {
  for (const std::int64_t request : {0, 1}) {  // its pool, its block
    CheckedTree tree(manager, &root);
    const std::vector<std::int64_t> keys = Dice(14).permutation(9000);
    std::size_t k = 0;
    host.fail_request(request);
    for (; k < keys.size() && hubs() == 0; ++k) tree.insert(keys[k]);
    EXPECT_EQ(1, hubs()) << "the next try has memory";
    for (; k < keys.size(); ++k) tree.insert(keys[k]);
    ASSERT_TRUE(is_threaded_in_order(tree));
    // A wider table is refused: the hub ends.
    host.fail_request(request);
    tree.insert(15'000);
    EXPECT_EQ(0, hubs());
    ASSERT_TRUE(tree.check());
    ASSERT_EQ(9001U, tree.model.size());
  }
}

TEST_F(HubTest, a_manager_takes_its_hubs_with_it_and_so_does_the_extension) {
  std::array<std::uint64_t, 3> roots = {};
  const auto trees = trees_at(roots);
  for (const auto& tree : trees) make_hub(*tree, 8000, 8000, 15);
  EXPECT_EQ(3, hubs());
  NonzeroTree* second = extension->create_tree_manager(extension, &kTreeParms, nullptr, nullptr);
  ASSERT_NE(nullptr, second);
  CheckedTree other(second, &root);
  make_hub(other, 8000, 8000, 16);
  EXPECT_EQ(4, hubs());
  second->destroy(second);
  EXPECT_EQ(3, hubs());
  extension->destroy(extension);
  EXPECT_EQ(0, host.live_pools);
  extension = nullptr;
  manager = nullptr;
}

}  // namespace
}  // namespace sm::test
