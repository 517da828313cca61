// What the tree tests share: a host over malloc, the loaded library, and trees that are checked against a model.
#pragma once

#include <gtest/gtest.h>
#include <qxesm/host.h>

#include <cstdint>
#include <map>
#include <memory>
#include <random>
#include <span>
#include <string>
#include <vector>

namespace sm::test {

// Nothing but what the tree extension may ask of a host. Every block is one of malloc's, so that AddressSanitizer sees
// each of them.
class TinyHost {
 public:
  TinyHost();
  HostServices* services() { return &table_.services; }
  // Refuse request k from now (0: the next) for a pool or a block; a negative k refuses none.
  void fail_request(std::int64_t k) { failing_ = k; }
  std::int64_t live_pools = 0;
  std::int64_t live_blocks = 0;
  std::int64_t foreign_frees = 0;
  // What the last create pool was given.
  std::uint64_t pool_flag = 99;
  void* pool_owner = nullptr;
  std::string pool_name;

 private:
  struct Pool;
  struct Table {
    HostServices services;
    TinyHost* host;
  };
  bool refuses() { return failing_ >= 0 && failing_-- == 0; }
  static MemoryPool* create_pool(HostServices* kernel, const PoolParms* parms, void* owner, const char* name);
  static void destroy(MemoryPool* pool);
  static void* allocate(MemoryPool* pool, std::uint64_t bytes, std::uint32_t flags);
  static void free(MemoryPool* pool, void* block);
  Table table_{};
  std::int64_t failing_ = -1;
};

// libqxeavl.so, found by dlopen.
struct Library {
  Library();
  std::int32_t (*qxextver)(HostServices*, std::int32_t*, std::int32_t*) = nullptr;
  std::int32_t (*qxextent)(HostServices*) = nullptr;
  void* (*qxeavl)(void*, void*) = nullptr;
};

constexpr TreeParms kTreeParms = {1, 16, 10, 1};

class CheckedTree;

// A host, the extension and a manager; at the end nothing may be left of them.
class TreeTest : public testing::Test {
 protected:
  void SetUp() override;
  void TearDown() override;
  // A tree for every root word.
  std::vector<std::unique_ptr<CheckedTree>> trees_at(std::span<std::uint64_t> roots) const;
  Library library;
  TinyHost host;
  TreeExtension* extension = nullptr;
  NonzeroTree* manager = nullptr;
};

// A tree beside its model. Nodes are heap blocks of their own; a node that is unlinked is scribbled over and freed.
class CheckedTree {
 public:
  CheckedTree(NonzeroTree* tree_manager, std::uint64_t* root_word) : manager(tree_manager), root(root_word) {}
  CheckedTree(const CheckedTree&) = delete;
  CheckedTree& operator=(const CheckedTree&) = delete;
  ~CheckedTree() { abandon(); }
  // Offer a new node under `key`; delete `key`; both compare the answer with the model, neither checks the structure.
  void insert(std::int64_t key);
  void remove(std::int64_t key);
  // The whole structure: order, heights, balance bits, threads, every node where the model has it with its value.
  testing::AssertionResult check() const;
  // The caller zeroes the root word and frees the nodes behind the manager's back.
  void abandon();
  NonzeroNode* node(std::int64_t key) const { return model.at(key).node; }

  struct Entry {
    NonzeroNode* node;
    double value;
  };
  NonzeroTree* manager;
  std::uint64_t* root;
  std::map<std::int64_t, Entry> model;

 private:
  static double next_value_;
};

// Whole numbers below n from a fixed seed.
class Dice {
 public:
  explicit Dice(std::uint64_t seed) : engine_(seed) {}
  std::int64_t below(std::int64_t n) { return static_cast<std::int64_t>(engine_() % static_cast<std::uint64_t>(n)); }
  std::vector<std::int64_t> permutation(std::int64_t n);

 private:
  std::mt19937_64 engine_;
};

}  // namespace sm::test
