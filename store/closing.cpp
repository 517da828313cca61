// Closing: small entries go, and the trees of a symmetric matrix become compressed rows.
#include <cmath>

#include "store/checks.hpp"
#include "store/nodes.hpp"
#include "store/operations.hpp"

namespace sm {

namespace {

// The walk of one row, node by node as sm_node_next does it. In random order every node is a miss that waits for the
// one before it; before a subtree of some height is walked, all of it is therefore asked for level by level, where the
// nodes of a level do not wait for each other.
class RowWalk {
 public:
  NonzeroNode* next_of(const NonzeroNode* node) {
    NonzeroNode* next = node_of(node->right);
    if (node->right & SM_LINK_THREAD) {
      asked_for_ -= asked_for_ > 0;
      return next;
    }
    const bool asked = asked_for_ > 0;
    asked_for_ -= asked;
    if (next->left & SM_LINK_THREAD) return next;
    NonzeroNode* way[kHeight];  // the last nodes on the way down
    int depth = 0;
    for (way[0] = next; !(next->left & SM_LINK_THREAD); way[depth % kHeight] = next) {
      next = node_of(next->left);
      ++depth;
    }
    if (!asked && depth >= kLow) ask_for(way[depth < kHeight ? 0 : (depth + 1) % kHeight]);
    return next;
  }

 private:
  static constexpr int kHeight = 8;    // of what is asked for at a time, along its left edge
  static constexpr int kLow = 2;       // lower subtrees are walked as they come
  static constexpr int kNodes = 1024;  // asked for at a time at most

  void ask_for(const NonzeroNode* top) {
    const NonzeroNode* nodes[kNodes];
    nodes[0] = top;
    int count = 1;
    for (int i = 0; i < count; ++i) {
      for (const uint64_t link : {nodes[i]->left, nodes[i]->right}) {
        if ((link & SM_LINK_THREAD) || count == kNodes) continue;
        nodes[count] = node_of(link);
        __builtin_prefetch(nodes[count++]);
      }
    }
    asked_for_ = count;
  }

  int asked_for_ = 0;  // so many nodes ahead have been
};

// The first nodes of the rows, one row after the other. In random order every node is a miss that waits for the one
// before it, so what the rows ahead begin with is asked for early: two nodes of each, a row's second node when the
// diagonal before it is there, and its third when the second is.
class RowStarts {
 public:
  explicit RowStarts(SmMatrix& m) : m_(m) {
    if (!is_symmetric_sparse(m)) return;
    diagonal_ = open_rows(m).diagonal;
    seeded_ = open_rows(m).seeded;
  }
  NonzeroNode* of(i64 row) {
    if (row >= seeded_) return first_node(m_, row);
    NonzeroNode* diagonal = diagonal_ + row;
    if (row + kFar < seeded_) {
      __builtin_prefetch(node_of(diagonal[kFar].right));
      if (const NonzeroNode* second = node_of(diagonal[kNear].right)) __builtin_prefetch(node_of(second->right));
    }
    return diagonal;
  }

 private:
  static constexpr i64 kNear = 8;
  static constexpr i64 kFar = 16;
  SmMatrix& m_;
  NonzeroNode* diagonal_ = nullptr;
  i64 seeded_ = 0;
};

// Unlinks what is small and answers how many rows have no diagonal: those that came in by growth may have none, and it
// would be the first node, keys being at or above the row.
i64 drop_small_nodes(SmMatrix& m, double tolerance) {
  const bool keep_diagonal = m.kind == SM_KIND_SYMMETRIC;
  i64 without_diagonal = 0;
  RowStarts starts(m);
  for (i64 row = 0; row < m.rows; ++row) {
    NonzeroNode* node = starts.of(row);
    if (!node || node->key != row) ++without_diagonal;
    RowWalk walk;
    while (node) {
      NonzeroNode* next = walk.next_of(node);
      if (std::fabs(node->value) <= tolerance) {
        if (keep_diagonal && node->key == row) {
          node->value = 0.0;
        } else {
          unlink_node(m, row, node->key);
        }
      }
      node = next;
    }
  }
  return without_diagonal;
}

// No branch in the body, so that it vectorises.
void drop_small_values(double* values, i64 count, double tolerance) {
  for (i64 i = 0; i < count; ++i) values[i] = std::fabs(values[i]) <= tolerance ? 0.0 : values[i];
}

// The same count where nothing is dropped.
i64 rows_without_diagonal(SmMatrix& m) {
  i64 count = 0;
  for (i64 row = open_rows(m).seeded; row < m.rows; ++row) {
    const NonzeroNode* node = first_node(m, row);
    if (!node || node->key != row) ++count;
  }
  return count;
}

void fill_rows(SmMatrix& m, i64* row_start, i64* col_index, double* nz_values) {
  i64 k = 0;
  row_start[0] = 0;
  RowStarts starts(m);
  for (i64 row = 0; row < m.rows; ++row) {
    const NonzeroNode* node = starts.of(row);
    if (!node || node->key != row) {
      col_index[k] = row;
      nz_values[k++] = 0.0;
    }
    RowWalk walk;
    for (; node; node = walk.next_of(node)) {
      col_index[k] = node->key;
      nz_values[k++] = node->value;
    }
    row_start[row + 1] = k;
  }
}

SmStatus compress(SmMatrix& m, i64 without_diagonal) {
  const i64 count = m.nnz + without_diagonal;
  Scratch<i64> row_start;
  Scratch<i64> col_index;
  Scratch<double> nz_values;
  SM_TRY(need_pool(m));
  SM_TRY(row_start.take(m.pool, m.rows + 1, Fill::none));
  SM_TRY(col_index.take(m.pool, count, Fill::none));
  SM_TRY(nz_values.take(m.pool, count, Fill::none));
  fill_rows(m, row_start.data(), col_index.data(), nz_values.data());
  m.row_start = row_start.release();
  m.col_index = col_index.release();
  m.nz_values = nz_values.release();
  m.nnz = count;
  destroy_pool(m.assembly_pool);
  m.sym_roots = nullptr;
  m.spare_node = m.next_node = nullptr;
  return SM_OK;
}

}  // namespace

SmStatus close(SmMatrix& m, double tolerance) {
  if (m.nnz < 1) {
    m.state = SM_STATE_CLOSED;
    return SM_OK;
  }
  if (m.kind == SM_KIND_NONE) return SM_UNTYPED;
  if (m.state > SM_STATE_OPEN) return SM_OK;
  if (tolerance < 0.0) tolerance = m.instance->tolerances[3];
  const bool drops = !std::isnan(tolerance);
  if (is_general_sparse(m)) {
    if (drops) drop_small_nodes(m, tolerance);
  } else if (has_value_array(m)) {
    if (drops) drop_small_values(m.values, static_cast<i64>(m.value_count), tolerance);
  } else if (is_symmetric_sparse(m)) {
    link_waiting(m);
    SM_TRY(compress(m, drops ? drop_small_nodes(m, tolerance) : rows_without_diagonal(m)));
  } else {
    return SM_UNAVAILABLE;
  }
  m.state = SM_STATE_CLOSED;
  return SM_OK;
}

}  // namespace sm
