// A threaded, height-balanced tree of nonzeros, known by the address of its root word alone.
//
// Balance: G. M. Adelson-Velsky and E. M. Landis, "An algorithm for the organization of information", Doklady Akademii
// Nauk SSSR 146 (1962) 263-266. Insertion and deletion: D. E. Knuth, The Art of Computer Programming, vol. 3, 2nd ed.
// (1998), section 6.2.3. Threads: A. J. Perlis and C. Thornton, "Symbol manipulation by threaded lists", CACM 3 (1960)
// 195-204.
//
// The root word is the address of the root node without tags, or 0 for an empty tree. Nodes belong to the caller; only
// their link words are written here, so that a node keeps its key and value for as long as it is linked in.
#pragma once

#include "avl/links.hpp"

namespace sm::avl {

// A shortcut for the next insertion: the node that the last one ended at, good for the tree whose root word stands
// at `root` and still reads `word`. Why an equal word is enough: an insertion always replaces the hint and a deletion
// drops it, so the tree under an equal word is as the hint left it, wherever the caller's root array has been
// meanwhile. A tree must therefore stay with one hint, that is, one manager.
struct Hint {
  const Word* root;
  Word word;
  Node* last;
  std::int64_t deep;  // descents of insertions that went below kDeep nodes, for whoever wants to know
};
constexpr int kDeep = 12;

// Links `node` in under its key and returns it, or returns the node that holds the key. Cost: constant when the key
// is that of the hint's node, or falls on or before its neighbour on either side; else one descent from the root. To it
// add the climb that restores the balance, amortised constant for keys in ascending or descending order (tree.cpp).
Node* insert(Word& root, Node& node, Hint& hint);

// The node that holds `key`, or null.
Node* find(Word root, std::int64_t key);

// Unlinks the node that holds `key`; false when there is none.
bool remove(Word& root, std::int64_t key, Hint& hint);

// The node with the smallest key, or null.
Node* first(Word root);

}  // namespace sm::avl
