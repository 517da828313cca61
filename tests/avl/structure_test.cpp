// Insertion, deletion, finding and walking: the whole structure is looked at after every step.
#include <algorithm>
#include <array>
#include <functional>
#include <limits>
#include <memory>

#include "avl/support.hpp"

namespace sm::test {
namespace {

constexpr std::int64_t kMin = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();

class Structure : public TreeTest {
 protected:
  // Inserts the keys in turn and checks after each of them.
  void grow(CheckedTree& tree, const std::vector<std::int64_t>& keys) {
    for (const std::int64_t key : keys) {
      tree.insert(key);
      ASSERT_TRUE(tree.check()) << "after inserting " << key;
    }
  }
  void shrink(CheckedTree& tree, const std::vector<std::int64_t>& keys) {
    for (const std::int64_t key : keys) {
      tree.remove(key);
      ASSERT_TRUE(tree.check()) << "after removing " << key;
    }
  }
  NonzeroNode* find(CheckedTree& tree, std::int64_t key) { return manager->find(manager, tree.root, &key); }

  std::uint64_t root = 0;
};

// Keys of the sparsest tree of a height, level by level: inserted so, they need no rotation and lean left everywhere.
std::vector<std::int64_t> sparsest_tree(int height) {
  struct Subtree {
    int height;
    std::int64_t first;
  };
  const std::function<std::int64_t(int)> size = [&](int h) { return h <= 0 ? 0 : 1 + size(h - 1) + size(h - 2); };
  std::vector<std::int64_t> keys;
  std::vector<Subtree> level = {{height, 0}};
  while (!level.empty()) {
    std::vector<Subtree> below;
    for (const Subtree& subtree : level) {
      if (subtree.height <= 0) continue;
      const std::int64_t top = subtree.first + size(subtree.height - 1);
      keys.push_back(top);
      below.push_back({subtree.height - 1, subtree.first});
      below.push_back({subtree.height - 2, top + 1});
    }
    level = below;
  }
  return keys;
}

TEST_F(Structure, an_empty_tree_has_nothing_to_find_to_remove_or_to_begin_with) {
  CheckedTree tree(manager, &root);
  EXPECT_TRUE(tree.check());
  EXPECT_EQ(nullptr, find(tree, 0));
  tree.remove(0);
  EXPECT_EQ(nullptr, manager->first(manager, &root));
  EXPECT_EQ(0U, root);
}

TEST_F(Structure, a_single_node_threads_to_nothing_on_both_sides) {
  CheckedTree tree(manager, &root);
  tree.insert(7);
  EXPECT_EQ(SM_LINK_THREAD, tree.node(7)->left);
  EXPECT_EQ(SM_LINK_THREAD, tree.node(7)->right);
  EXPECT_EQ(reinterpret_cast<std::uint64_t>(tree.node(7)), root);
  shrink(tree, {7});
  EXPECT_EQ(0U, root);
}

TEST_F(Structure, ascending_descending_and_zigzag_keys_stay_balanced) {
  constexpr std::int64_t n = 300;
  std::vector<std::int64_t> ascending, descending, outwards, inwards;
  for (std::int64_t i = 0; i < n; ++i) {
    ascending.push_back(i);
    descending.push_back(n - i);
    outwards.push_back(i % 2 == 0 ? i : -i);
    inwards.push_back(i % 2 == 0 ? i : 2 * n - i);
  }
  for (const auto& keys : {ascending, descending, outwards, inwards}) {
    CheckedTree tree(manager, &root);
    grow(tree, keys);
    shrink(tree, keys);
    EXPECT_EQ(0U, root);
  }
}

TEST_F(Structure, every_order_of_seven_keys_builds_a_tree_that_any_order_of_removals_empties) {
  std::array<std::int64_t, 7> order = {0, 1, 2, 3, 4, 5, 6};
  Dice dice(1);
  do {
    CheckedTree tree(manager, &root);
    grow(tree, {order.begin(), order.end()});
    shrink(tree, dice.permutation(7));
    ASSERT_EQ(0U, root);
  } while (std::next_permutation(order.begin(), order.end()) && !HasFailure());
}

TEST_F(Structure, removing_any_node_of_the_sparsest_tree_mends_every_level_above_it) {
  for (int height = 1; height <= 9; ++height) {
    const std::vector<std::int64_t> keys = sparsest_tree(height);
    for (const std::int64_t sign : {1, -1}) {
      for (const std::int64_t victim : keys) {
        CheckedTree tree(manager, &root);
        for (const std::int64_t key : keys) tree.insert(sign * key);
        ASSERT_TRUE(tree.check());
        shrink(tree, {sign * victim});
        ASSERT_FALSE(HasFailure()) << "height " << height << ", victim " << victim;
      }
    }
  }
}

TEST_F(Structure, long_random_sequences_agree_with_a_map_at_every_step) {
  Dice dice(2);
  for (const std::int64_t range : {4, 12, 40, 200}) {
    CheckedTree tree(manager, &root);
    for (int step = 0; step < 20000; ++step) {
      // Swings between filling and emptying, so that both full and nearly empty trees are met.
      const bool filling = step / 1000 % 2 == 0;
      const std::int64_t key = dice.below(range) - range / 2;
      if (dice.below(10) < (filling ? 7 : 3)) {
        tree.insert(key);
      } else {
        tree.remove(key);
      }
      ASSERT_TRUE(tree.check()) << "range " << range << ", step " << step;
      const std::int64_t wanted = dice.below(range) - range / 2;
      const auto held = tree.model.find(wanted);
      ASSERT_EQ(held == tree.model.end() ? nullptr : held->second.node, find(tree, wanted));
    }
  }
}

TEST_F(Structure, runs_of_neighbouring_keys_agree_with_a_map_at_every_step) {
  // Short ascending and descending runs with gaps and repetitions, as the rows of overlapping blocks make them.
  Dice dice(3);
  CheckedTree tree(manager, &root);
  for (int run = 0; run < 3000; ++run) {
    std::int64_t key = dice.below(400);
    const std::int64_t step = dice.below(5) - 2;
    const bool removing = dice.below(3) == 0;
    for (std::int64_t i = dice.below(12); i >= 0; --i, key += step) {
      if (removing) {
        tree.remove(key);
      } else {
        tree.insert(key);
      }
      ASSERT_TRUE(tree.check()) << "run " << run;
    }
  }
}

TEST_F(Structure, the_whole_range_of_keys_is_ordered) {
  const std::vector<std::int64_t> keys = {0,        kMax,     kMin, -1,       1,        kMax - 1,
                                          kMin + 1, kMin / 2, 42,   kMax / 2, -5000000, kMin + 2};
  CheckedTree tree(manager, &root);
  grow(tree, keys);
  grow(tree, keys);
  for (const std::int64_t key : keys) EXPECT_EQ(tree.node(key), find(tree, key));
  EXPECT_EQ(kMin, manager->first(manager, &root)->key);
  EXPECT_EQ(nullptr, find(tree, 2));
  EXPECT_EQ(nullptr, find(tree, kMax - 2));
  shrink(tree, keys);
}

TEST_F(Structure, a_held_key_answers_its_node_and_leaves_the_offered_one_alone) {
  CheckedTree tree(manager, &root);
  for (const std::int64_t key : Dice(4).permutation(50)) tree.insert(key);
  const std::uint64_t word = root;
  for (const std::int64_t key : Dice(5).permutation(50)) tree.insert(key);
  EXPECT_EQ(word, root);
  EXPECT_TRUE(tree.check());
}

TEST_F(Structure, a_node_can_be_offered_again_under_another_key_after_it_was_refused) {
  CheckedTree tree(manager, &root);
  for (std::int64_t key = 0; key < 10; ++key) tree.insert(key);
  auto* spare = new NonzeroNode{0, 0, 4, 0.5};
  EXPECT_EQ(tree.node(4), manager->insert(manager, &root, spare));
  spare->key = 10;
  EXPECT_EQ(spare, manager->insert(manager, &root, spare));
  tree.model[10] = {spare, 0.5};
  EXPECT_TRUE(tree.check());
}

TEST_F(Structure, removing_a_node_with_two_children_moves_no_key_to_another_node) {
  for (std::int64_t n = 3; n < 40; ++n) {
    for (std::int64_t victim = 0; victim < n; ++victim) {
      CheckedTree tree(manager, &root);
      for (const std::int64_t key : Dice(static_cast<std::uint64_t>(n)).permutation(n)) tree.insert(key);
      const auto before = tree.model;
      tree.remove(victim);
      ASSERT_TRUE(tree.check());
      for (const auto& [key, entry] : before) {
        if (key == victim) continue;
        ASSERT_EQ(entry.node, find(tree, key));
        ASSERT_EQ(key, entry.node->key);
        ASSERT_EQ(entry.value, entry.node->value);
      }
    }
  }
}

TEST_F(Structure, a_walk_that_takes_the_successor_first_may_remove_what_it_visits) {
  Dice dice(6);
  for (int round = 0; round < 40; ++round) {
    CheckedTree tree(manager, &root);
    for (const std::int64_t key : dice.permutation(200)) tree.insert(3 * key);
    auto model = tree.model;
    const std::int64_t keep = round % 4;  // 0: remove all
    auto expected = model.begin();
    for (NonzeroNode* node = manager->first(manager, &root); node;) {
      ASSERT_NE(model.end(), expected);
      ASSERT_EQ(expected->second.node, node);
      ++expected;
      NonzeroNode* next = sm_node_next(node);
      if (keep == 0 || dice.below(4) >= keep) {
        tree.remove(node->key);
        ASSERT_TRUE(tree.check());
      }
      node = next;
    }
    ASSERT_EQ(model.end(), expected);
    if (keep == 0) {
      ASSERT_EQ(0U, root);
    }
  }
}

TEST_F(Structure, trees_of_one_manager_do_not_disturb_each_other) {
  std::array<std::uint64_t, 8> roots = {};
  const auto trees = trees_at(roots);
  Dice dice(7);
  for (int step = 0; step < 20000; ++step) {
    CheckedTree& tree = *trees[static_cast<std::size_t>(dice.below(8))];
    const std::int64_t key = dice.below(30);
    if (dice.below(5) < 3) {
      tree.insert(key);
    } else {
      tree.remove(key);
    }
    ASSERT_TRUE(tree.check()) << "step " << step;
    if (step % 64 == 0) {
      for (const auto& each : trees) ASSERT_TRUE(each->check()) << "step " << step;
    }
  }
}

TEST_F(Structure, a_large_tree_is_sound_after_ascending_random_and_emptying_passes) {
  constexpr std::int64_t n = 100000;
  CheckedTree tree(manager, &root);
  for (std::int64_t key = 0; key < n; ++key) tree.insert(2 * key);
  ASSERT_TRUE(tree.check());
  Dice dice(8);
  for (const std::int64_t key : dice.permutation(n)) tree.insert(2 * key + 1);
  ASSERT_TRUE(tree.check());
  for (const std::int64_t key : dice.permutation(2 * n)) {
    tree.remove(key);
    if (tree.model.size() % 40000 == 0) {
      ASSERT_TRUE(tree.check());
    }
  }
  EXPECT_EQ(0U, root);
}

}  // namespace
}  // namespace sm::test
