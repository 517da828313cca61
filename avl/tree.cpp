#include "avl/tree.hpp"

namespace sm::avl {
namespace {

Side towards(std::int64_t key, const Node& node) { return static_cast<Side>(key >= node.key); }

// Turns the child on `side` up into the place of `top`, and returns it. Heights are the caller's business.
Node* rotate(Node& top, Side side) {
  Node& child = *target(top, side);
  const Side inner = opposite(side);
  // The subtree between the two changes hands; where it is empty, the two thread to each other.
  if (has_child(child, inner)) {
    set_child(top, side, target(child, inner));
  } else {
    set_thread(top, side, &child);
  }
  set_child(child, inner, &top);
  return &child;
}

struct Balanced {
  Node* top;
  bool as_high_as_before;  // before the insertion or deletion that made the node two levels out
};

// Restores the balance of `top`, two levels higher on `side`; its bits still say one. Returns the subtree's new top.
Balanced restore(Node& top, Side side) {
  Node& child = *target(top, side);
  const Side inner = opposite(side);
  if (!is_higher(child, inner)) {
    // An even child, which only a deletion can leave here, keeps the subtree's height and both nodes uneven.
    const bool even = !is_higher(child, side);
    rotate(top, side);
    if (even) {
      set_higher(top, side);
      set_higher(child, inner);
    } else {
      set_even(top);
      set_even(child);
    }
    return {&child, even};
  }
  Node& middle = *target(child, inner);
  const bool to_side = is_higher(middle, side);
  const bool to_inner = is_higher(middle, inner);
  set_child(top, side, rotate(child, inner));
  rotate(top, side);
  set_even(top);
  set_even(child);
  set_even(middle);
  if (to_side) set_higher(top, inner);
  if (to_inner) set_higher(child, side);
  return {&middle, false};
}

// Where a key is: at `node`, or else in the gap that the node's thread on `side` spans.
struct Place {
  Node* node;  // null: not found
  Side side;
  bool held;
};

Place held_at(Node* node) { return {node, Side::left, true}; }

// The place of `key` if it is at `node`, at a neighbour, or in a gap beside it.
Place locate(std::int64_t key, Node* node) {
  if (key == node->key) return held_at(node);
  const Side side = towards(key, *node);
  Node* next = neighbour(node, side);
  if (next) {
    if (key == next->key) return held_at(next);
    if (towards(key, *next) == side) return {};
    // Of two neighbours one lies below the other, and only that one has a thread across the gap.
    if (has_child(*node, side)) return {next, opposite(side), false};
  }
  return {node, side, false};
}

// A subtree hangs on one of its two neighbours in key order: a right child follows its parent, a left child precedes
// it.
bool hangs_on(Node* before, const Node* top) {
  return before && has_child(*before, Side::right) && target(*before, Side::right) == top;
}

// The word that leads to the subtree `top` between `before` and `after`.
Word& word_above(Word& root, const Node* top, Node* before, Node* after) {
  if (hangs_on(before, top)) return before->right;
  return after && node_at(root) != top ? after->left : root;
}

// Makes `child` what `above` leads to, without touching the tags.
void replace_below(Word& above, const Node* child) { above = address_of(child) | (above & SM_LINK_BALANCE); }

// Restores the balance after `node` came in as a leaf between its neighbours `before` and `after`.
//
// Parents are found through the threads: the climb keeps the two neighbours of the subtree that it has reached. Its
// k-th level costs a walk of at most k links, down the sibling, and the whole climb less than the square of the height.
//
// Keys that ascend from the first on climb the right edge of the tree. Its node at height k comes to a climb either
// even, is passed, and leans right from then on; or leaning right, ends the climb and is rotated away, which leaves an
// even node at that height. Of the climbs that reach a level at most every second, rounded up, thus passes it, and n
// insertions cost no more than the sum of (k + 1)(n/2^k + 1) over the levels k, O(n): a constant each. Descending keys
// are the mirror image.
void grow(Word& root, Node* node, Node* before, Node* after) {
  Node* top = node;
  while (top != node_at(root)) {
    const bool right_child = hangs_on(before, top);
    const Side side = right_child ? Side::right : Side::left;
    Node* parent = right_child ? before : after;
    if (is_higher(*parent, opposite(side))) {
      set_even(*parent);
      return;
    }
    Node*& beside = right_child ? before : after;
    beside = target(*outermost(parent, opposite(side)), opposite(side));
    if (is_higher(*parent, side)) {
      Word& above = word_above(root, parent, before, after);
      replace_below(above, restore(*parent, side).top);
      return;
    }
    set_higher(*parent, side);
    top = parent;
  }
}

// Insertion beside `last`: null, with nothing changed, where its neighbours do not tell the place.
Node* insert_beside(Word& root, Node& node, Node* last) {
  const Place place = locate(node.key, last);
  if (!place.node || place.held) return place.node;
  Node* beyond = target(*place.node, place.side);
  link_of(node, place.side) = address_of(beyond) | SM_LINK_THREAD;
  link_of(node, opposite(place.side)) = address_of(place.node) | SM_LINK_THREAD;
  set_child(*place.node, place.side, &node);
  const bool in_front = place.side == Side::left;
  grow(root, &node, in_front ? beyond : place.node, in_front ? place.node : beyond);
  return &node;
}

// On what the functions below leave undone: an insertion waits for nodes that may be far from any cache, and what a
// processor can hold of the insertions after it decides how many of these waits go on at once. Stores are what it holds
// fewest of. So the usual ways have no frame, and end in calls.

void note(Hints& hints, Word root, const Node* last, Word misses) {
  hint_of(hints, root) = {root, address_of(last) | misses};
}

// The last step of an insertion: rotation below `critical`.
[[gnu::noinline]] Node* rotate_below(Word& root, Node& node, Word* critical, Hints& hints, Word misses) {
  Node& top = *node_at(*critical);
  replace_below(*critical, restore(top, towards(node.key, top)).top);
  note(hints, root, &node, misses);
  return &node;
}

// Links `node` in below `at`, where the descent ended. What can change its balance is the last uneven node on the way,
// or else the root, to which `critical` leads, and the even ones below it (Knuth's algorithm A).
[[gnu::noinline]] Node* link_below(Word& root, Node& node, Node* at, Word* critical, Hints& hints, Word misses) {
  const std::int64_t key = node.key;
  Side side = towards(key, *at);
  const Word gap = link_of(*at, side);
  link_of(node, side) = gap & ~SM_LINK_BALANCE;
  link_of(node, opposite(side)) = address_of(at) | SM_LINK_THREAD;
  link_of(*at, side) = address_of(&node) | (gap & SM_LINK_BALANCE);
  if (address_of(&node) / sizeof(Node) % kSampled == 0) hints.sample = root;

  Node& top = *node_at(*critical);
  side = towards(key, top);
  for (Node* p = target(top, side); p != &node;) {
    Word& below = link_of(*p, towards(key, *p));
    p = node_at(below);
    below |= SM_LINK_BALANCE;
  }
  Word& far = link_of(top, opposite(side));
  Word& near = link_of(top, side);
  if (far & SM_LINK_BALANCE) {
    far &= ~SM_LINK_BALANCE;
  } else if (!(near & SM_LINK_BALANCE)) {
    near |= SM_LINK_BALANCE;
  } else {
    return rotate_below(root, node, critical, hints, misses);
  }
  note(hints, root, &node, misses);
  return &node;
}

// Insertion with a descent from the root.
inline Node* insert_from_root(Word& root, Node& node, Hints& hints, Word misses) {
  const std::int64_t key = node.key;
  Word* critical = &root;
  Word* link = &root;  // leads to `at`
  Node* at = node_at(root);
  while (key != at->key) {
    critical = (at->left | at->right) & SM_LINK_BALANCE ? link : critical;
    link = &link_of(*at, towards(key, *at));
    const Word word = *link;
    if (is_thread(word)) return link_below(root, node, at, critical, hints, misses);
    at = node_at(word);
  }
  note(hints, root, at, misses);
  return at;
}

// A tired hint is tried now and then only: its node may be far from any cache.
constexpr std::int64_t kNowAndThen = 16;
static_assert(kTired < alignof(Node), "the low bits of an address");

[[gnu::noinline]] Node* insert_hinted(Word& root, Node& node, Hints& hints) {
  const Word word = hint_of(hints, root).last;
  const Word misses = word % alignof(Node);
  if (misses < kTired || node.key % kNowAndThen == 0) {
    if (Node* result = insert_beside(root, node, reinterpret_cast<Node*>(word - misses))) {
      note(hints, root, result, 0);
      return result;
    }
  }
  return insert_from_root(root, node, hints, misses < kTired ? misses + 1 : kTired);
}

[[gnu::noinline]] Node* plant(Word& root, Node& node, Hints& hints) {
  node.left = node.right = SM_LINK_THREAD;
  root = address_of(&node);
  note(hints, root, &node, 0);
  return &node;
}

// A tree of height h holds at least F(h + 2) - 1 nodes, F the Fibonacci numbers (Adelson-Velsky and Landis), which puts
// h below 1.4405 log2(n + 2). Nodes take 32 of at most 2^64 bytes, so n < 2^59 and h < 86.
constexpr int kMaxHeight = 96;

// The way down from the root to a node that is about to be unlinked.
struct Path {
  struct Step {
    Node* node;
    Side side;
  };
  Word* root;
  int length;
  Step steps[kMaxHeight];

  void push(Node* node, Side side) { steps[length++] = {node, side}; }
  // The word that leads to the node of step i, or, for i = length, to the node below the last step.
  Word& word_above(int i) { return i == 0 ? *root : link_of(*steps[i - 1].node, steps[i - 1].side); }
};

// Unlinks a node with at most one child. A lone child is a leaf, else the node would be out of balance.
void unlink_edge(Path& path, Node* node) {
  Word& above = path.word_above(path.length);
  const bool left = has_child(*node, Side::left);
  if (left || has_child(*node, Side::right)) {
    const Side side = left ? Side::left : Side::right;
    Node* child = target(*node, side);
    set_thread(*child, opposite(side), target(*node, opposite(side)));
    replace_below(above, child);
  } else if (path.length == 0) {
    above = 0;
  } else {
    const Path::Step& last = path.steps[path.length - 1];
    set_thread(*last.node, last.side, target(*node, last.side));
  }
}

// Unlinks a node with two children: its successor takes its place, so that no key moves from one node to another.
void unlink_inner(Path& path, Node* node) {
  const int place = path.length;
  Node* predecessor = outermost(target(*node, Side::left), Side::right);
  path.push(node, Side::right);
  Node* successor = target(*node, Side::right);
  while (has_child(*successor, Side::left)) {
    path.push(successor, Side::left);
    successor = target(*successor, Side::left);
  }
  if (path.length == place + 1) {
    // The right child itself keeps its right link and takes the balance of the place that it moves up to.
    const Word right = successor->right & ~SM_LINK_BALANCE;
    successor->right = right | (node->right & SM_LINK_BALANCE);
  } else {
    Node* parent = path.steps[path.length - 1].node;
    if (has_child(*successor, Side::right)) {
      set_child(*parent, Side::left, target(*successor, Side::right));
    } else {
      set_thread(*parent, Side::left, successor);
    }
    successor->right = node->right;
  }
  successor->left = node->left;
  set_thread(*predecessor, Side::right, successor);
  replace_below(path.word_above(place), successor);
  path.steps[place].node = successor;
}

// Restores the balance after the subtree below the last step became one level lower.
void shrink(Path& path) {
  for (int i = path.length - 1; i >= 0; --i) {
    Node* node = path.steps[i].node;
    const Side side = path.steps[i].side;
    if (is_higher(*node, side)) {
      set_even(*node);
    } else if (!is_higher(*node, opposite(side))) {
      set_higher(*node, opposite(side));
      return;
    } else {
      const Balanced balanced = restore(*node, opposite(side));
      replace_below(path.word_above(i), balanced.top);
      if (balanced.as_high_as_before) return;
    }
  }
}

}  // namespace

Node* insert(Word& root, Node& node, Hints& hints) {
  const Word word = root;
  if (word == 0) return plant(root, node, hints);
  if (hint_of(hints, word).word == word) return insert_hinted(root, node, hints);
  return insert_from_root(root, node, hints, 0);
}

Node* find(Word root, std::int64_t key) {
  Node* node = node_at(root);
  while (node && key != node->key) {
    const Word link = key < node->key ? node->left : node->right;
    node = is_thread(link) ? nullptr : node_at(link);
  }
  return node;
}

bool remove(Word& root, std::int64_t key, Hints& hints) {
  Path path;
  path.root = &root;
  path.length = 0;
  Node* node = node_at(root);
  while (node && key != node->key) {
    const Side side = towards(key, *node);
    path.push(node, side);
    node = has_child(*node, side) ? target(*node, side) : nullptr;
  }
  if (!node) return false;
  if (has_child(*node, Side::left) && has_child(*node, Side::right)) {
    unlink_inner(path, node);
  } else {
    unlink_edge(path, node);
  }
  shrink(path);
  forget(hints, root);
  return true;
}

Node* first(Word root) { return root == 0 ? nullptr : outermost(node_at(root), Side::left); }

}  // namespace sm::avl
