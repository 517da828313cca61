// Forms and products that are matrices.
#include "model/machine.hpp"

namespace sm::test {

namespace {

using Sums = Table<Sum>;

double largest(const Model& m) {
  double most = 0;
  for (Index r = 0; r < m.rows; ++r)
    for (Index c = 0; c < m.cols; ++c) most = std::max(most, std::fabs(m.v(r, c)));
  return most;
}

// Elements that products of small dyadics can be added to without rounding.
bool small_dyadics(const Model& m) {
  for (Index r = 0; r < m.rows; ++r)
    for (Index c = 0; c < m.cols; ++c)
      if (std::ldexp(m.v(r, c), 24) != std::floor(std::ldexp(m.v(r, c), 24))) return false;
  return true;
}

// How far an element may be off when a value that is not known to the bit is added to it.
double rounding(const Model& m) { return 1e-12 + 4 * kEps * largest(m); }

// X A X' for the elements as they are, both triangles of a symmetric matrix.
Sums form(const Model& a, const Model& x) {
  Sums out(x.rows, x.rows);
  for (Index i = 0; i < x.rows; ++i)
    for (Index j = 0; j < x.rows; ++j)
      for (Index k = 0; k < a.rows; ++k)
        for (Index l = 0; l < a.rows; ++l)
          if (x.at(i, k) != 0 && x.at(j, l) != 0) out(i, j).add(x.at(i, k), a.at(k, l), x.at(j, l));
  return out;
}

// Whether rounding could make a zero of the sum, or something else of a zero.
bool undecided(const Sum& sum) { return sum.slack() > 0 && std::fabs(sum.value()) <= 4 * sum.slack(); }

// A result that is written as a whole has nothing left of what it was.
void begin_whole(Model& r) {
  r.separate = r.spoiled = false;
  if (r.state >= SM_STATE_FACTORED) r.state = SM_STATE_CLOSED;
  r.void_results();
}

// A packed result of order r written as a whole.
SmStatus write_whole(Model& r, const Sums& sums) {
  if (r.rows != sums.rows() || r.empty()) return SM_DIMENSION_MISMATCH;  // one of order 0 has no array
  for (Index i = 0; i < r.rows; ++i)
    for (Index j = i; j < r.rows; ++j) {
      r.v(i, j) = sums(i, j).value();
      r.slack = std::max(r.slack, sums(i, j).slack());
    }
  begin_whole(r);
  return SM_OK;
}

// Elements (i, j), i <= j, added one by one, by rows or by columns; the first answer that is not 0 ends it.
SmStatus enter(Model& r, const Sums& sums, bool by_columns, bool zeros) {
  const Index n = sums.rows();
  for (Index a = 0; a < n; ++a)
    for (Index b = by_columns ? 0 : a; b < (by_columns ? a + 1 : n); ++b) {
      const Sum& sum = by_columns ? sums(b, a) : sums(a, b);
      if (!zeros && undecided(sum) && r.sparse()) {
        r.slack = std::max(r.slack, 2 * sum.slack() + rounding(r));
        r.unsure = r.unsure || r.state != SM_STATE_OPEN || std::max(a, b) >= r.rows;  // refused, or grown, or not
        if (!r.unsure) r.leave_open(std::min(a, b), std::max(a, b));
        continue;
      }
      if (sum.slack() > 0) r.slack = std::max(r.slack, sum.slack() + rounding(r));
      if (sum.value() == 0 && !zeros) continue;
      const SmStatus status = model_assign(r, by_columns ? b : a, by_columns ? a : b, true, sum.value());
      if (status != SM_OK) return status;
      if (sum.slack() > 0) r.slack = std::max(r.slack, sum.slack() + rounding(r));
    }
  return SM_OK;
}

SmStatus model_quad(const Model& a, const Model& x, Model& r, bool keep, const Sums& sums) {
  if (const auto status = not_readable(a)) return *status;
  if (!x.closed()) return SM_NOT_CLOSED;
  if (&r == &a || &r == &x) return SM_BAD_ARGUMENT;
  if (x.cols != a.rows) return SM_DIMENSION_MISMATCH;
  if (!r.symmetric()) return SM_KIND_MISMATCH;
  if (!keep) model_resize(r, x.rows, x.rows);
  const bool by_vectors = x.general() && x.dense();
  if (!by_vectors && !a.symmetric()) return SM_UNAVAILABLE;
  if (x.symmetric_sparse() && x.state > SM_STATE_ORDERED) return SM_REORDERED;
  if (by_vectors && a.rows != a.cols) return SM_NOT_SQUARE;
  const bool whole = by_vectors && r.format == SM_FORMAT_COLUMNS;
  const SmStatus status = whole ? write_whole(r, sums) : enter(r, sums, by_vectors, false);
  if (status != SM_OK) return status;
  return keep ? SM_OK : model_close(r, kNan);
}

void call_quad(Machine& m) {
  Model* a = m.any([](const Model& y) { return y.rows == y.cols; });
  Model* x = a ? m.any([&](const Model& y) { return y.cols == a->rows || m.random.chance(3); }) : nullptr;
  Model* r = m.other({a, x}, [&](const Model& y) { return y.symmetric() || m.random.chance(5); });
  if (!a || !x || !r) return;
  const bool keep = m.random.chance(30);
  const bool fits = a->rows == x->cols;
  const Sums sums = fits ? form(*a, *x) : Sums();
  m.begin("qxsmquad", *a, *x, *r, keep);
  const SmStatus got = m.fn().qxsmquad(a->handle, x->handle, r->handle, keep);
  m.answer(got, model_quad(*a, *x, *r, keep, sums));
}

SmStatus model_dense_quad(const Model& g, const Values& s, Model& r, bool keep) {
  if (!g.sparse() && !g.empty()) return SM_OK;
  if (g.state < SM_STATE_CLOSED || !g.closed()) return SM_NOT_CLOSED;
  if (&g == &r) return SM_BAD_ARGUMENT;
  if (!keep) {
    const SmStatus status = model_resize(r, g.rows, g.rows);
    if (status != SM_OK) return status;
  }
  if (g.empty()) return keep ? SM_OK : model_close(r, kNan);
  if (!g.general_sparse() || !r.symmetric_sparse()) return SM_UNAVAILABLE;
  const auto has_entries = [&](Index i) {
    for (Index k = 0; k < g.cols; ++k)
      if (g.stored(i, k)) return true;
    return false;
  };
  for (Index i = 0; i < g.rows; ++i)
    for (Index l = i; l < g.rows; ++l) {
      if (!has_entries(i) || !has_entries(l)) continue;
      Sum sum;
      for (Index k = 0; k < g.cols; ++k)
        for (Index j = 0; j < g.cols; ++j)
          if (g.stored(i, k) && g.stored(l, j)) sum.add(g.v(i, k), s(std::min(k, j), std::max(k, j)), g.v(l, j));
      const SmStatus status = model_assign(r, i, l, true, sum.value());
      if (status != SM_OK) return status;
      if (sum.slack() > 0) r.slack = std::max(r.slack, sum.slack() + rounding(r));
    }
  return keep ? SM_OK : model_close(r, kNan);
}

void call_dense_quad(Machine& m) {
  Model* g = m.any([&](const Model& y) { return y.general_sparse() || m.random.chance(5); });
  Model* r = m.other({g}, [&](const Model& y) { return y.symmetric_sparse() || m.random.chance(5); });
  if (!g || !r) return;
  const bool keep = m.random.chance(30);
  Values s(g->cols, g->cols);
  for (Index i = 0; i < g->cols; ++i)
    for (Index j = i; j < g->cols; ++j) s(i, j) = m.dyadic();
  const std::vector<double> packed = array_of(SM_KIND_SYMMETRIC, SM_FORMAT_COLUMNS, s);
  m.begin("qxsmDenseQuad", *g, *r, keep);
  const SmStatus got = m.fn().qxsmDenseQuad(g->handle, packed.data(), r->handle, keep);
  m.answer(got, model_dense_quad(*g, s, *r, keep));
}

SmStatus invquad_refusal(const Model& a, const Model& x, const Model& r) {
  if (!a.closed() || !x.closed()) return SM_NOT_CLOSED;
  if (a.in_place()) return SM_NO_FACTOR;
  if (&r == &a || &r == &x) return SM_BAD_ARGUMENT;
  if (a.rows != a.cols) return SM_NOT_SQUARE;
  if (x.cols != a.rows) return SM_DIMENSION_MISMATCH;
  return r.symmetric() ? SM_OK : SM_KIND_MISMATCH;
}

SmStatus model_invquad(Machine& m, Model& a, const Model& x, Model& r) {
  if (a.empty() || x.empty()) return SM_OK;
  const SmStatus refused = invquad_refusal(a, x, r);
  if (refused != SM_OK) return refused;
  model_resize(r, x.rows, x.rows);
  if (a.general() || !x.general()) return SM_UNAVAILABLE;
  Sums sums(x.rows, x.rows);
  for (Index j = 0; j < x.rows; ++j) {
    std::vector<double> row;
    for (Index k = 0; k < x.cols; ++k) row.push_back(x.at(j, k));
    Wanted w(a.rows);
    const SmStatus status = model_inverse_product(m, a, row.data(), false, 1, w);
    if (status != SM_OK) return status;
    for (Index i = 0; i <= j; ++i)
      for (Index k = 0; k < a.rows; ++k) {
        sums(i, j).add(x.at(i, k), w.value(k));
        sums(i, j).widen(std::fabs(x.at(i, k)) * w.slack(k));
      }
  }
  const bool whole = x.dense() && r.format == SM_FORMAT_COLUMNS;
  const SmStatus status = whole ? write_whole(r, sums) : enter(r, sums, x.dense(), x.sparse());
  if (status != SM_OK) return status;
  return model_close(r, kNan);
}

void call_invquad(Machine& m) {
  Model* a = solvable(m);
  Model* x =
      a ? m.any([&](const Model& y) { return y.cols == a->rows && (y.general() || m.random.chance(5)); }) : nullptr;
  Model* r = m.other({a, x}, [&](const Model& y) { return y.symmetric() || m.random.chance(5); });
  if (!a || !x || !r) return;
  m.begin("qxsminvquad", *a, *x, *r);
  const SmStatus got = m.fn().qxsminvquad(a->handle, x->handle, r->handle);
  m.answer(got, model_invquad(m, *a, *x, *r));
}

bool product_is_served(const Model& a, const Model& b) {
  if (a.general()) return b.general() || b.diagonal();
  if (a.diagonal()) return true;
  return a.format != SM_FORMAT_COLUMNS || !b.general();
}

SmStatus multiply_diagonals(const Model& a, const Model& b, Model& c, bool keep) {
  if (c.diagonal() && c.rows != a.rows) return SM_DIMENSION_MISMATCH;
  if (c.diagonal()) begin_whole(c);
  for (Index i = 0; i < a.rows; ++i) {
    const double value = a.v(i, i) * b.v(i, i);
    if (c.diagonal()) c.v(i, i) = value;
    const SmStatus status = c.diagonal() ? SM_OK : model_assign(c, i, i, true, value);
    if (status != SM_OK && status != SM_BAD_ARGUMENT && status != SM_OUTSIDE) return status;
  }
  return keep || c.diagonal() ? SM_OK : model_close(c, 0.0);
}

SmStatus model_multiply(const Model& a, const Model& b, Model& c, bool keep) {
  if (a.empty() && b.empty()) return SM_OK;
  if (a.none()) return SM_UNTYPED;
  if (!a.closed() || !b.closed()) return SM_NOT_CLOSED;
  if (&c == &a || &c == &b) return SM_BAD_ARGUMENT;
  if (a.cols != b.rows || (c.diagonal() && !a.diagonal() && !b.diagonal())) return SM_DIMENSION_MISMATCH;
  if (!keep) model_resize(c, a.rows, b.cols);
  if (!product_is_served(a, b)) return SM_UNAVAILABLE;
  if (a.empty() || b.empty()) return SM_OK;
  if (a.diagonal() && b.diagonal()) return multiply_diagonals(a, b, c, keep);
  const double there = small_dyadics(c) ? 0 : largest(c);
  const bool folded = c.general() && c.dense() && (c.rows != a.rows || c.cols != b.cols);  // places meet again
  for (Index i = 0; i < a.rows; ++i)
    for (Index j = 0; j < b.cols; ++j) {
      Sum sum;
      bool entered = false;
      for (Index k = 0; k < a.cols; ++k) {
        if (!a.has(i, k) || !b.has(k, j)) continue;
        entered = true;
        sum.add(a.at(i, k), b.at(k, j));
      }
      if (!entered && c.sparse() && b.dense() && i < c.rows && j < c.cols && (!c.symmetric() || j >= i))
        c.leave_open(i, j);
      const SmStatus status = entered ? model_assign(c, i, j, true, sum.value()) : SM_OK;
      if (status != SM_OK && status != SM_BAD_ARGUMENT && status != SM_OUTSIDE) return status;
      // The products are entered one by one, and may round against what is there.
      if (there > 0 && entered) sum.widen(8 * static_cast<double>(a.cols + 1) * kEps * there);
      if (sum.slack() > 0) c.slack = std::max(c.slack, sum.slack()) + (folded ? sum.slack() : 0);
    }
  if (c.slack > 0) c.slack += rounding(c);
  return SM_OK;
}

bool has_empty_row(const Model& a) {
  for (Index i = 0; i < a.rows; ++i) {
    bool found = false;
    for (Index k = 0; k < a.cols; ++k) found = found || a.has(i, k);
    if (!found) return true;
  }
  return false;
}

void call_multiply(Machine& m) {
  Model* a = m.any([&](const Model& y) { return !y.none() || m.random.chance(10); });
  Model* b = a ? m.any([&](const Model& y) { return y.rows == a->cols || m.random.chance(3); }) : nullptr;
  Model* c = m.other({a, b}, [](const Model&) { return true; });
  if (!a || !b || !c) return;
  const bool keep = m.random.chance(30);
  // Whether a row without entries times full rows is entered, and lets a kept sparse result grow, is not told.
  const bool grows = keep && c->sparse() && (c->rows < a->rows || c->cols < b->cols);
  const bool closed = c->symmetric_sparse() && (keep || a->rows != b->cols);
  if ((grows || closed) && b->dense() && has_empty_row(*a)) return;
  m.begin("qxsmmultm", *a, *b, *c, keep);
  const SmStatus got = qxsmmultm(a->handle, b->handle, c->handle, keep);
  m.answer(got, model_multiply(*a, *b, *c, keep));
}

}  // namespace

void add_matrix_form_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_quad, 16}, {call_dense_quad, 8}, {call_invquad, 16}, {call_multiply, 22}});
}

}  // namespace sm::test
