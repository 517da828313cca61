// The manager may remember where the last insertion ended, and must never act on it when the tree is another one.
#include <array>
#include <cstring>
#include <limits>
#include <memory>

#include "avl/support.hpp"

namespace sm::test {
namespace {

constexpr std::int64_t kFar = std::numeric_limits<std::int64_t>::max();

class HintTest : public TreeTest {
 protected:
  // Runs `call` while the root node carries a key that sends every descent from the root astray.
  template <class Call>
  void without_descent(CheckedTree& tree, Call call) {
    auto* top = reinterpret_cast<NonzeroNode*>(*tree.root);
    const std::int64_t key = top->key;
    top->key = kFar;
    call();
    top->key = key;
  }
  void fill(CheckedTree& tree, std::int64_t n, std::int64_t stride) {
    for (std::int64_t i = 0; i < n; ++i) tree.insert(i * stride);
  }
  std::uint64_t root = 0;
};

TEST_F(HintTest, ascending_keys_are_appended_without_a_descent_from_the_root) {
  CheckedTree tree(manager, &root);
  fill(tree, 3, 1);
  for (std::int64_t key = 3; key < 500; ++key) {
    without_descent(tree, [&] { tree.insert(key); });
    ASSERT_TRUE(tree.check()) << key;
  }
}

TEST_F(HintTest, descending_keys_are_prepended_without_a_descent_from_the_root) {
  CheckedTree tree(manager, &root);
  for (std::int64_t key = 0; key > -3; --key) tree.insert(key);
  for (std::int64_t key = -3; key > -500; --key) {
    without_descent(tree, [&] { tree.insert(key); });
    ASSERT_TRUE(tree.check()) << key;
  }
}

TEST_F(HintTest, held_keys_are_visited_in_order_without_a_descent_from_the_root) {
  CheckedTree tree(manager, &root);
  fill(tree, 200, 1);
  const std::int64_t top = reinterpret_cast<NonzeroNode*>(root)->key;
  tree.insert(top + 1);
  for (std::int64_t key = top + 1; key < 200; ++key) {
    without_descent(tree, [&] {
      tree.insert(key);
      tree.insert(key);
    });
  }
  EXPECT_TRUE(tree.check());
}

TEST_F(HintTest, a_key_between_the_last_one_and_its_neighbour_goes_in_without_a_descent_from_the_root) {
  CheckedTree tree(manager, &root);
  fill(tree, 200, 2);
  const std::int64_t top = reinterpret_cast<NonzeroNode*>(root)->key;
  for (std::int64_t key = top + 2; key < 398; key += 4) {
    tree.insert(key);
    without_descent(tree, [&] { tree.insert(key + 1); });
    ASSERT_TRUE(tree.check()) << key;
  }
  for (std::int64_t key = top - 2; key > 4; key -= 4) {
    tree.insert(key);
    without_descent(tree, [&] { tree.insert(key - 1); });
    ASSERT_TRUE(tree.check()) << key;
  }
}

// The manager tells trees apart by the place of their root node, modulo that of 64 nodes. Here tree t has nodes at
// places of its own, so that no tree is forgotten for another one.
TEST_F(HintTest, trees_that_take_ascending_keys_by_turns_need_no_descent_from_the_root) {
  constexpr std::size_t kTrees = 4;
  constexpr std::size_t kPlaces = 64;
  struct alignas(sizeof(NonzeroNode) * kPlaces) Slab {
    std::array<NonzeroNode, kPlaces * 20> nodes;
  };
  const auto slab = std::make_unique<Slab>();
  std::array<std::uint64_t, kTrees> roots = {};
  for (std::size_t k = 0; k < 300; ++k) {
    for (std::size_t t = 0; t < kTrees; ++t) {
      constexpr std::size_t own = kPlaces / kTrees;
      NonzeroNode& node = slab->nodes[k / own * kPlaces + t * own + k % own];
      node.key = static_cast<std::int64_t>(k);
      auto* top = reinterpret_cast<NonzeroNode*>(roots[t]);
      const std::int64_t key = k < 3 ? 0 : top->key;
      if (k >= 3) top->key = kFar;
      ASSERT_EQ(&node, manager->insert(manager, &roots[t], &node)) << k;
      if (k >= 3) top->key = key;
    }
  }
  for (std::uint64_t& each : roots) {
    std::int64_t key = 0;
    for (NonzeroNode* node = manager->first(manager, &each); node; node = sm_node_next(node)) {
      ASSERT_EQ(key++, node->key);
    }
    EXPECT_EQ(300, key);
  }
}

TEST_F(HintTest, a_hint_that_was_no_help_many_times_is_right_again_later) {
  CheckedTree tree(manager, &root);
  Dice dice(20);
  for (int round = 0; round < 20; ++round) {
    for (const std::int64_t key : dice.permutation(100)) tree.insert(1000 * round + 7 * key);
    for (std::int64_t key = 0; key < 900; ++key) tree.insert(1000 * round + key);
    ASSERT_TRUE(tree.check()) << round;
  }
}

TEST_F(HintTest, a_node_that_was_removed_is_not_looked_at_again) {
  // The removed node is scribbled over and freed; it was the last one inserted, with keys to follow beside it.
  for (std::int64_t n = 1; n < 40; ++n) {
    CheckedTree tree(manager, &root);
    for (const std::int64_t key : Dice(static_cast<std::uint64_t>(n)).permutation(n)) {
      tree.insert(2 * key);
      tree.remove(2 * key);
      tree.insert(2 * key + 1);
      ASSERT_TRUE(tree.check());
      tree.insert(2 * key);
      ASSERT_TRUE(tree.check());
    }
  }
}

TEST_F(HintTest, a_tree_emptied_by_its_owner_starts_anew_with_the_same_nodes) {
  std::array<NonzeroNode, 20> nodes = {};
  for (int round = 0; round < 5; ++round) {
    for (std::size_t i = 0; i < nodes.size(); ++i) {
      nodes[i].key = round % 2 == 0 ? static_cast<std::int64_t>(i) : -static_cast<std::int64_t>(i);
      ASSERT_EQ(&nodes[i], manager->insert(manager, &root, &nodes[i]));
    }
    std::size_t count = 0;
    for (NonzeroNode* node = manager->first(manager, &root); node; node = sm_node_next(node)) ++count;
    ASSERT_EQ(nodes.size(), count);
    root = 0;
    std::memset(static_cast<void*>(nodes.data()), 0xDB, sizeof nodes);
  }
}

TEST_F(HintTest, an_equal_key_is_another_node_in_every_tree) {
  std::array<std::uint64_t, 3> roots = {};
  const auto trees = trees_at(roots);
  for (std::int64_t key = 0; key < 50; ++key) {
    for (auto& tree : trees) {
      tree->insert(key);
      tree->insert(key);
      ASSERT_TRUE(tree->check());
    }
  }
}

TEST_F(HintTest, a_root_array_may_move_and_its_old_words_may_become_those_of_another_tree) {
  auto old_words = std::make_unique<std::array<std::uint64_t, 2>>();
  CheckedTree one(manager, old_words->data());
  fill(one, 20, 1);
  auto new_words = std::make_unique<std::array<std::uint64_t, 2>>();
  std::memcpy(new_words->data(), old_words->data(), sizeof *new_words);
  one.root = new_words->data();
  old_words->fill(0);
  CheckedTree other(manager, old_words->data());
  other.insert(100);
  one.insert(20);
  other.insert(20);
  other.insert(19);
  one.insert(100);
  EXPECT_TRUE(one.check());
  EXPECT_TRUE(other.check());
  // The grown tree's word comes back to the address that the hint may still know.
  other.abandon();
  std::memcpy(old_words->data(), new_words->data(), sizeof *new_words);
  std::memset(new_words->data(), 0xDB, sizeof *new_words);
  one.root = old_words->data();
  one.insert(21);
  one.insert(101);
  EXPECT_TRUE(one.check());
}

TEST_F(HintTest, trees_whose_root_words_are_shuffled_between_calls_keep_apart) {
  constexpr std::int64_t count = 6;
  constexpr std::uint64_t poison = 0xDBDBDBDBDBDBDBDB;
  std::array<std::array<std::uint64_t, count>, 2> arrays = {};
  std::size_t current = 0;
  const auto trees = trees_at(arrays[0]);
  Dice dice(11);
  for (int step = 0; step < 30000; ++step) {
    if (dice.below(3) == 0) {
      // To the other array or to the same one, in another order; what is left behind is poisoned.
      const std::vector<std::int64_t> order = dice.permutation(count);
      std::array<std::uint64_t, count> words = {};
      for (std::size_t i = 0; i < count; ++i) words[static_cast<std::size_t>(order[i])] = *trees[i]->root;
      arrays[current].fill(poison);
      current = dice.below(2) == 0 ? current : 1 - current;
      arrays[current] = words;
      for (std::size_t i = 0; i < count; ++i) trees[i]->root = &arrays[current][static_cast<std::size_t>(order[i])];
    }
    CheckedTree& tree = *trees[static_cast<std::size_t>(dice.below(count))];
    const std::int64_t key = dice.below(24);
    const std::int64_t choice = dice.below(40);
    if (choice == 0) {
      tree.abandon();
    } else if (choice < 28) {
      tree.insert(key);
      tree.insert(key + 1);
    } else {
      tree.remove(key);
    }
    for (const auto& each : trees) ASSERT_TRUE(each->check()) << "step " << step;
  }
}

TEST_F(HintTest, managers_of_one_extension_remember_apart) {
  NonzeroTree* second = extension->create_tree_manager(extension, &kTreeParms, nullptr, nullptr);
  ASSERT_NE(nullptr, second);
  std::uint64_t other_root = 0;
  {
    CheckedTree one(manager, &root);
    CheckedTree two(second, &other_root);
    for (std::int64_t key = 0; key < 100; ++key) {
      one.insert(key);
      two.insert(-key);
      if (key % 3 == 0) two.remove(-key);
      ASSERT_TRUE(one.check());
      ASSERT_TRUE(two.check());
    }
  }
  second->destroy(second);
}

}  // namespace
}  // namespace sm::test
