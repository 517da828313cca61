#include "avl/support.hpp"

#include <dlfcn.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <numeric>
#include <set>

namespace sm::test {

struct TinyHost::Pool {
  MemoryPool table;
  TinyHost* host;
  std::set<void*> blocks;
};

TinyHost::TinyHost() {
  table_.services.create_pool = create_pool;
  table_.host = this;
}

MemoryPool* TinyHost::create_pool(HostServices* kernel, const PoolParms* parms, void* owner, const char* name) {
  TinyHost& host = *reinterpret_cast<Table*>(kernel)->host;
  host.pool_flag = parms->flag;
  host.pool_owner = owner;
  host.pool_name = name ? name : "(null)";
  if (host.refuses()) return nullptr;
  ++host.live_pools;
  return &(new Pool{{{}, destroy, allocate, free}, &host, {}})->table;
}

void TinyHost::destroy(MemoryPool* table) {
  auto* pool = reinterpret_cast<Pool*>(table);
  pool->host->live_blocks -= static_cast<std::int64_t>(pool->blocks.size());
  --pool->host->live_pools;
  for (void* block : pool->blocks) std::free(block);
  delete pool;
}

void* TinyHost::allocate(MemoryPool* table, std::uint64_t bytes, std::uint32_t flags) {
  auto* pool = reinterpret_cast<Pool*>(table);
  if (pool->host->refuses()) return nullptr;
  void* block = std::malloc(bytes);
  std::memset(block, flags == SM_POOL_ZERO ? 0 : 0xA5, bytes);
  pool->blocks.insert(block);
  ++pool->host->live_blocks;
  return block;
}

void TinyHost::free(MemoryPool* table, void* block) {
  auto* pool = reinterpret_cast<Pool*>(table);
  if (!block) return;
  if (pool->blocks.erase(block) == 0) {
    ++pool->host->foreign_frees;
    return;
  }
  --pool->host->live_blocks;
  std::free(block);
}

Library::Library() {
  void* handle = dlopen(QXEAVL_FILE, RTLD_NOW | RTLD_LOCAL);
  if (!handle) {
    ADD_FAILURE() << dlerror();
    return;
  }
  qxextver = reinterpret_cast<decltype(qxextver)>(dlsym(handle, "qxextver"));
  qxextent = reinterpret_cast<decltype(qxextent)>(dlsym(handle, "qxextent"));
  qxeavl = reinterpret_cast<decltype(qxeavl)>(dlsym(handle, "qxeavl"));
}

void TreeTest::SetUp() {
  ASSERT_TRUE(library.qxextver && library.qxextent && library.qxeavl);
  std::int32_t major = 0;
  std::int32_t minor = 0;
  ASSERT_EQ(0, library.qxextver(host.services(), &major, &minor));
  extension = static_cast<TreeExtension*>(library.qxeavl(nullptr, nullptr));
  ASSERT_NE(nullptr, extension);
  manager = extension->create_tree_manager(extension, &kTreeParms, nullptr, "Nonzero Tree");
  ASSERT_NE(nullptr, manager);
}

void TreeTest::TearDown() {
  if (manager) manager->destroy(manager);
  if (extension) extension->destroy(extension);
  EXPECT_EQ(0, host.live_pools);
  EXPECT_EQ(0, host.live_blocks);
  EXPECT_EQ(0, host.foreign_frees);
}

std::vector<std::unique_ptr<CheckedTree>> TreeTest::trees_at(std::span<std::uint64_t> roots) const {
  std::vector<std::unique_ptr<CheckedTree>> trees(roots.size());
  for (std::size_t i = 0; i < roots.size(); ++i) trees[i] = std::make_unique<CheckedTree>(manager, &roots[i]);
  return trees;
}

namespace {

NonzeroNode* address(std::uint64_t link) { return reinterpret_cast<NonzeroNode*>(link & ~SM_LINK_TAGS); }

// Walks the subtree in order, appends its nodes, and answers its height, or -1 after the first balance fault.
int collect(NonzeroNode* top, std::vector<NonzeroNode*>& in_order) {
  const int left = top->left & SM_LINK_THREAD ? 0 : collect(address(top->left), in_order);
  in_order.push_back(top);
  const int right = top->right & SM_LINK_THREAD ? 0 : collect(address(top->right), in_order);
  const int lean = left - right;
  const bool left_bit = (top->left & SM_LINK_BALANCE) != 0;
  const bool right_bit = (top->right & SM_LINK_BALANCE) != 0;
  if (left < 0 || right < 0 || lean < -1 || lean > 1 || left_bit != (lean == 1) || right_bit != (lean == -1)) return -1;
  return 1 + std::max(left, right);
}

// The threads of the i-th node against its neighbours, and the caller's walk from it.
testing::AssertionResult threads_hold(const std::vector<NonzeroNode*>& nodes, std::size_t i) {
  NonzeroNode* before = i == 0 ? nullptr : nodes[i - 1];
  NonzeroNode* after = i + 1 == nodes.size() ? nullptr : nodes[i + 1];
  const NonzeroNode& node = *nodes[i];
  if (node.left & SM_LINK_THREAD && address(node.left) != before) {
    return testing::AssertionFailure() << "left thread of " << node.key;
  }
  if (node.right & SM_LINK_THREAD && address(node.right) != after) {
    return testing::AssertionFailure() << "right thread of " << node.key;
  }
  if (sm_node_next(&node) != after) return testing::AssertionFailure() << "successor of " << node.key;
  return testing::AssertionSuccess();
}

void scribble_and_free(NonzeroNode* node) {
  std::memset(static_cast<void*>(node), 0xDB, sizeof *node);
  delete node;
}

}  // namespace

double CheckedTree::next_value_ = 0.0;

void CheckedTree::insert(std::int64_t key) {
  // Links that mean nothing: an insertion must write them all, and none of a node that it does not take.
  const std::uint64_t poison = 0xDBDBDBDBDBDBDBDB;
  auto* node = new NonzeroNode{poison, poison, key, next_value_ += 1.0};
  NonzeroNode* answer = manager->insert(manager, root, node);
  const auto found = model.find(key);
  if (found == model.end()) {
    ASSERT_EQ(node, answer) << "new key " << key;
    model[key] = {node, node->value};
    return;
  }
  ASSERT_EQ(found->second.node, answer) << "held key " << key;
  ASSERT_TRUE(node->left == poison && node->right == poison && node->key == key && node->value == next_value_);
  delete node;
}

void CheckedTree::remove(std::int64_t key) {
  const std::int64_t answer = manager->remove(manager, root, &key);
  const auto found = model.find(key);
  if (found == model.end()) {
    ASSERT_EQ(0, answer) << "absent key " << key;
    return;
  }
  ASSERT_NE(0, answer) << "held key " << key;
  ASSERT_EQ(key, found->second.node->key);
  ASSERT_EQ(found->second.value, found->second.node->value);
  scribble_and_free(found->second.node);
  model.erase(found);
}

testing::AssertionResult CheckedTree::check() const {
  NonzeroNode* first = manager->first(manager, root);
  if (model.empty()) {
    if (*root == 0 && !first) return testing::AssertionSuccess();
    return testing::AssertionFailure() << "an empty tree has a root or a first node";
  }
  if (*root == 0 || *root & SM_LINK_TAGS) return testing::AssertionFailure() << "root word " << *root;
  std::vector<NonzeroNode*> nodes;
  const int height = collect(address(*root), nodes);
  if (height < 0) return testing::AssertionFailure() << "heights or balance bits";
  if (nodes.size() != model.size()) return testing::AssertionFailure() << nodes.size() << " nodes";
  if (first != nodes.front()) return testing::AssertionFailure() << "first";
  std::size_t i = 0;
  for (const auto& [key, entry] : model) {
    if (nodes[i] != entry.node || entry.node->key != key || entry.node->value != entry.value) {
      return testing::AssertionFailure() << "node " << i << " is not that of key " << key;
    }
    if (const auto held = threads_hold(nodes, i); !held) return held;
    ++i;
  }
  if (!(nodes.front()->left & SM_LINK_THREAD) || !(nodes.back()->right & SM_LINK_THREAD)) {
    return testing::AssertionFailure() << "an end without a thread";
  }
  return testing::AssertionSuccess();
}

void CheckedTree::abandon() {
  *root = 0;
  for (auto& [key, entry] : model) scribble_and_free(entry.node);
  model.clear();
}

std::vector<std::int64_t> Dice::permutation(std::int64_t n) {
  std::vector<std::int64_t> keys(static_cast<std::size_t>(n));
  std::iota(keys.begin(), keys.end(), 0);
  std::shuffle(keys.begin(), keys.end(), engine_);
  return keys;
}

}  // namespace sm::test
