// Records: how they come into an instance, get a kind, and return to none.
#include "frame/instance.hpp"
#include "frame/memory.hpp"
#include "store/operations.hpp"

namespace sm {

namespace {

// A record belongs to the instance that made it: its memory does.
SmStatus enter_in_registry(SmInstance& instance, SmMatrix* m) {
  if (m->instance && m->instance != &instance) return SM_BAD_ARGUMENT;
  if (m->registry_index < 1 || m->registry_index > instance.matrix_count) return register_matrix(instance, m);
  instance.registry[m->registry_index - 1] = m;
  return SM_OK;
}

void start_record(SmInstance& instance, SmMatrix& m) {
  m.instance = &instance;
  m.state = SM_STATE_OPEN;
  m.definite = -1;
  m.log_det = missing();
  m.rank = -1;
  m.rows = m.cols = m.nnz = 0;
  m.value_count = 0.0;
  m.kind = SM_KIND_NONE;
  m.format = SM_FORMAT_NONE;
  m.row_start = nullptr;
  m.assembly_pool = nullptr;
  m.solver_word = 0;
}

void clear_factor(SmMatrix& m) {
  m.perm = m.inv_perm = nullptr;
  m.work = m.factor_scratch = m.factor_iju = m.factor_iu = m.factor_ju = m.factor_reserved = nullptr;
  m.factor_diag = m.factor_values = nullptr;
}

// A manager that cannot be had is stored as null; the first entry answers 101.
NonzeroTree* create_tree(SmInstance& instance) {
  static constexpr TreeParms kParms = {1, offsetof(NonzeroNode, key), 10, 1};
  TreeExtension* trees = instance.tree_extension;
  return trees ? trees->create_tree_manager(trees, &kParms, nullptr, "Nonzero Tree") : nullptr;
}

SmStatus check_type(std::int32_t kind, std::int32_t format) {
  const bool sparse = format == SM_FORMAT_SPARSE;
  const bool dense = is_dense_format(format);
  switch (kind) {
    case SM_KIND_GENERAL:
    case SM_KIND_SYMMETRIC:
      return sparse || dense ? SM_OK : SM_BAD_FORMAT;
    case SM_KIND_DIAGONAL:
      return dense ? SM_OK : SM_BAD_FORMAT;
    default:
      return SM_UNAVAILABLE;
  }
}

void set_type(SmInstance& instance, SmMatrix& m, std::int32_t kind, std::int32_t format) {
  m.values = nullptr;
  m.col_index = nullptr;  // and with it the ownership flag
  if (format == SM_FORMAT_SPARSE) {
    m.spare_node = m.next_node = nullptr;
    m.tree = create_tree(instance);
  }
  if (kind == SM_KIND_SYMMETRIC && format == SM_FORMAT_SPARSE) {
    m.sym_roots = nullptr;
    m.nz_values = nullptr;
    clear_factor(m);
    m.factor_block = 1;
  }
  m.kind = kind;
  m.format = format;
}

void release_tree(SmMatrix& m) {
  if (!m.tree) return;
  if (TreeInner* inner = m.tree->inner) {
    inner->reset(inner, 1, 1);
    m.tree->cleared_word = nullptr;
    inner->release(inner);
  }
  m.tree->destroy(m.tree);
  m.tree = nullptr;
}

}  // namespace

SmStatus make(SmInstance& instance, SmMatrix*& matrix, std::int32_t kind, std::int32_t format) {
  SmMatrix* m = matrix;
  if (!m) {
    SM_TRY(allocate(instance.pool, 1, Fill::zero, m));
    if (const SmStatus status = register_matrix(instance, m); status != SM_OK) {
      give_back(instance.pool, m);
      return status;
    }
  } else {
    SM_TRY(enter_in_registry(instance, m));
  }
  start_record(instance, *m);
  m->pool = create_pool(SM_POOL_MATRIX, nullptr, nullptr);
  if (!m->pool) return SM_NO_MEMORY;
  m->node_size = sizeof(NonzeroNode);
  if (const SmStatus status = check_type(kind, format); status != SM_OK) {
    destroy_pool(m->pool);
    return status;
  }
  set_type(instance, *m, kind, format);
  matrix = m;
  return SM_OK;
}

SmStatus make_sized(SmInstance& instance, SmMatrix*& matrix, std::int32_t kind, std::int32_t format, i64 rows,
                    i64 cols) {
  SM_TRY(make(instance, matrix, kind, format));
  return resize(*matrix, rows, cols);
}

void reset(SmMatrix& m) {
  release_tree(m);
  if (m.registry_index > 0 && m.instance) m.instance->registry[m.registry_index - 1] = nullptr;
  destroy_pool(m.pool);
  destroy_pool(m.assembly_pool);
  m.slab_nodes = m.slab_bytes = m.slab_used = 0;
  m.rows = m.cols = m.nnz = 0;
  m.value_count = 0.0;
  m.solver_word = 0;
  m.spare_node = m.next_node = nullptr;
  m.rank = -1;
  m.log_det = missing();
  m.values = nullptr;
  m.row_start = nullptr;
  m.col_index = nullptr;
  m.nz_values = nullptr;
  m.sym_roots = nullptr;
  clear_factor(m);
  m.kind = SM_KIND_NONE;
  m.format = SM_FORMAT_NONE;
  m.state = SM_STATE_OPEN;
}

}  // namespace sm
