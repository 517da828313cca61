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

// Shortcuts for the next insertions: for some trees, known by what their root word reads, the node that the last
// insertion ended at. Why the word is enough, wherever the caller's root array has been meanwhile: a node is the root
// of one tree at a time, so a word means the same tree until it is the word of another one; and by whatever operation a
// root word comes to read something else, the hint under the new word is replaced or dropped. A deletion drops that of
// its tree. A tree must therefore stay with one set of hints, that is, one manager.
struct Hint {
  Word word;  // 0: none
  Word last;  // the address of the node; in its low bits how often in a row the hint was no help, kTired at most
};
constexpr Word kTired = 4;
constexpr Word kHints = 64;

struct Hints {
  Hint slots[kHints];
  Word sample;  // the root word of some tree that a key was new to, for whoever looks at trees
};
// One in that many new nodes, chosen by address, makes its tree the sample.
constexpr Word kSampled = 64;

inline Hint& hint_of(Hints& hints, Word word) { return hints.slots[word / sizeof(Node) % kHints]; }

// The root word of some tree has become `word`, not by insert().
inline void forget(Hints& hints, Word word) { hint_of(hints, word) = {}; }

// Links `node` in under its key and returns it, or returns the node that holds the key. Cost: constant when the key
// is that of the hint's node, or falls on or before its neighbour on either side; else one descent from the root. To it
// add the climb that restores the balance, amortised constant for keys in ascending or descending order (tree.cpp).
Node* insert(Word& root, Node& node, Hints& hints);

// The node that holds `key`, or null.
Node* find(Word root, std::int64_t key);

// Unlinks the node that holds `key`; false when there is none.
bool remove(Word& root, std::int64_t key, Hints& hints);

// The node with the smallest key, or null.
Node* first(Word root);

}  // namespace sm::avl
