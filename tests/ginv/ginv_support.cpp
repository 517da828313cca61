#include "ginv/ginv_support.hpp"

namespace sm::test {

namespace {

void expect_ok(SmStatus status) { EXPECT_EQ(status, SM_OK); }

bool stores(Shape shape, std::int64_t r, std::int64_t c) {
  if (shape.kind == SM_KIND_DIAGONAL) return r == c;
  return shape.kind == SM_KIND_GENERAL || r <= c;
}

}  // namespace

Dense from_rows(const std::vector<std::vector<double>>& rows) {
  Dense a(static_cast<std::int64_t>(rows.size()), rows.empty() ? 0 : static_cast<std::int64_t>(rows[0].size()));
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c) a(r, c) = rows[at(r)][at(c)];
  return a;
}

Dense from_diagonal(const std::vector<double>& d) {
  Dense a(static_cast<std::int64_t>(d.size()), static_cast<std::int64_t>(d.size()));
  for (std::int64_t i = 0; i < a.rows(); ++i) a(i, i) = d[at(i)];
  return a;
}

Dense random_dense(Random& random, std::int64_t rows, std::int64_t cols, std::int64_t percent) {
  Dense a(rows, cols);
  for (std::int64_t r = 0; r < rows; ++r)
    for (std::int64_t c = 0; c < cols; ++c)
      if (random.chance(percent)) a(r, c) = random.dyadic();
  return a;
}

Dense random_symmetric(Random& random, std::int64_t n, std::int64_t percent) {
  Dense a(n, n);
  for (std::int64_t r = 0; r < n; ++r)
    for (std::int64_t c = r; c < n; ++c)
      if (r == c || random.chance(percent)) a(r, c) = a(c, r) = random.dyadic();
  return a;
}

Problem problem_from(const Dense& symmetric) {
  Problem p{"given", symmetric.rows(), {}};
  for (std::int64_t r = 0; r < p.n; ++r)
    for (std::int64_t c = r; c < p.n; ++c)
      if (r == c || symmetric(r, c) != 0.0L) p.upper.push_back({r, c, static_cast<double>(symmetric(r, c))});
  return p;
}

Dense trailing(const Dense& a, std::int64_t from) {
  Dense t(a.rows() - from, a.cols() - from);
  for (std::int64_t r = 0; r < t.rows(); ++r)
    for (std::int64_t c = 0; c < t.cols(); ++c) t(r, c) = a(from + r, from + c);
  return t;
}

Dense scaled(const Dense& a, long double s) {
  Dense b(a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c) b(r, c) = s * a(r, c);
  return b;
}

Dense sum(const Dense& a, const Dense& b) {
  Dense t(a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c) t(r, c) = a(r, c) + b(r, c);
  return t;
}

SmMatrix* sized(Session& session, Shape shape, std::int64_t rows, std::int64_t cols) {
  SmMatrix* matrix = nullptr;
  expect_ok(session.fn().qxsmnew(session.instance(), &matrix, shape.kind, shape.format));
  expect_ok(session.fn().qxsmresize(matrix, rows, cols));
  return matrix;
}

SmMatrix* build_open(Session& session, const Dense& a) {
  SmMatrix* matrix = sized(session, kSymmetricSparse, a.rows(), a.rows());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = r; c < a.cols(); ++c)
      if (a(r, c) != 0.0L) expect_ok(session.fn().qxsmassign(matrix, r, c, 0, static_cast<double>(a(r, c))));
  return matrix;
}

SmMatrix* build(Session& session, Shape shape, const Dense& a) {
  if (shape.kind == SM_KIND_SYMMETRIC && is_sparse(shape)) {
    SmMatrix* matrix = build_open(session, a);
    expect_ok(session.fn().qxsmclose(matrix, kNan));
    return matrix;
  }
  SmMatrix* matrix = sized(session, shape, a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c)
      if (stores(shape, r, c) && a(r, c) != 0.0L) {
        expect_ok(session.fn().qxsmassign(matrix, r, c, 0, static_cast<double>(a(r, c))));
      }
  return matrix;
}

std::vector<double> laid_out(Shape shape, const Dense& a) {
  std::vector<double> values(at(slots(shape, a.rows(), a.cols())));
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c)
      if (stores(shape, r, c)) values[at(slot_of(shape, a.rows(), a.cols(), r, c))] = static_cast<double>(a(r, c));
  return values;
}

SmMatrix* build_tied(Session& session, Shape shape, std::vector<double>& data, std::int64_t n) {
  SmMatrix* matrix = new_open_tied(session, data, n, n, shape.kind, shape.format);
  expect_ok(session.fn().qxsmclose(matrix, kNan));
  EXPECT_EQ(matrix->pool, nullptr);
  return matrix;
}

SmMatrix* build_without_values(Session& session, Shape shape, std::int64_t n) {
  SmMatrix* matrix = nullptr;
  expect_ok(session.fn().qxsmnew(session.instance(), &matrix, shape.kind, shape.format));
  session.host().fail_request(0, false);
  EXPECT_EQ(session.fn().qxsmresize(matrix, n, n), SM_NO_MEMORY);
  EXPECT_EQ(session.host().stop_failing(), 1);
  EXPECT_EQ(matrix->values, nullptr);
  EXPECT_EQ(matrix->rows, n);
  return matrix;
}

Shape shape_of(const SmMatrix* matrix) { return {matrix->kind, matrix->format}; }

Nonzeros entries(SmMatrix* matrix) {
  if (matrix->kind == SM_KIND_GENERAL) return walk(matrix, matrix->row_roots);
  if (matrix->state == SM_STATE_OPEN) return walk(matrix, matrix->sym_roots);
  Nonzeros out;
  if (!matrix->row_start) return out;
  for (std::int64_t r = 0; r < matrix->rows; ++r)
    for (std::int64_t p = matrix->row_start[r]; p < matrix->row_start[r + 1]; ++p)
      out[std::minmax(r, matrix->col_index[p])] = matrix->nz_values[p];
  return out;
}

Dense contents(SmMatrix* matrix, const double* values) {
  const Shape shape = shape_of(matrix);
  Dense a(matrix->rows, matrix->cols);
  if (is_sparse(shape)) {
    for (const auto& [place, value] : entries(matrix)) a(place.first, place.second) = value;
  } else {
    const double* v = values ? values : matrix->values;
    for (std::int64_t r = 0; r < a.rows(); ++r)
      for (std::int64_t c = 0; c < a.cols(); ++c)
        if (stores(shape, r, c)) a(r, c) = v[slot_of(shape, a.rows(), a.cols(), r, c)];
  }
  for (std::int64_t r = 0; shape.kind == SM_KIND_SYMMETRIC && r < a.rows(); ++r)
    for (std::int64_t c = 0; c < r; ++c) a(r, c) = a(c, r);
  return a;
}

Snapshot snapshot(SmMatrix* m) {
  const auto word = [](auto v) { return static_cast<std::uint64_t>(v); };
  Snapshot s{{word(m->kind), word(m->format), word(m->state), word(m->rows), word(m->cols), word(m->nnz), word(m->rank),
              word(m->definite), bits(m->log_det), bits(m->value_count), word(m->solver_word)},
             {m->pool, m->assembly_pool, m->tree, m->values, m->row_start, m->nz_values, m->work, m->perm}};
  if (m->kind == SM_KIND_NONE) return s;
  if (is_sparse(shape_of(m))) {
    for (const auto& [place, value] : entries(m)) {
      s.words.insert(s.words.end(), {word(place.first), word(place.second), bits(value)});
    }
  } else if (m->values) {
    for (const double* array : {m->values, m->dense_factor})
      if (array) {
        const auto stored = bits(array, static_cast<std::int64_t>(m->value_count));
        s.words.insert(s.words.end(), stored.begin(), stored.end());
      }
  }
  return s;
}

Reference generalized_inverse(const Dense& a, const Indices& order, double tolerance) {
  const Indices perm = order.empty() ? natural_order(a.rows()) : order;
  const DenseFactor f = factor_with_drops(reordered(a, perm), tolerance);
  EXPECT_TRUE(f.definite);
  Reference r{Dense(a.rows(), a.rows()), std::vector<bool>(at(a.rows())), f.rank, 0.0};
  for (std::int64_t k = 0; k < a.rows(); ++k) r.accepted[at(perm[at(k)])] = f.accepted[at(k)];
  const Dense block = principal(a, r.accepted);
  const Dense inv = inverse(block);
  r.log_det = static_cast<double>(log_determinant(block));
  for (std::int64_t i = 0, bi = 0; i < a.rows(); ++i) {
    if (!r.accepted[at(i)]) continue;
    for (std::int64_t j = 0, bj = 0; j < a.rows(); ++j)
      if (r.accepted[at(j)]) r.inverse(i, j) = inv(bi, bj++);
    ++bi;
  }
  return r;
}

Reference generalized_inverse_of(const SmMatrix* matrix, const Dense& a) {
  if (!is_sparse(shape_of(matrix))) return generalized_inverse(a);
  return generalized_inverse(a, words(matrix->perm, matrix->rows));
}

std::vector<Named> semidefinite_problems() {
  Random random(31);
  return {{"definite", positive_definite(grid(4, 3), random).dense()},
          {"dense definite", positive_definite(clique(9), random).dense()},
          {"repeated and zero rows", cross_product(random, 7, 3, 2).problem.dense()},
          {"mostly repeated", cross_product(random, 3, 8, 0).problem.dense()},
          {"order 1", from_rows({{4.0}})},
          {"one zero", from_rows({{0.0}})}};
}

}  // namespace sm::test
