#include "cholesky/cholesky_support.hpp"

#include <algorithm>
#include <cmath>

namespace sm::test {

namespace {

Nonzeros elements_of(const Problem& problem) {
  Nonzeros elements;
  for (const Entry& e : problem.upper) elements[{e.row, e.col}] = e.value;
  return elements;
}

}  // namespace

SmMatrix* new_sparse(Session& session, const Problem& problem, bool close) {
  return (close ? new_closed : new_entered)(session, kSymmetricSparse, problem.n, problem.n, elements_of(problem));
}

SmMatrix* new_packed(Session& session, const Problem& problem, std::int32_t format) {
  return new_entered(session, {SM_KIND_SYMMETRIC, format}, problem.n, problem.n, elements_of(problem));
}

SmMatrix* new_diagonal(Session& session, const std::vector<double>& d, std::int32_t format) {
  const auto n = static_cast<std::int64_t>(d.size());
  Nonzeros elements;
  for (std::int64_t i = 0; i < n; ++i) elements[{i, i}] = d[at(i)];
  return new_entered(session, {SM_KIND_DIAGONAL, format}, n, n, elements);
}

SmMatrix* new_general(Session& session, std::int64_t rows, std::int64_t cols) {
  return new_sized(session, kGeneralColumns, rows, cols);
}

Problem problem_of(const std::vector<std::vector<double>>& rows) {
  Problem p{"given", static_cast<std::int64_t>(rows.size()), {}};
  for (std::int64_t i = 0; i < p.n; ++i)
    for (std::int64_t j = i; j < p.n; ++j)
      if (i == j || rows[at(i)][at(j)] != 0.0) p.upper.push_back({i, j, rows[at(i)][at(j)]});
  return p;
}

std::vector<double> packed(const Problem& problem, std::int32_t format) {
  std::vector<double> v(at(problem.n * (problem.n + 1) / 2), 0.0);
  for (const Entry& e : problem.upper) v[at(packed_position(problem.n, format, e.row, e.col))] = e.value;
  return v;
}

Dense triangle_of_packed(const double* values, std::int64_t n, std::int32_t format) {
  Dense a(n, n);
  for (std::int64_t r = 0; r < n; ++r)
    for (std::int64_t c = r; c < n; ++c) a(r, c) = values[packed_position(n, format, r, c)];
  return a;
}

Dense dense_of_packed(const double* values, std::int64_t n, std::int32_t format) {
  Dense a = triangle_of_packed(values, n, format);
  for (std::int64_t r = 0; r < n; ++r)
    for (std::int64_t c = 0; c < r; ++c) a(r, c) = a(c, r);
  return a;
}

StoredRows rows_of(const SmMatrix* matrix) {
  if (!matrix->row_start) return {};  // of order 0
  return {words(matrix->row_start, matrix->rows + 1), words(matrix->col_index, matrix->nnz),
          bits(matrix->nz_values, matrix->nnz)};
}

Dense dense_of_rows(const SmMatrix* matrix) {
  Dense a(matrix->rows, matrix->rows);
  for (std::int64_t i = 0; i < matrix->rows; ++i)
    for (std::int64_t p = matrix->row_start[i]; p < matrix->row_start[i + 1]; ++p) {
      a(i, matrix->col_index[p]) = matrix->nz_values[p];
      a(matrix->col_index[p], i) = matrix->nz_values[p];
    }
  return a;
}

SmStatus bring_to(SmMatrix* matrix, std::int32_t state) {
  SmStatus status = SM_OK;
  if (state >= SM_STATE_ORDERED) status = qxsmmd(matrix);
  if (status == SM_OK && state >= SM_STATE_REORDERED) status = qxsmreorder(matrix);
  if (status == SM_OK && state >= SM_STATE_SYMBOLIC) status = qxsmsymbfact(matrix);
  if (status == SM_OK && state >= SM_STATE_FACTORED) status = qxsmnumfact(matrix);
  return status;
}

void impose_order(SmMatrix* matrix, const Indices& perm) {
  ASSERT_EQ(matrix->state, SM_STATE_ORDERED);
  ASSERT_EQ(static_cast<std::int64_t>(perm.size()), matrix->rows);
  for (std::int64_t k = 0; k < matrix->rows; ++k) {
    matrix->perm[k] = perm[at(k)];
    matrix->inv_perm[perm[at(k)]] = k;
  }
}

Indices natural_order(std::int64_t n) {
  Indices order;
  for (std::int64_t i = 0; i < n; ++i) order.push_back(i);
  return order;
}

void replace_work(SmMatrix* matrix, std::int64_t capacity) {
  MemoryPool* pool = matrix->pool;
  pool->free(pool, matrix->work);
  matrix->work = static_cast<std::int64_t*>(pool->allocate(pool, static_cast<std::uint64_t>(capacity) * 8, 0));
  ASSERT_NE(matrix->work, nullptr);
  matrix->work_capacity = capacity;
}

std::vector<Indices> stored_structure(const SmMatrix* matrix) {
  std::vector<Indices> structure(at(matrix->rows));
  for (std::int64_t k = 0; k < matrix->rows; ++k)
    for (std::int64_t p = matrix->factor_iu[k]; p < matrix->factor_iu[k + 1]; ++p)
      structure[at(k)].push_back(matrix->factor_ju[matrix->factor_iju[k] + (p - matrix->factor_iu[k])]);
  return structure;
}

std::int64_t words_needed(const SmMatrix* matrix) {
  const std::int64_t n = matrix->rows;
  return 5 * n + 2 + matrix->factor_iju[n - 1] + matrix->factor_iu[n];
}

Dense stored_u(const SmMatrix* matrix) {
  Dense u = identity(matrix->rows);
  for (std::int64_t k = 0; k < matrix->rows; ++k)
    for (std::int64_t p = matrix->factor_iu[k]; p < matrix->factor_iu[k + 1]; ++p)
      u(k, matrix->factor_ju[matrix->factor_iju[k] + (p - matrix->factor_iu[k])]) = -matrix->factor_values[p];
  return u;
}

std::vector<double> stored_reciprocals(const SmMatrix* matrix) { return doubles(matrix->factor_diag, matrix->rows); }

OwnValuesInRoom::OwnValuesInRoom(SmMatrix* matrix)
    : matrix_(matrix), block_(matrix->nz_values), room_(3 * sm::test::at(matrix->nnz), 0.5) {
  std::copy_n(block_, matrix->nnz, room_.begin() + matrix->nnz);
  matrix->nz_values = room_.data() + matrix->nnz;
}

OwnValuesInRoom::~OwnValuesInRoom() {
  std::copy_n(matrix_->nz_values, matrix_->nnz, block_);
  matrix_->nz_values = block_;
}

Dense solved_identity(SmMatrix* matrix) {
  const std::int64_t n = matrix->rows;
  std::vector<double> b(at(n * n), 0.0);
  std::vector<double> x(at(n * n), std::nan(""));
  for (std::int64_t i = 0; i < n; ++i) b[at(i * n + i)] = 1.0;
  EXPECT_EQ(qxsmsubst(matrix, b.data(), x.data(), static_cast<std::int32_t>(n)), SM_OK);
  return columns(x, n);
}

std::int64_t owned_blocks(const SmMatrix* matrix) {
  const auto one = [](const void* p) { return static_cast<std::int64_t>(p != nullptr); };
  if (matrix->kind == SM_KIND_SYMMETRIC && matrix->format == SM_FORMAT_SPARSE) {
    return one(matrix->row_start) + one(matrix->col_index) + one(matrix->nz_values) + one(matrix->perm) +
           one(matrix->inv_perm) + one(matrix->work) + one(matrix->factor_reserved);
  }
  return one(matrix->dense_factor) + (matrix->owns_values ? one(matrix->values) : 0);
}

StoredRows reordered_rows(const SmMatrix* m) {
  const std::int64_t n = m->rows;
  std::vector<Indices> cols(at(n));
  std::vector<std::vector<double>> values(at(n));
  for (std::int64_t i = 0; i < n; ++i)
    for (std::int64_t p = m->row_start[i]; p < m->row_start[i + 1]; ++p) {
      const std::int64_t j = m->col_index[p];
      const bool swap = m->inv_perm[j] < m->inv_perm[i];
      auto& row = cols[at(swap ? j : i)];
      auto& row_values = values[at(swap ? j : i)];
      const bool front = i == j;
      row.insert(front ? row.begin() : row.end(), swap ? i : j);
      row_values.insert(front ? row_values.begin() : row_values.end(), m->nz_values[p]);
    }
  StoredRows want{{0}, {}, {}};
  for (std::int64_t i = 0; i < n; ++i) {
    want.col_index.insert(want.col_index.end(), cols[at(i)].begin(), cols[at(i)].end());
    for (const std::uint64_t b : bits(values[at(i)])) want.value_bits.push_back(b);
    want.row_start.push_back(static_cast<std::int64_t>(want.col_index.size()));
  }
  return want;
}

}  // namespace sm::test
