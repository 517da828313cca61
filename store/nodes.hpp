// The trees of nonzeros: slabs of nodes, root arrays, insertion, walks.
#pragma once

#include "frame/core.hpp"
#include "store/layouts.hpp"
#include "store/waiting.hpp"

namespace sm {

// Where a link word, or a root word of the tree extension's trees, leads to.
inline NonzeroNode* node_of(uint64_t link) { return reinterpret_cast<NonzeroNode*>(link & ~SM_LINK_TAGS); }

// The root array and the pool of a sparse matrix's trees.
inline uint64_t*& roots_of(SmMatrix& m) { return is_symmetric_sparse(m) ? m.sym_roots : m.row_roots; }
inline MemoryPool* tree_pool(SmMatrix& m) { return is_symmetric_sparse(m) ? m.assembly_pool : m.pool; }

// Sizes slabs and roots for row_capacity rows and takes the first slab and the roots from the trees' pool.
[[nodiscard]] SmStatus start_trees(SmMatrix& m, i64 slab_nodes);

// A fresh slab, its first node the spare one. On failure there is no spare node, and entries are refused from then on.
[[nodiscard]] SmStatus take_slab(SmMatrix& m);

// Enters a zero on every diagonal position of a symmetric matrix whose trees were just started. 101 or 0.
[[nodiscard]] SmStatus seed_diagonal(SmMatrix& m);

// Enters (row, col), growing the matrix when the index is past its size. 101, 105, or 0.
[[nodiscard]] SmStatus enter_node(SmMatrix& m, i64 row, i64 col, bool add, double value);

inline i64 node_stride(const SmMatrix& m) { return (m.node_size + 7) & ~i64{7}; }

// The spare node has been linked in: count it and make the next one ready.
[[nodiscard]] inline SmStatus advance_spare(SmMatrix& m) {
  ++m.nnz;
  m.slab_used += node_stride(m);
  if (m.slab_used > m.slab_bytes) return take_slab(m);
  m.spare_node = m.next_node;
  m.next_node = m.spare_node + 1;
  return SM_OK;
}

// Enters a column into the tree at `root` of a matrix that covers it, has a spare node and is not full. 101 or 0.
[[nodiscard]] inline SmStatus enter_covered(SmMatrix& m, uint64_t* root, i64 col, bool add, double value) {
  m.spare_node->key = col;
  m.spare_node->value = value;
  NonzeroNode* node = m.tree->insert(m.tree, root, m.spare_node);
  // What is not kept over the call need not be saved for it.
  if (node == m.spare_node) return advance_spare(m);
  node->value = add ? node->value + m.spare_node->value : m.spare_node->value;
  return SM_OK;
}

// What an open symmetric sparse matrix keeps behind its root words: where the zeros of its diagonal were entered, and
// the entries that wait. The node of row i is diagonal + i for every row below `seeded`. It is the first of its row for
// as long as the matrix is open, because nothing left of the diagonal is taken and nothing is removed but by closing,
// which spares the diagonal.
struct OpenRows {
  NonzeroNode* diagonal;
  i64 seeded;
  WaitingEntries waiting;
};
inline OpenRows& open_rows(const SmMatrix& m) { return *reinterpret_cast<OpenRows*>(m.sym_roots + m.row_capacity); }

inline NonzeroNode* first_node(SmMatrix& m, i64 row) {
  uint64_t* roots = roots_of(m);
  return roots && m.tree && roots[row] ? m.tree->first(m.tree, roots + row) : nullptr;
}

// Calls f(row, node) for every stored node, rows and columns ascending. f may unlink the node it is given.
template <class F>
void for_each_node(SmMatrix& m, F&& f) {
  if (is_symmetric_sparse(m) && m.state == SM_STATE_OPEN) link_waiting(m);
  for (i64 row = 0; row < m.rows; ++row) {
    for (NonzeroNode* node = first_node(m, row); node;) {
      NonzeroNode* next = sm_node_next(node);
      f(row, *node);
      node = next;
    }
  }
}

// Unlinks a key; its node stays in its slab. True when it was there.
inline bool unlink_node(SmMatrix& m, i64 row, i64 col) {
  if (!m.tree || !m.tree->remove(m.tree, roots_of(m) + row, &col)) return false;
  --m.nnz;
  return true;
}

}  // namespace sm
