// A hub: the nodes of one large tree by key, for as long as keys come into it in no order.
//
// A descent into a tree that no cache holds is a chain of misses, each of which waits for the one before. Where the
// keys are dense, as the columns of a row that almost every record contributes to, a table of nodes by key and a set of
// the keys held answer in steps that do not wait for each other: whether the key is there, and which are its neighbours
// in key order. A new node is linked in between them at once, so that links, threads and order hold at any moment. Only
// the heights are let go meanwhile; settle() gives the tree its balance back, in one walk, before anything but another
// insertion or a search needs it.
//
// The set of keys is a tree of 64-bit words (P. van Emde Boas, R. Kaas and E. Zijlstra, "Design and implementation of
// an efficient priority queue", Mathematical Systems Theory 10 (1977) 99-127, here with a fixed branching).
#pragma once

#include "avl/links.hpp"

namespace sm::avl {

constexpr int kHubLevels = 8;  // 64^8 keys

struct Hub {
  MemoryPool* pool;  // of this hub alone
  Word word;         // the root word of the tree, which no insertion through the hub changes
  std::int64_t low;  // the key of slot 0
  std::uint64_t span;
  std::uint64_t count;
  Word base;             // slots hold addresses less this one, in units of 8 bytes
  std::uint32_t* slots;  // 0: no such key
  int levels;
  std::uint64_t* keys[kHubLevels];  // level 0: a bit for each slot; level k + 1: a bit for each word of level k
};

// Enters the tree into `hub` if it is large, its keys are dense enough and there is memory. Answers whether; `visited`
// is the number of nodes looked at. The table takes 4 bytes for every key between the smallest and the largest one and
// for some room beyond, kHubSparsest of them for a node at most.
constexpr std::uint64_t kHubSparsest = 16;
constexpr unsigned kHubLeastHeight = 12;
bool open_hub(Hub& hub, HostServices& services, Word root, std::uint64_t& visited);

// Links `node` in under its key and returns it, or returns the node that holds the key. Null, with the tree unchanged,
// for a key or an address that no table of this density can reach, or when memory for a larger one is short.
Node* insert(Hub& hub, HostServices& services, Node& node);

// The node that holds `key`, or null.
Node* find(const Hub& hub, std::int64_t key);

// Balances the tree, and stores its new root.
void settle(Hub& hub, Word& root);

// Gives the memory of the hub back; its tree is not looked at.
void close_hub(Hub& hub);

}  // namespace sm::avl
