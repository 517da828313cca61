// The vertices by degree, the most recent first, for an ordering that may learn a degree late.
//
// Ties of the least degree go to the vertex whose degree was due last, so every vertex has a time: when its degree was
// due. A list is a pairing heap on these times (Fredman, Sedgewick, Sleator, Tarjan, "The pairing heap: a new form of
// self-adjusting heap", Algorithmica 1 (1986) 111-129). A vertex that enters at once is newer than all others: it
// becomes the root and the old root its only child. So long as nobody comes late a heap is a stack, linked both ways,
// and a vertex leaves it from anywhere without a comparison, because its children take its place.
#pragma once

#include "frame/core.hpp"

namespace sm {

// What is known of a degree: itself, or a bound from below.
enum class Known : i64 { exact = 0, bound = 1 };

// Node has the members child, sibling, before and degree, reached as graph[v].vertex.
template <class Index, class Node>
class DegreeLists {
 public:
  static constexpr Index kNone = static_cast<Index>(-1);
  static constexpr Index kOutside = static_cast<Index>(-2);  // `before` of a vertex that is in no list

  // head: n + 1 places, cleared here; time: n words.
  DegreeLists(Node* graph, Index* head, i64* time, Index n) : graph_(graph), head_(head), time_(time) {
    for (Index d = 0; d <= n; ++d) head_[d] = kNone;
  }

  bool holds(Index v) const { return at(v).before != kOutside; }
  Known known(Index v) const { return static_cast<Known>(time_[v] & 1); }

  void insert_newest(Index v, Index degree, Known known) {
    time_[v] = clock_ | static_cast<i64>(known);
    clock_ += 2;
    Index& head = head_[degree];
    auto& entry = at(v);
    entry.degree = degree;
    entry.child = head;
    entry.sibling = kNone;
    entry.before = kNone;
    if (head != kNone) at(head).before = v;
    head = v;
    if (degree < least_) least_ = degree;
  }

  // A vertex that has left the lists comes back with its degree, at the time that it had.
  void insert_late(Index v, Index degree, Known known) {
    time_[v] = (time_[v] & ~i64{1}) | static_cast<i64>(known);
    auto& entry = at(v);
    entry.degree = degree;
    entry.child = entry.sibling = entry.before = kNone;
    Index& head = head_[degree];
    head = head == kNone ? v : meld(head, v);
    if (degree < least_) least_ = degree;
  }

  void remove(Index v) {
    auto& entry = at(v);
    Index heir = entry.child;
    if (heir != kNone && at(heir).sibling != kNone) heir = meld_all(heir);
    if (heir != kNone) {
      at(heir).sibling = entry.sibling;
      if (entry.sibling != kNone) at(entry.sibling).before = heir;
    } else {
      heir = entry.sibling;
    }
    const Index before = entry.before;
    entry.before = kOutside;
    if (heir != kNone) at(heir).before = before;
    if (before == kNone) {
      head_[entry.degree] = heir;
    } else if (at(before).child == v) {
      at(before).child = heir;
    } else {
      at(before).sibling = heir;
    }
  }

  // The newest vertex of the least degree. There must be one.
  Index first() {
    while (head_[least_] == kNone) ++least_;
    return head_[least_];
  }

 private:
  auto& at(Index v) const { return graph_[v].vertex; }

  // Two roots become one: the older goes below the newer.
  Index meld(Index a, Index b) const {
    if (time_[a] < time_[b]) {
      const Index newer = b;
      b = a;
      a = newer;
    }
    auto& root = at(a);
    auto& below = at(b);
    below.sibling = root.child;
    if (root.child != kNone) at(root.child).before = b;
    below.before = a;
    root.child = b;
    root.sibling = kNone;
    return a;
  }

  // One root of a row of siblings, whose links it answers unset: pairs from the left, then all pairs from the right.
  Index meld_all(Index first) const {
    Index pairs = kNone;
    while (first != kNone) {
      const Index second = at(first).sibling;
      if (second == kNone) {
        at(first).sibling = pairs;
        pairs = first;
        break;
      }
      const Index rest = at(second).sibling;
      const Index root = meld(first, second);
      at(root).sibling = pairs;
      pairs = root;
      first = rest;
    }
    Index all = pairs;
    Index rest = at(all).sibling;
    at(all).sibling = kNone;
    while (rest != kNone) {
      const Index next = at(rest).sibling;
      all = meld(all, rest);
      rest = next;
    }
    return all;
  }

  Node* graph_;
  Index* head_;
  i64* time_;
  i64 clock_ = 0;
  Index least_ = 0;
};

}  // namespace sm
