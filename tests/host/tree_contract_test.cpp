// What any host's trees must do, word by word; run with the balanced tree extension and with the minimal host's tree.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <limits>
#include <map>
#include <memory>
#include <random>
#include <vector>

#include "support/test_host.hpp"

namespace sm::test {
namespace {

constexpr TreeParms kParms = {1, offsetof(NonzeroNode, key), 10, 1};

NonzeroNode* target(std::uint64_t link) {
  return reinterpret_cast<NonzeroNode*>(static_cast<std::uintptr_t>(link & ~SM_LINK_TAGS));
}
bool is_thread(std::uint64_t link) { return (link & SM_LINK_THREAD) != 0; }

class TreeContract : public ::testing::TestWithParam<HostKind> {
 protected:
  void SetUp() override {
    HostServices* services = host_->services();
    trees_ = static_cast<TreeExtension*>(services->load_extension(services, L"qxeavl", 6, nullptr));
    ASSERT_NE(trees_, nullptr);
    tree = trees_->create_tree_manager(trees_, &kParms, nullptr, "Nonzero Tree");
    ASSERT_NE(tree, nullptr);
  }
  void TearDown() override {
    if (tree) {
      if (TreeInner* inner = tree->inner) {
        inner->reset(inner, 1, 1);
        tree->cleared_word = nullptr;
        inner->release(inner);
      }
      tree->destroy(tree);
    }
    if (trees_) trees_->destroy(trees_);
    EXPECT_EQ(host_->live_pools(), 0);
    EXPECT_EQ(host_->live_blocks(), 0);
    EXPECT_EQ(host_->violations(), 0);
  }

  NonzeroNode* make(std::int64_t key, double value = 0.0) {
    nodes_.push_back(std::make_unique<NonzeroNode>(NonzeroNode{0x1234567, 0x7654321, key, value}));
    return nodes_.back().get();
  }
  NonzeroNode* insert(std::uint64_t& root, std::int64_t key) { return tree->insert(tree, &root, make(key)); }
  bool remove(std::uint64_t& root, std::int64_t key) { return tree->remove(tree, &root, &key) != 0; }
  NonzeroNode* find(std::uint64_t& root, std::int64_t key) { return tree->find(tree, &root, &key); }

  NonzeroTree* tree = nullptr;

 private:
  std::unique_ptr<TestHost> host_ = make_host(GetParam());
  TreeExtension* trees_ = nullptr;
  std::vector<std::unique_ptr<NonzeroNode>> nodes_;
};

// The nodes below `top` in key order, by child links alone, without recursion: a tree may be as deep as it has nodes.
std::vector<NonzeroNode*> by_children(std::uint64_t root, std::size_t limit) {
  std::vector<NonzeroNode*> order;
  std::vector<NonzeroNode*> open;
  NonzeroNode* at = target(root);
  while ((at || !open.empty()) && order.size() <= limit) {
    if (at) {
      open.push_back(at);
      at = is_thread(at->left) ? nullptr : target(at->left);
    } else {
      at = open.back();
      open.pop_back();
      order.push_back(at);
      at = is_thread(at->right) ? nullptr : target(at->right);
    }
  }
  return order;
}

// Everything the contract says of a tree that holds exactly these nodes.
void expect_tree(NonzeroTree* tree, std::uint64_t& root, const std::map<std::int64_t, NonzeroNode*>& want) {
  std::vector<NonzeroNode*> nodes;
  for (const auto& [key, node] : want) {
    ASSERT_EQ(node->key, key) << "keys never move";
    nodes.push_back(node);
  }
  ASSERT_EQ(root == 0, want.empty());
  ASSERT_EQ(root & SM_LINK_TAGS, 0U);
  ASSERT_EQ(by_children(root, nodes.size()), nodes);
  NonzeroNode* at = tree->first(tree, &root);
  for (std::size_t k = 0; k < nodes.size(); ++k) {
    ASSERT_EQ(at, nodes[k]);
    NonzeroNode* before = k > 0 ? nodes[k - 1] : nullptr;
    NonzeroNode* after = k + 1 < nodes.size() ? nodes[k + 1] : nullptr;
    if (is_thread(at->left)) {
      ASSERT_EQ(target(at->left), before) << "left thread of " << at->key;
    }
    if (is_thread(at->right)) {
      ASSERT_EQ(target(at->right), after) << "right thread of " << at->key;
    }
    if (!before) {
      ASSERT_TRUE(is_thread(at->left));
    }
    if (!after) {
      ASSERT_EQ(at->right, SM_LINK_THREAD) << "the last right thread is 0 with its tag";
    }
    at = sm_node_next(at);
  }
  ASSERT_EQ(at, nullptr);
}

TEST_P(TreeContract, an_empty_tree_is_a_root_of_zero) {
  std::uint64_t root = 0;
  EXPECT_EQ(tree->first(tree, &root), nullptr);
  EXPECT_EQ(find(root, 0), nullptr);
  EXPECT_FALSE(remove(root, 0));
  EXPECT_EQ(root, 0U);
}

TEST_P(TreeContract, removing_the_only_node_leaves_a_root_of_zero) {
  std::uint64_t root = 0;
  NonzeroNode* node = insert(root, 7);
  expect_tree(tree, root, {{7, node}});
  EXPECT_TRUE(remove(root, 7));
  EXPECT_EQ(root, 0U);
  EXPECT_FALSE(remove(root, 7));
}

TEST_P(TreeContract, a_present_key_answers_its_node_and_leaves_the_given_one_untouched) {
  std::uint64_t root = 0;
  NonzeroNode* first = insert(root, 7);
  insert(root, 3);
  NonzeroNode* second = make(7, 0.5);
  const NonzeroNode before = *second;
  EXPECT_EQ(tree->insert(tree, &root, second), first);
  EXPECT_EQ(std::memcmp(second, &before, sizeof before), 0);
  EXPECT_EQ(first->value, 0.0);
}

TEST_P(TreeContract, values_are_not_the_trees_business) {
  std::uint64_t root = 0;
  for (int k = 0; k < 50; ++k) tree->insert(tree, &root, make((k * 37) % 50, k / 64.0));
  for (int k = 0; k < 50; k += 2) ASSERT_TRUE(remove(root, (k * 37) % 50));
  for (int k = 1; k < 50; k += 2) EXPECT_EQ(find(root, (k * 37) % 50)->value, k / 64.0);
}

TEST_P(TreeContract, every_shape_of_six_nodes_loses_each_node_in_turn) {
  std::vector<std::int64_t> order = {0, 1, 2, 3, 4, 5};
  do {
    for (std::int64_t gone = 0; gone < 6; ++gone) {
      std::uint64_t root = 0;
      std::map<std::int64_t, NonzeroNode*> want;
      NonzeroNode storage[6];
      for (const std::int64_t key : order) {
        storage[key] = {0, 0, key, 0.0};
        ASSERT_EQ(tree->insert(tree, &root, &storage[key]), &storage[key]);
        want[key] = &storage[key];
      }
      ASSERT_TRUE(remove(root, gone));
      want.erase(gone);
      expect_tree(tree, root, want);
      if (HasFatalFailure()) return;
      EXPECT_EQ(find(root, gone), nullptr);
    }
  } while (std::next_permutation(order.begin(), order.end()));
}

TEST_P(TreeContract, random_changes_agree_with_a_map) {
  std::mt19937_64 random(20240611);
  std::uint64_t root = 0;
  std::map<std::int64_t, NonzeroNode*> want;
  for (int step = 0; step < 4000; ++step) {
    const auto key = static_cast<std::int64_t>(random() % 120) - 60;
    const bool present = want.count(key) != 0;
    if (random() % 2 == 0) {
      NonzeroNode* node = insert(root, key);
      ASSERT_NE(node, nullptr);
      if (present) {
        ASSERT_EQ(node, want[key]);
      }
      want[key] = node;
    } else {
      ASSERT_EQ(remove(root, key), present);
      want.erase(key);
    }
    ASSERT_EQ(find(root, key), want.count(key) ? want[key] : nullptr);
    if (step % 16 == 0) expect_tree(tree, root, want);
    if (HasFatalFailure()) return;
  }
  expect_tree(tree, root, want);
}

TEST_P(TreeContract, a_root_word_may_move_between_calls) {
  std::vector<std::uint64_t> words(64, 0);
  std::map<std::int64_t, NonzeroNode*> want;
  for (std::size_t k = 0; k + 1 < words.size(); ++k) {
    const auto key = static_cast<std::int64_t>(k * 29 % 63);
    want[key] = insert(words[k], key);
    words[k + 1] = words[k];
    words[k] = 0;  // another tree may begin here
  }
  expect_tree(tree, words.back(), want);
  std::uint64_t elsewhere = words.back();
  EXPECT_TRUE(remove(elsewhere, 31));
  want.erase(31);
  expect_tree(tree, elsewhere, want);
}

TEST_P(TreeContract, trees_of_one_manager_do_not_know_each_other) {
  std::vector<std::uint64_t> roots(5, 0);
  std::vector<std::map<std::int64_t, NonzeroNode*>> want(5);
  for (int k = 0; k < 400; ++k) {
    const auto r = static_cast<std::size_t>(k % 5);
    want[r][k] = insert(roots[r], k);
    if (k % 7 == 6) {
      const std::int64_t old = k - 5;
      EXPECT_TRUE(remove(roots[r], old));
      want[r].erase(old);
    }
  }
  for (std::size_t r = 0; r < 5; ++r) expect_tree(tree, roots[r], want[r]);
}

TEST_P(TreeContract, a_root_word_that_was_set_to_zero_begins_a_new_tree) {
  std::uint64_t root = 0;
  for (int k = 0; k < 20; ++k) insert(root, k);
  root = 0;  // the module drops a whole tree like this
  EXPECT_EQ(find(root, 5), nullptr);
  EXPECT_EQ(tree->first(tree, &root), nullptr);
  NonzeroNode* node = insert(root, 25);
  expect_tree(tree, root, {{25, node}});
}

TEST_P(TreeContract, a_dropped_tree_may_be_built_again_from_the_same_nodes) {
  std::vector<NonzeroNode> storage(40);
  std::uint64_t root = 0;
  for (std::int64_t round = 0; round < 4; ++round) {
    root = 0;
    std::map<std::int64_t, NonzeroNode*> want;
    for (std::int64_t k = 0; k < 40 - 9 * round; ++k) {
      const std::int64_t key = 100 * (4 - round) + k;  // the same root node, ever smaller keys, fewer nodes
      NonzeroNode& node = storage[static_cast<std::size_t>(k)];
      node = {0, 0, key, 0.0};
      ASSERT_EQ(tree->insert(tree, &root, &node), &node);
      want[key] = &node;
    }
    expect_tree(tree, root, want);
    if (HasFatalFailure()) return;
  }
}

TEST_P(TreeContract, the_extreme_keys_are_ordered) {
  constexpr std::int64_t kLeast = std::numeric_limits<std::int64_t>::min();
  constexpr std::int64_t kMost = std::numeric_limits<std::int64_t>::max();
  std::uint64_t root = 0;
  std::map<std::int64_t, NonzeroNode*> want;
  for (const std::int64_t key : {kMost, std::int64_t{0}, kLeast, std::int64_t{-1}, kMost - 1, kLeast + 1}) {
    want[key] = insert(root, key);
  }
  expect_tree(tree, root, want);
}

TEST_P(TreeContract, ten_thousand_ascending_and_descending_keys_are_held) {
  for (const bool ascending : {true, false}) {
    std::uint64_t root = 0;
    std::map<std::int64_t, NonzeroNode*> want;
    for (std::int64_t k = 0; k < 10'000; ++k) {
      const std::int64_t key = ascending ? k : -k;
      want[key] = insert(root, key);
    }
    expect_tree(tree, root, want);
    for (std::int64_t k = 0; k < 10'000; k += 3) {
      const std::int64_t key = ascending ? k : -k;
      ASSERT_TRUE(remove(root, key));
      want.erase(key);
    }
    expect_tree(tree, root, want);
  }
}

TEST_P(TreeContract, a_walk_may_remove_what_it_has_passed) {
  std::uint64_t root = 0;
  std::map<std::int64_t, NonzeroNode*> want;
  for (std::int64_t k = 0; k < 200; ++k) want[k * 83 % 200] = insert(root, k * 83 % 200);
  for (NonzeroNode* at = tree->first(tree, &root); at;) {
    NonzeroNode* next = sm_node_next(at);
    const std::int64_t key = at->key;
    if (key % 3 != 0) {
      ASSERT_TRUE(remove(root, key));
      want.erase(key);
    }
    at = next;
  }
  expect_tree(tree, root, want);
}

INSTANTIATE_TEST_SUITE_P(Hosts, TreeContract, ::testing::Values(HostKind::embedded, HostKind::minimal),
                         [](const auto& kind) { return name_of(kind.param); });

}  // namespace
}  // namespace sm::test
