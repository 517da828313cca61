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

// Node has the members child, sibling, before and degree, reached as graph[v].vertex. There is one more node than
// vertices: it ends the links, so that they can be set without asking whether they lead anywhere.
template <class Index, class Node>
class DegreeLists {
 public:
  static constexpr Index kOutside = static_cast<Index>(-1);  // `before` of a vertex that is in no list

  // head: n places; time: n words. Degrees are 1 to n.
  DegreeLists(Node* graph, Index* head, i64* time, Index n) : graph_(graph), head_(head), time_(time), none_(n) {}

  void clear() {
    for (Index d = 0; d < none_; ++d) head_[d] = none_;
    at(none_).child = at(none_).sibling = none_;
  }
  bool holds(Index v) const { return at(v).before != kOutside; }
  Known known(Index v) const { return static_cast<Known>(time_[v] & 1); }

  void insert_newest(Index v, Index degree, Known known) {
    auto& entry = at(v);
    Index& head = head_[degree - 1];
    at(head).before = v;
    time_[v] = clock_ | static_cast<i64>(known);
    clock_ += 2;
    entry.degree = degree;
    entry.child = head;
    entry.sibling = none_;
    entry.before = none_;
    head = v;
    least_ = degree < least_ ? degree : least_;
  }

  // A vertex that has left the lists comes back with its degree, at the time that it had.
  void insert_late(Index v, Index degree, Known known) {
    auto& entry = at(v);
    time_[v] = (time_[v] & ~i64{1}) | static_cast<i64>(known);
    entry.degree = degree;
    entry.child = entry.sibling = entry.before = none_;
    Index& head = head_[degree - 1];
    head = head == none_ ? v : meld(head, v);
    if (degree < least_) least_ = degree;
  }

  void remove(Index v) {
    auto& entry = at(v);
    Index heir = entry.child;
    if (at(heir).sibling != none_) heir = meld_all(heir);
    if (entry.sibling != none_) {
      at(entry.sibling).before = heir == none_ ? entry.before : heir;
      if (heir == none_) {
        heir = entry.sibling;
      } else {
        at(heir).sibling = entry.sibling;
      }
    }
    const Index before = entry.before;
    entry.before = kOutside;
    at(heir).before = before;
    Index* const link = before == none_ ? &head_[entry.degree - 1] : &at(before).child;
    *(*link == v ? link : &at(before).sibling) = heir;
  }

  // The newest vertex of this degree; the node at the end of links when there is none.
  Index top(Index degree) const { return head_[degree - 1]; }

  // The newest vertex of the least degree. There must be one.
  Index first() {
    while (head_[least_ - 1] == none_) ++least_;
    return head_[least_ - 1];
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
    at(root.child).before = b;
    below.before = a;
    root.child = b;
    root.sibling = none_;
    return a;
  }

  // One root of a row of siblings, whose links it answers unset: pairs from the left, then all pairs from the right.
  Index meld_all(Index first) const {
    Index pairs = none_;
    while (first != none_) {
      const Index second = at(first).sibling;
      if (second == none_) {
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
    at(all).sibling = none_;
    while (rest != none_) {
      const Index next = at(rest).sibling;
      all = meld(all, rest);
      rest = next;
    }
    return all;
  }

  Node* graph_;
  Index* head_;  // of the list of each degree, from 1 on
  i64* time_;
  Index none_;
  i64 clock_ = 0;
  Index least_ = 1;
};

}  // namespace sm
