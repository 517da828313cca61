// Nodes are carved from slabs, and one spare node is always ready: an insertion offers it to the tree, which either
// links it in or answers with the node that holds the key already, so that no node is ever allocated on its own.
#include "store/nodes.hpp"

#include <algorithm>

#include "frame/memory.hpp"

namespace sm {

namespace {

constexpr i64 kRootSlack = 21;  // a root array that grows reaches this many words past the row that made it grow

// Behind the root words of a symmetric matrix there is room for open_rows().
i64 words_behind_roots(const SmMatrix& m) {
  return is_symmetric_sparse(m) ? static_cast<i64>(sizeof(OpenRows) / sizeof(uint64_t)) : 0;
}

SmStatus take_roots(SmMatrix& m, i64 capacity, uint64_t*& roots) {
  return allocate(tree_pool(m), capacity + words_behind_roots(m), Fill::zero, roots);
}

SmStatus grow_roots(SmMatrix& m, i64 row) {
  if (row > SM_MAX_ELEMENTS - kRootSlack) return SM_TOO_LARGE;
  uint64_t* grown = nullptr;
  SM_TRY(take_roots(m, row + kRootSlack, grown));
  uint64_t*& roots = roots_of(m);
  std::copy_n(roots, m.row_capacity, grown);
  std::copy_n(roots + m.row_capacity, words_behind_roots(m), grown + row + kRootSlack);
  give_back(tree_pool(m), roots);
  roots = grown;
  m.row_capacity = row + kRootSlack;
  return SM_OK;
}

// A symmetric matrix stays square, so the larger index decides; (row, col) has row <= col there.
SmStatus cover_symmetric(SmMatrix& m, i64 col) {
  if (col < m.rows) return SM_OK;
  if (col >= m.row_capacity) SM_TRY(grow_roots(m, col));
  m.rows = m.cols = col + 1;
  m.value_count = (static_cast<double>(col) + 2.0) * (static_cast<double>(col) + 1.0) / 2.0;
  return SM_OK;
}

SmStatus cover_general(SmMatrix& m, i64 row, i64 col) {
  if (row < m.rows && col < m.cols) return SM_OK;
  if (col == INT64_MAX) return SM_TOO_LARGE;
  if (row >= m.row_capacity) SM_TRY(grow_roots(m, row));
  m.rows = std::max(m.rows, row + 1);
  m.cols = std::max(m.cols, col + 1);
  m.value_count = static_cast<double>(m.rows) * static_cast<double>(m.cols);
  return SM_OK;
}

}  // namespace

SmStatus take_slab(SmMatrix& m) {
  m.spare_node = nullptr;
  m.next_node = nullptr;
  SM_TRY(allocate(tree_pool(m), m.slab_nodes, Fill::zero, m.spare_node));
  m.slab_used = node_stride(m);
  m.next_node = m.spare_node + 1;
  return SM_OK;
}

SmStatus start_trees(SmMatrix& m, i64 slab_nodes) {
  m.slab_nodes = slab_nodes;
  m.slab_bytes = m.node_size * slab_nodes;
  SM_TRY(take_slab(m));
  return take_roots(m, m.row_capacity, roots_of(m));
}

SmStatus enter_node(SmMatrix& m, i64 row, i64 col, bool add, double value) {
  if (!m.tree || !m.spare_node || !roots_of(m)) return SM_NO_MEMORY;
  if (is_symmetric_sparse(m)) link_waiting(m);
  SM_TRY(is_symmetric_sparse(m) ? cover_symmetric(m, col) : cover_general(m, row, col));
  uint64_t* root = roots_of(m) + row;
  if (m.nnz >= SM_MAX_ELEMENTS && !m.tree->find(m.tree, root, &col)) return SM_TOO_LARGE;
  return enter_covered(m, root, col, add, value);
}

SmStatus seed_diagonal(SmMatrix& m) {
  NonzeroNode* slab = m.spare_node;
  bool leads_to_top = true;
  for (i64 i = 0; i < m.rows; ++i) {
    if (!m.spare_node) return SM_NO_MEMORY;
    const NonzeroNode* node = m.spare_node;
    SM_TRY(enter_covered(m, m.sym_roots + i, i, false, 0.0));
    // A host's own trees may keep something else in a root word than where the top node is.
    leads_to_top = leads_to_top && node_of(m.sym_roots[i]) == node;
  }
  if (!leads_to_top) never_wait(open_rows(m).waiting);
  open_rows(m).diagonal = slab;
  open_rows(m).seeded = std::min(m.rows, m.slab_nodes);
  return SM_OK;
}

}  // namespace sm
