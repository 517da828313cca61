// Copies: a clone keeps kind, format and, when it is sparse, the factor; a conversion writes the elements into another
// kind or format; a load fills a value array from the caller's.
//
//   convert from   into general   symmetric   diagonal
//   general             yes       124         124
//   symmetric           mirrored  yes         124
//   diagonal            yes       yes         yes
#include <algorithm>
#include <cstring>
#include <type_traits>
#include <utility>

#include "store/checks.hpp"
#include "store/operations.hpp"
#include "store/views.hpp"

namespace sm {

namespace {

constexpr bool converts(std::int32_t from, std::int32_t to) {
  switch (from) {
    case SM_KIND_GENERAL:
      return to == SM_KIND_GENERAL;
    case SM_KIND_SYMMETRIC:
      return to == SM_KIND_GENERAL || to == SM_KIND_SYMMETRIC;
    case SM_KIND_DIAGONAL:
      return to == SM_KIND_GENERAL || to == SM_KIND_SYMMETRIC || to == SM_KIND_DIAGONAL;
    default:
      return false;
  }
}

bool same_storage(const SmMatrix& a, const SmMatrix& b) { return a.kind == b.kind && a.format == b.format; }

Gate may_copy(const SmMatrix& source) {
  SM_STOP_IF(source.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(!is_closed_or_empty(source), SM_NOT_CLOSED);
  return {};
}

// Every stored element, zeros included, up to the first that is refused. Reordered rows hold pairs either way round; a
// symmetric target takes them from the upper triangle, a general one both ways.
SmStatus enter_elements(SmMatrix& source, SmMatrix& target) {
  return visit(source, [&](const auto& view) {
    constexpr bool one_triangle = std::remove_cvref_t<decltype(view)>::one_triangle;
    const bool mirrored = one_triangle && target.kind == SM_KIND_GENERAL;
    SmStatus status = SM_OK;
    view.any([&](i64 i, i64 j, double v) {
      if (one_triangle && i > j) std::swap(i, j);
      status = assign(target, i, j, false, v);
      if (status == SM_OK && mirrored && i != j) status = assign(target, j, i, false, v);
      return status != SM_OK;
    });
    return status;
  });
}

template <class T>
SmStatus copy_block(MemoryPool* pool, const T* block, i64 count, Scratch<T>& copy) {
  if (!block) return SM_OK;
  SM_TRY(copy.take(pool, count));
  std::copy_n(block, count, copy.data());
  return SM_OK;
}

// Where a pointer into the source's workspace points in the copy.
template <class T>
T* rebased(const SmMatrix& source, const SmMatrix& target, const T* inner) {
  if (!inner || !source.work) return nullptr;
  return reinterpret_cast<T*>(target.work + (reinterpret_cast<const i64*>(inner) - source.work));
}

void rebase_factor(const SmMatrix& source, SmMatrix& target) {
  target.factor_scratch = rebased(source, target, source.factor_scratch);
  target.factor_diag = rebased(source, target, source.factor_diag);
  target.factor_values = rebased(source, target, source.factor_values);
  target.factor_iju = rebased(source, target, source.factor_iju);
  target.factor_iu = rebased(source, target, source.factor_iu);
  target.factor_ju = rebased(source, target, source.factor_ju);
}

// The compressed rows with whatever of ordering and factor there is. All blocks are had before the target, which sizing
// left open, changes; its trees then go, as when it is closed.
SmStatus clone_rows(const SmMatrix& source, SmMatrix& target) {
  const i64 n = source.rows;
  Scratch<i64> row_start;
  Scratch<i64> col_index;
  Scratch<double> nz_values;
  Scratch<i64> perm;
  Scratch<i64> inv_perm;
  Scratch<i64> work;
  SM_TRY(need_pool(target));
  SM_TRY(copy_block(target.pool, source.row_start, n + 1, row_start));
  SM_TRY(copy_block(target.pool, source.col_index, source.nnz, col_index));
  SM_TRY(copy_block(target.pool, source.nz_values, source.nnz, nz_values));
  SM_TRY(copy_block(target.pool, source.perm, n, perm));
  SM_TRY(copy_block(target.pool, source.inv_perm, n, inv_perm));
  SM_TRY(copy_block(target.pool, source.work, source.work_capacity, work));
  target.row_start = row_start.release();
  target.col_index = col_index.release();
  target.nz_values = nz_values.release();
  target.perm = perm.release();
  target.inv_perm = inv_perm.release();
  target.work = work.release();
  target.work_capacity = source.work_capacity;
  target.factor_block = source.factor_block;
  rebase_factor(source, target);
  destroy_pool(target.assembly_pool);
  target.sym_roots = nullptr;
  target.spare_node = target.next_node = nullptr;
  target.nnz = source.nnz;
  target.log_det = source.log_det;
  target.rank = source.rank;
  target.definite = source.definite;
  target.state = source.state;
  return SM_OK;
}

// Whether `p` points into a block of `count` words.
bool is_inside(const double* p, const void* block, i64 count) {
  const auto behind = reinterpret_cast<std::uintptr_t>(p) - reinterpret_cast<std::uintptr_t>(block);
  return block && behind / sizeof(double) < static_cast<std::uintptr_t>(count);
}

// Whether `values` lies in an array that goes back when the matrix is built anew.
bool is_own_array(const SmMatrix& m, const double* values) {
  if (is_symmetric_sparse(m)) {
    return is_inside(values, m.nz_values, m.nnz) || is_inside(values, m.work, m.work_capacity);
  }
  if (!has_value_array(m)) return false;
  const i64 count = static_cast<i64>(m.value_count);
  return (m.owns_values && is_inside(values, m.values, count)) || is_inside(values, m.dense_factor, count);
}

SmStatus rebuild(SmMatrix& m, i64 rows, i64 cols, std::int32_t kind, std::int32_t format) {
  SM_TRY(resize(m, 0, 0));
  reset(m);  // gives the pools back, which typing a record anew would forget
  SmMatrix* handle = &m;
  SM_TRY(make(*m.instance, handle, kind, format));
  return resize(m, rows, cols);
}

}  // namespace

SmStatus clone(SmMatrix& source, SmMatrix& target, bool reassemble) {
  if (&source == &target) return SM_OK;
  SM_PASS(may_copy(source));
  target.solver_word = source.solver_word;
  SM_TRY(resize(target, source.rows, source.cols));
  if (source.nnz < 1) {
    const bool both_sparse = is_symmetric_sparse(source) && is_symmetric_sparse(target);
    if (both_sparse && source.rows < 1 && !reassemble) target.state = source.state;
    return SM_OK;
  }
  if (!same_storage(source, target)) return SM_KIND_MISMATCH;
  if (is_symmetric_sparse(source) && !reassemble) return clone_rows(source, target);
  if (source.format == SM_FORMAT_SPARSE) return enter_elements(source, target);
  std::copy_n(source.values, static_cast<i64>(source.value_count), target.values);
  return SM_OK;
}

SmStatus convert(SmMatrix& source, SmMatrix& target, bool reassemble) {
  if (&source == &target) return SM_OK;
  SM_PASS(may_copy(source));
  if (same_storage(source, target)) return clone(source, target, reassemble);
  SM_TRY(resize(target, source.rows, source.cols));
  if (!converts(source.kind, target.kind)) return SM_UNAVAILABLE;
  if (source.nnz > 0) SM_TRY(enter_elements(source, target));
  return is_symmetric_sparse(target) ? close(target, 0.0) : SM_OK;
}

SmStatus load(const double* values, SmMatrix& m, i64 rows, i64 cols, std::int32_t kind, std::int32_t format) {
  if (!values) return SM_OK;
  if (format == SM_FORMAT_SPARSE) return SM_UNAVAILABLE;
  const bool has_shape = m.kind == kind && m.format == format && m.rows == rows && m.cols == cols;
  const bool has_no_values = rows > 0 && !m.values;  // a sizing failed
  if (!has_shape || has_no_values) {
    if (is_own_array(m, values)) return SM_BAD_ARGUMENT;  // it would be given back before it is read
    SM_TRY(rebuild(m, rows, cols, kind, format));
  }
  if (m.value_count < 1.0) return SM_OK;
  std::memmove(m.values, values, static_cast<std::size_t>(m.value_count) * sizeof(double));
  void_results(m);
  return SM_OK;
}

}  // namespace sm
