// The trees of nonzeros: slabs of nodes, root arrays, insertion, walks.
#pragma once

#include "frame/core.hpp"
#include "store/layouts.hpp"

namespace sm {

// The root array and the pool of a sparse matrix's trees.
inline uint64_t*& roots_of(SmMatrix& m) { return is_symmetric_sparse(m) ? m.sym_roots : m.row_roots; }
inline MemoryPool* tree_pool(SmMatrix& m) { return is_symmetric_sparse(m) ? m.assembly_pool : m.pool; }

// Sizes slabs and roots for row_capacity rows and takes the first slab and the roots from the trees' pool.
[[nodiscard]] SmStatus start_trees(SmMatrix& m, i64 slab_nodes);

// Enters (row, col), growing the matrix when the index is past its size. 101, 105, or 0.
[[nodiscard]] SmStatus enter_node(SmMatrix& m, i64 row, i64 col, bool add, double value);

inline NonzeroNode* first_node(SmMatrix& m, i64 row) {
  uint64_t* roots = roots_of(m);
  return roots && m.tree && roots[row] ? m.tree->first(m.tree, roots + row) : nullptr;
}

// Calls f(row, node) for every stored node, rows and columns ascending. f may unlink the node it is given.
template <class F>
void for_each_node(SmMatrix& m, F&& f) {
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
