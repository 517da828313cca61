#include "support/matrices.hpp"

#include <algorithm>
#include <cstring>

namespace sm::test {

SmMatrix* new_typed(Session& session, Shape shape) {
  SmMatrix* m = nullptr;
  EXPECT_EQ(session.fn().qxsmnew(session.instance(), &m, shape.kind, shape.format), SM_OK) << name_of(shape);
  return m;
}

SmMatrix* new_sized(Session& session, Shape shape, std::int64_t rows, std::int64_t cols) {
  SmMatrix* m = new_typed(session, shape);
  EXPECT_EQ(session.fn().qxsmresize(m, rows, cols), SM_OK) << name_of(shape);
  return m;
}

SmMatrix* new_entered(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, const Nonzeros& elements) {
  SmMatrix* m = new_sized(session, shape, rows, cols);
  for (const auto& [place, value] : elements) {
    if (!has_place(shape, place.first, place.second)) continue;
    EXPECT_EQ(session.fn().qxsmassign(m, place.first, place.second, 0, value), SM_OK) << name_of(shape);
  }
  return m;
}

SmMatrix* new_closed(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, const Nonzeros& elements) {
  SmMatrix* m = new_entered(session, shape, rows, cols, elements);
  EXPECT_EQ(session.fn().qxsmclose(m, kNan), SM_OK);
  return m;
}

namespace {

Nonzeros nonzeros_of(const Dense& a) {
  Nonzeros elements;
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c)
      if (a(r, c) != 0.0L) elements[{r, c}] = static_cast<double>(a(r, c));
  return elements;
}

}  // namespace

SmMatrix* build(Session& session, Shape shape, const Dense& a) {
  return new_closed(session, shape, a.rows(), a.cols(), nonzeros_of(a));
}

SmMatrix* build_open(Session& session, const Dense& a) {
  return new_entered(session, kSymmetricSparse, a.rows(), a.cols(), nonzeros_of(a));
}

SmMatrix* new_untyped(Session& session) {
  SmMatrix* m = new_typed(session, kDiagonalRows);
  EXPECT_EQ(session.fn().qxsmdelete(m), SM_OK);
  return m;
}

SmMatrix* new_untyped_with_an_entry(Session& session, std::int32_t state) {
  SmMatrix* m = new_untyped(session);
  m->nnz = 1;
  m->state = state;
  return m;
}

SmMatrix* new_open_tied(Session& session, std::vector<double>& data, std::int64_t rows, std::int64_t cols,
                        std::int32_t kind, std::int32_t format) {
  SmMatrix* m = new_untyped(session);
  EXPECT_EQ(qxsmtie(m, data.data(), rows, cols, kind, format), SM_OK);
  EXPECT_EQ(m->state, SM_STATE_OPEN);
  EXPECT_EQ(m->pool, nullptr);
  return m;
}

SmMatrix* new_tied(Session& session, Shape shape, std::vector<double>& data, std::int64_t rows, std::int64_t cols) {
  SmMatrix* m = new_open_tied(session, data, rows, cols, shape.kind, shape.format);
  EXPECT_EQ(session.fn().qxsmclose(m, kNan), SM_OK);
  return m;
}

SmMatrix* new_without_values(Session& session, Shape shape, std::int64_t n) {
  SmMatrix* m = new_typed(session, shape);
  session.host().fail_request(0, false);
  EXPECT_EQ(session.fn().qxsmresize(m, n, n), SM_NO_MEMORY);
  EXPECT_EQ(session.host().stop_failing(), 1);
  EXPECT_EQ(m->values, nullptr);
  EXPECT_EQ(m->rows, n);
  return m;
}

SmMatrix* new_without_rows(Session& session, std::int64_t n) {
  SmMatrix* m = new_sized(session, kSymmetricSparse, n, n);
  EXPECT_EQ(session.fn().qxsmresize(m, n, n + 1), SM_NOT_SQUARE);
  EXPECT_EQ(m->state, SM_STATE_CLOSED);
  EXPECT_EQ(m->row_start, nullptr);
  return m;
}

Unclosed unclosed(Session& session, Shape shape) {
  Unclosed open;
  if (is_sparse(shape)) {
    open.matrix = new_entered(session, shape, 3, 3, {{{0, 1}, 1.5}});
    open.matrix->state = SM_STATE_OPEN;  // where a symmetric one is anyway
  } else {
    open.data.assign(9, 1.5);
    open.matrix = new_open_tied(session, open.data, 3, 3, shape.kind, shape.format);
  }
  return open;
}

Nonzeros walk(SmMatrix* matrix, std::uint64_t* roots) {
  Nonzeros out;
  for (std::int64_t row = 0; row < matrix->rows; ++row) {
    std::int64_t last = -1;
    for (const NonzeroNode* node = matrix->tree->first(matrix->tree, &roots[row]); node; node = sm_node_next(node)) {
      EXPECT_GT(node->key, last) << "row " << row;
      last = node->key;
      out[{row, node->key}] = node->value;
    }
  }
  EXPECT_EQ(static_cast<std::int64_t>(out.size()), matrix->nnz);
  return out;
}

Nonzeros compressed(const SmMatrix* matrix) {
  Nonzeros out;
  if (!matrix->row_start || !matrix->col_index || !matrix->nz_values) {
    ADD_FAILURE() << "no compressed rows";
    return out;
  }
  EXPECT_EQ(matrix->row_start[0], 0);
  for (std::int64_t row = 0; row < matrix->rows; ++row) {
    const std::int64_t begin = matrix->row_start[row];
    const std::int64_t end = matrix->row_start[row + 1];
    EXPECT_LT(begin, end) << "row " << row << " has no diagonal";
    if (begin >= end) return out;
    EXPECT_EQ(matrix->col_index[begin], row) << "the diagonal comes first";
    for (std::int64_t p = begin; p < end; ++p) {
      if (p > begin) {
        EXPECT_GT(matrix->col_index[p], matrix->col_index[p - 1]) << "row " << row;
      }
      out[{row, matrix->col_index[p]}] = matrix->nz_values[p];
    }
  }
  EXPECT_EQ(matrix->row_start[matrix->rows], matrix->nnz);
  EXPECT_EQ(static_cast<std::int64_t>(out.size()), matrix->nnz);
  return out;
}

namespace {

// Of a reordered matrix, whose entries stand on either side of the diagonal.
Nonzeros in_any_order(const SmMatrix* m) {
  Nonzeros out;
  for (std::int64_t r = 0; r < m->rows; ++r)
    for (std::int64_t p = m->row_start[r]; p < m->row_start[r + 1]; ++p)
      out[std::minmax(r, m->col_index[p])] = m->nz_values[p];
  EXPECT_EQ(static_cast<std::int64_t>(out.size()), m->nnz);
  return out;
}

Nonzeros in_array(const SmMatrix* m, const double* values) {
  Nonzeros out;
  if (!values) return out;
  lay_out(shape_of(m), m->rows, m->cols, [&](std::int64_t r, std::int64_t c, std::int64_t slot) {
    out[{r, c}] = values[slot];
  });
  EXPECT_EQ(static_cast<std::int64_t>(out.size()), m->nnz);
  return out;
}

}  // namespace

Nonzeros entries(SmMatrix* m, const double* values) {
  if (shape_of(m) == kGeneralSparse) return m->row_roots ? walk(m, m->row_roots) : Nonzeros{};
  if (shape_of(m) != kSymmetricSparse) return in_array(m, values ? values : m->values);
  if (m->sym_roots) return walk(m, m->sym_roots);
  if (!m->row_start) return {};
  return m->state <= SM_STATE_ORDERED ? compressed(m) : in_any_order(m);
}

Dense contents(SmMatrix* matrix, const double* values) {
  Dense a(matrix->rows, matrix->cols);
  for (const auto& [place, value] : entries(matrix, values)) {
    a(place.first, place.second) = value;
    if (matrix->kind == SM_KIND_SYMMETRIC) a(place.second, place.first) = value;
  }
  return a;
}

std::vector<double> laid_out(Shape shape, const Dense& a) {
  std::vector<double> values;
  lay_out(shape, a.rows(), a.cols(),
          [&](std::int64_t r, std::int64_t c, std::int64_t) { values.push_back(static_cast<double>(a(r, c))); });
  return values;
}

void expect_voided(const SmMatrix* m) {
  EXPECT_EQ(m->rank, 0);
  EXPECT_TRUE(is_missing(m->log_det));
}

void expect_no_factor(const SmMatrix* m) {
  EXPECT_EQ(m->perm, nullptr);
  EXPECT_EQ(m->inv_perm, nullptr);
  EXPECT_EQ(m->nz_values, nullptr);
  EXPECT_EQ(m->work, nullptr);
  EXPECT_EQ(m->factor_scratch, nullptr);
  EXPECT_EQ(m->factor_diag, nullptr);
  EXPECT_EQ(m->factor_values, nullptr);
  EXPECT_EQ(m->factor_iju, nullptr);
  EXPECT_EQ(m->factor_iu, nullptr);
  EXPECT_EQ(m->factor_ju, nullptr);
  EXPECT_EQ(m->factor_reserved, nullptr);
}

Indices words(const std::int64_t* array, std::int64_t count) { return {array, array + count}; }

std::vector<double> doubles(const double* array, std::int64_t count) { return {array, array + count}; }

std::uint64_t bits(double value) {
  std::uint64_t out = 0;
  std::memcpy(&out, &value, sizeof out);
  return out;
}

std::vector<std::uint64_t> bits(const double* array, std::int64_t count) {
  std::vector<std::uint64_t> b(at(count));
  if (count > 0) std::memcpy(b.data(), array, at(count) * sizeof(double));
  return b;
}

std::vector<std::uint64_t> bits(const std::vector<double>& v) {
  return bits(v.data(), static_cast<std::int64_t>(v.size()));
}

}  // namespace sm::test
