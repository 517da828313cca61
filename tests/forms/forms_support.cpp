#include "forms/forms_support.hpp"

#include <cmath>
#include <cstring>

namespace sm::test {

namespace {

bool symmetric(Shape shape) { return shape.kind == SM_KIND_SYMMETRIC; }
bool diagonal(Shape shape) { return shape.kind == SM_KIND_DIAGONAL; }
Shape shape_of(const SmMatrix* m) { return {m->kind, m->format}; }

Known random_general(Random& random, bool sparse, std::int64_t rows, std::int64_t cols) {
  Known k(rows, cols);
  const std::int64_t gap = rows > 2 ? rows / 2 : -1;
  for (std::int64_t r = 0; r < rows; ++r)
    for (std::int64_t c = 0; c < cols; ++c) {
      if (sparse && (r == gap || random.chance(50))) continue;
      k.set(r, c, random.chance(10) ? 0.0 : random.dyadic());
    }
  if (sparse && k.count() == 0) k.set(0, cols - 1, random.dyadic());
  return k;
}

// Diagonally dominant.
Known random_symmetric(Random& random, Shape shape, std::int64_t n) {
  Known k(n, n);
  for (std::int64_t r = 0; r < n; ++r)
    for (std::int64_t c = r + 1; c < n; ++c) {
      if (diagonal(shape) || (is_sparse(shape) && random.chance(50))) continue;
      k.set_both(r, c, random.chance(10) ? 0.0 : random.dyadic());
    }
  for (std::int64_t r = 0; r < n; ++r) {
    double d = 1.0 + std::fabs(random.dyadic());
    for (std::int64_t c = 0; c < n; ++c) d += std::fabs(k(r, c));
    k.set(r, r, d);
  }
  return k;
}

void read_tree(SmMatrix* m, std::uint64_t* roots, bool both, Known& k) {
  if (!roots) return;
  for (const auto& [place, value] : walk(m, roots)) {
    k.set(place.first, place.second, value);
    if (both) k.set(place.second, place.first, value);
  }
}

void read_values(const SmMatrix* m, Known& k) {
  for (std::int64_t r = 0; r < m->rows; ++r)
    for (std::int64_t c = 0; c < m->cols; ++c) {
      if (m->kind == SM_KIND_DIAGONAL) {
        if (r == c) k.set(r, r, m->values[r]);
      } else if (m->kind == SM_KIND_SYMMETRIC) {
        if (r <= c) k.set_both(r, c, m->values[packed_position(m->rows, m->format, r, c)]);
      } else {
        k.set(r, c, m->values[m->format == SM_FORMAT_COLUMNS ? r + c * m->rows : c + r * m->cols]);
      }
    }
}

::testing::AssertionResult compare(const Known& got, const Known& want, bool places) {
  if (got.rows() != want.rows() || got.cols() != want.cols()) {
    return ::testing::AssertionFailure() << got.rows() << " x " << got.cols() << " instead of " << want.rows() << " x "
                                         << want.cols();
  }
  for (std::int64_t r = 0; r < got.rows(); ++r)
    for (std::int64_t c = 0; c < got.cols(); ++c) {
      if (!same(got(r, c), want(r, c))) {
        return ::testing::AssertionFailure()
               << "element (" << r << ", " << c << ") is " << got(r, c) << " instead of " << want(r, c);
      }
      if (places && got.has(r, c) != want.has(r, c)) {
        return ::testing::AssertionFailure()
               << "element (" << r << ", " << c << ") is " << (got.has(r, c) ? "" : "not ") << "stored";
      }
    }
  return ::testing::AssertionSuccess();
}

}  // namespace

std::string name_of(Operand operand) { return name_of(operand.shape) + " in state " + std::to_string(operand.state); }
bool operator==(Shape a, Shape b) { return a.kind == b.kind && a.format == b.format; }

std::vector<Operand> symmetric_and_diagonal() {
  std::vector<Operand> all(std::begin(kSymmetricOperands), std::end(kSymmetricOperands));
  all.insert(all.end(), std::begin(kDiagonalOperands), std::end(kDiagonalOperands));
  return all;
}

std::vector<Operand> all_operands() {
  std::vector<Operand> all = symmetric_and_diagonal();
  all.insert(all.end(), std::begin(kGeneralOperands), std::end(kGeneralOperands));
  return all;
}

Known Known::full(const std::vector<std::vector<double>>& rows) {
  Known k(static_cast<std::int64_t>(rows.size()), static_cast<std::int64_t>(rows.at(0).size()));
  for (std::int64_t r = 0; r < k.rows_; ++r)
    for (std::int64_t c = 0; c < k.cols_; ++c) k.set(r, c, rows[at(r)][at(c)]);
  return k;
}

std::vector<double> Known::row(std::int64_t r) const {
  const auto begin = v_.begin() + r * cols_;
  return {begin, begin + cols_};
}

Dense Known::dense() const {
  Dense d(rows_, cols_);
  for (std::int64_t r = 0; r < rows_; ++r)
    for (std::int64_t c = 0; c < cols_; ++c) d(r, c) = (*this)(r, c);
  return d;
}

std::int64_t Known::count() const {
  std::int64_t n = 0;
  for (const bool s : stored_) n += s ? 1 : 0;
  return n;
}

Known random_known(Random& random, Shape shape, std::int64_t rows, std::int64_t cols) {
  if (shape.kind == SM_KIND_GENERAL) return random_general(random, is_sparse(shape), rows, cols);
  return random_symmetric(random, shape, rows);
}

Known sum(const Known& a, const Known& b) {
  Known s(a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = 0; c < a.cols(); ++c)
      if (a.has(r, c) || b.has(r, c)) s.set(r, c, a(r, c) + b(r, c));
  return s;
}

Known product(const Known& a, const Known& b) {
  Known p(a.rows(), b.cols());
  for (std::int64_t i = 0; i < a.rows(); ++i)
    for (std::int64_t k = 0; k < a.cols(); ++k)
      for (std::int64_t j = 0; j < b.cols(); ++j)
        if (a.has(i, k) && b.has(k, j)) p.set(i, j, p(i, j) + a(i, k) * b(k, j));
  return p;
}

double form(const Known& a, const double* x, const double* y) {
  double s = 0.0;
  for (std::int64_t i = 0; i < a.rows(); ++i)
    for (std::int64_t j = 0; j < a.cols(); ++j)
      if (a.has(i, j)) s += x[i] * a(i, j) * y[j];
  return s;
}

Known upper_part(const Known& a) {
  Known u(a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows(); ++r)
    for (std::int64_t c = r; c < a.cols(); ++c)
      if (a.has(r, c)) u.set_both(r, c, a(r, c));
  return u;
}

Known diagonal_part(const Known& a) {
  Known d(a.rows(), a.cols());
  for (std::int64_t r = 0; r < a.rows() && r < a.cols(); ++r)
    if (a.has(r, r)) d.set(r, r, a(r, r));
  return d;
}

SmMatrix* new_typed(Session& session, Shape shape) {
  SmMatrix* m = nullptr;
  EXPECT_EQ(session.fn().qxsmnew(session.instance(), &m, shape.kind, shape.format), SM_OK);
  return m;
}

SmMatrix* new_sized(Session& session, Shape shape, std::int64_t rows, std::int64_t cols) {
  SmMatrix* m = new_typed(session, shape);
  EXPECT_EQ(session.fn().qxsmresize(m, rows, cols), SM_OK);
  return m;
}

namespace {

SmMatrix* entered(Session& session, Shape shape, const Known& known) {
  SmMatrix* m = new_sized(session, shape, known.rows(), known.cols());
  for (std::int64_t r = 0; r < known.rows(); ++r)
    for (std::int64_t c = 0; c < known.cols(); ++c) {
      if (!known.has(r, c) || (symmetric(shape) && c < r)) continue;
      EXPECT_EQ(session.fn().qxsmassign(m, r, c, 0, known(r, c)), SM_OK);
    }
  EXPECT_EQ(session.fn().qxsmclose(m, kNan), SM_OK);
  return m;
}

}  // namespace

SmMatrix* build(Session& session, Operand operand, const Known& known) {
  SmMatrix* m = entered(session, operand.shape, known);
  if (operand.shape == kSymmetricSparse) {
    EXPECT_EQ(bring_to(m, operand.state), SM_OK);
  } else {
    if (operand.state >= SM_STATE_FACTORED) {
      EXPECT_EQ(session.fn().qxsmfact(m, 0), SM_OK);
      EXPECT_NE(m->dense_factor, nullptr);
    }
    if (operand.state == SM_STATE_INVERTED) {
      EXPECT_EQ(session.fn().qxsminv(m, 0, kNan), SM_OK);
    }
  }
  EXPECT_EQ(m->state, operand.state) << name_of(operand);
  return m;
}

SmMatrix* build_in_place(Session& session, Operand operand, const Known& known) {
  SmMatrix* m = entered(session, operand.shape, known);
  EXPECT_EQ(session.fn().qxsmfact(m, 1), SM_OK);
  if (operand.state == SM_STATE_INVERTED) {
    EXPECT_EQ(session.fn().qxsminv(m, 1, kNan), SM_OK);
  }
  EXPECT_EQ(m->state, operand.state);
  EXPECT_EQ(m->dense_factor, nullptr);
  return m;
}

Known read(SmMatrix* matrix) {
  Known k(matrix->rows, matrix->cols);
  if (matrix->nnz < 1) return k;
  if (shape_of(matrix) == kGeneralSparse) {
    read_tree(matrix, matrix->row_roots, false, k);
  } else if (shape_of(matrix) != kSymmetricSparse) {
    read_values(matrix, k);
  } else if (!matrix->row_start) {
    read_tree(matrix, matrix->sym_roots, true, k);
  } else {
    for (std::int64_t i = 0; i < matrix->rows; ++i)
      for (std::int64_t p = matrix->row_start[i]; p < matrix->row_start[i + 1]; ++p)
        k.set_both(i, matrix->col_index[p], matrix->nz_values[p]);
  }
  return k;
}

bool same(double got, double want) { return got == want || (std::isnan(got) && std::isnan(want)); }

::testing::AssertionResult same(const std::vector<double>& got, const std::vector<double>& want) {
  if (got.size() != want.size()) {
    return ::testing::AssertionFailure() << got.size() << " values instead of " << want.size();
  }
  for (std::size_t i = 0; i < got.size(); ++i)
    if (!same(got[i], want[i])) {
      return ::testing::AssertionFailure() << "value " << i << " is " << got[i] << " instead of " << want[i];
    }
  return ::testing::AssertionSuccess();
}

::testing::AssertionResult same(const Known& got, const Known& want) { return compare(got, want, false); }
::testing::AssertionResult same_entries(const Known& got, const Known& want) { return compare(got, want, true); }

Output::Output(std::int64_t n, double fill) : Output(std::vector<double>(at(n), fill)) {}

Output::Output(const std::vector<double>& start) : start_(start) {
  v_.assign(at(kGuard), -31.25);
  v_.insert(v_.end(), start.begin(), start.end());
  v_.insert(v_.end(), at(kGuard), 41.75);
}

std::vector<double> Output::values() const {
  for (std::int64_t i = 0; i < kGuard; ++i) {
    EXPECT_EQ(v_[at(i)], -31.25) << "written before the array";
    EXPECT_EQ(v_[v_.size() - 1 - at(i)], 41.75) << "written behind the array";
  }
  return {v_.begin() + kGuard, v_.end() - kGuard};
}

bool Output::untouched() const { return same(values(), start_) == true; }

SmMatrix* new_untyped_with_an_entry(Session& session, std::int32_t state) {
  SmMatrix* m = new_untyped(session);
  m->nnz = 1;
  m->state = state;
  return m;
}

void harmless(SmMatrix* untyped) {
  untyped->nnz = 0;
  untyped->state = SM_STATE_OPEN;
}

std::int64_t blocks_of(const SmMatrix* matrix) {
  const bool tree_of_general = shape_of(matrix) == kGeneralSparse && matrix->pool;
  const bool tree_of_symmetric = shape_of(matrix) == kSymmetricSparse && matrix->assembly_pool;
  std::int64_t blocks = shape_of(matrix) == kGeneralSparse ? 0 : owned_blocks(matrix);
  if (tree_of_general || tree_of_symmetric) {
    blocks += (tree_of_general ? matrix->row_roots : matrix->sym_roots) != nullptr;
    blocks += matrix->spare_node != nullptr;
    if (matrix->slab_nodes > 0) blocks += matrix->nnz / matrix->slab_nodes;
  }
  return blocks;
}

namespace {

std::int64_t loose_blocks(Session& session, const std::vector<SmMatrix*>& matrices) {
  std::int64_t blocks = session.host().live_blocks();
  for (const SmMatrix* m : matrices) blocks -= blocks_of(m);
  return blocks;
}

// False when no request was met.
bool refuse(HostKind kind, const FaultCase& c, std::int64_t k, bool for_ever, const std::vector<double>& want) {
  Session session(kind);
  const std::vector<SmMatrix*> matrices = c.prepare(session);
  const std::int64_t loose = loose_blocks(session, matrices);
  const std::int64_t records = session.instance()->matrix_count;
  session.host().fail_request(k, for_ever);
  const SmStatus status = c.run(session, matrices);
  if (session.host().stop_failing() == 0) {
    EXPECT_EQ(status, SM_OK);
    return false;
  }
  EXPECT_EQ(status, SM_NO_MEMORY) << "request " << k << (for_ever ? " and on" : "");
  EXPECT_EQ(loose_blocks(session, matrices), loose) << "request " << k;
  EXPECT_EQ(c.run(session, matrices), SM_OK) << "after request " << k;
  EXPECT_TRUE(same(c.answer(matrices), want)) << "after request " << k;
  EXPECT_EQ(loose_blocks(session, matrices), loose) << "after request " << k;
  EXPECT_EQ(session.instance()->matrix_count, records);
  session.close();
  EXPECT_EQ(session.host().live_pools(), 0);
  EXPECT_EQ(session.host().violations(), 0);
  return true;
}

}  // namespace

std::int64_t survive(HostKind kind, const FaultCase& c) {
  std::vector<double> want;
  {
    Session calm(kind);
    const std::vector<SmMatrix*> matrices = c.prepare(calm);
    EXPECT_EQ(c.run(calm, matrices), SM_OK);
    want = c.answer(matrices);
  }
  std::int64_t requests = 0;
  for (const bool for_ever : {false, true})
    for (requests = 0; refuse(kind, c, requests, for_ever, want) && requests < 1000; ++requests) {
    }
  return requests;
}

}  // namespace sm::test
