// Link words of a node: an address and two tag bits.
//
// A thread (SM_LINK_THREAD) leads to the in-order neighbour instead of a child, and past either end of the tree to
// address 0. The balance bit (SM_LINK_BALANCE) of a link says that the subtree on its side is one level higher than the
// other one; at most one of a node's two bits is set, and none means equal heights.
#pragma once

#include <qxesm/host.h>

#include <cstddef>
#include <cstdint>

namespace sm::avl {

using Node = NonzeroNode;
using Word = std::uint64_t;

enum class Side : unsigned { left, right };

constexpr Side opposite(Side side) { return static_cast<Side>(1U - static_cast<unsigned>(side)); }

inline Word address_of(const Node* node) { return reinterpret_cast<Word>(node); }

inline Node* node_at(Word link) { return reinterpret_cast<Node*>(link & ~SM_LINK_TAGS); }

inline bool is_thread(Word link) { return (link & SM_LINK_THREAD) != 0; }

// The two link words lie one after the other: picking one by number instead of by a branch is worth a quarter of an
// insertion, because no processor guesses which side a key goes to.
static_assert(offsetof(Node, left) == 0 && offsetof(Node, right) == sizeof(Word));
inline Word& link_of(Node& node, Side side) { return reinterpret_cast<Word*>(&node)[static_cast<unsigned>(side)]; }

inline bool has_child(Node& node, Side side) { return !is_thread(link_of(node, side)); }

// The in-order neighbour or the child that the link leads to.
inline Node* target(Node& node, Side side) { return node_at(link_of(node, side)); }

// Both keep the balance bit, which belongs to the node and not to what the link leads to.
inline void set_child(Node& node, Side side, const Node* child) {
  Word& link = link_of(node, side);
  link = address_of(child) | (link & SM_LINK_BALANCE);
}
inline void set_thread(Node& node, Side side, const Node* neighbour) {
  Word& link = link_of(node, side);
  link = address_of(neighbour) | SM_LINK_THREAD | (link & SM_LINK_BALANCE);
}

inline bool is_higher(Node& node, Side side) { return (link_of(node, side) & SM_LINK_BALANCE) != 0; }

inline void set_even(Node& node) {
  node.left &= ~SM_LINK_BALANCE;
  node.right &= ~SM_LINK_BALANCE;
}
inline void set_higher(Node& node, Side side) {
  link_of(node, side) |= SM_LINK_BALANCE;
  link_of(node, opposite(side)) &= ~SM_LINK_BALANCE;
}

// The last node that links towards `side` reach from `node` without using a thread.
inline Node* outermost(Node* node, Side side) {
  while (has_child(*node, side)) node = target(*node, side);
  return node;
}

// The in-order neighbour of `node`, or null past the end.
inline Node* neighbour(Node* node, Side side) {
  Node* next = target(*node, side);
  return has_child(*node, side) ? outermost(next, opposite(side)) : next;
}

}  // namespace sm::avl
