// Sums into blocks, updates of generalized inverses, Hermite forms, orthogonal rows.
#include <bit>
#include <cmath>

#include "model/machine.hpp"

namespace sm::test {

namespace {

void drop_small(Model& g, Index off, double tolerance) {
  const double least = std::isnan(tolerance) ? std::bit_cast<double>(SM_DROP_TOLERANCE_BITS) : tolerance;
  if (!(least > 0)) return;
  for (Index r = off; r < g.rows; ++r)
    for (Index c = off; c < g.cols; ++c)
      if (g.stored(r, c) && std::fabs(g.v(r, c)) <= least) g.v(r, c) = 0.0;
}

bool addable(const Model& g, const Model& b) {
  if (g.general()) return g.sparse() && b.general_sparse();
  return g.diagonal() ? b.diagonal() : g.symmetric() && (b.symmetric() || b.diagonal());
}

// The old block goes to p, which a symmetric target sizes.
SmStatus save_block(const Model& g, Index order, Index off, Model& p) {
  const SmStatus sized = g.symmetric() ? model_resize(p, order, order) : SM_OK;
  if (sized != SM_OK) return sized;
  for (Index i = 0; i < order; ++i)
    for (Index j = i; j < (g.diagonal() ? i + 1 : order); ++j) {
      if (!g.stored(off + i, off + j)) continue;
      const SmStatus status = model_assign(p, i, j, false, g.v(off + i, off + j));
      if (status != SM_OK) return status;
    }
  return SM_OK;
}

SmStatus model_add_block(Model& g, const Model& b, Model* p, Index off, double s, double tolerance) {
  if (g.empty()) return SM_OK;
  if (&g == &b || p == &g || p == &b) return SM_BAD_ARGUMENT;
  if (!g.symmetric() && !addable(g, b)) return SM_UNAVAILABLE;
  if (off < 0 || (g.diagonal() && off + b.rows > g.rows)) return SM_BAD_ARGUMENT;
  if (g.symmetric()) {
    if (b.rows != g.rows - off) return SM_DIMENSION_MISMATCH;
    if (!addable(g, b)) return SM_UNAVAILABLE;
    if (g.sparse() && g.state > SM_STATE_OPEN) return SM_ALREADY_CLOSED;
    if (!b.empty() && !b.closed()) return SM_NOT_CLOSED;
  }
  if (p && !g.general()) {
    const SmStatus status = save_block(g, b.rows, off, *p);
    if (status != SM_OK) return status;
  }
  for (Index r = 0; r < b.rows; ++r)
    for (Index c = 0; c < b.cols; ++c)
      if (b.stored(r, c)) model_assign(g, off + r, off + c, true, s * b.v(r, c));
  drop_small(g, off, tolerance);
  return SM_OK;
}

void call_add_block(Machine& m) {
  Model* g = m.any([&](const Model& y) { return !y.general() || y.sparse() || m.random.chance(5); });
  if (!g) return;
  const Index off = m.random.below(3) - (m.random.chance(3) ? 1 : 0);
  Model* b = m.other({g}, [&](const Model& y) { return addable(*g, y) && (g->general() || y.rows == g->rows - off); });
  if (!b || m.random.chance(5)) b = m.any();
  Model* p = m.random.chance(40) ? m.other({g, b}, [&](const Model& y) { return y.packed() || m.random.chance(30); })
                                 : nullptr;
  // What a dense target keeps when a B without elements is added to it is not told.
  if (!b || (b->empty() && !g->sparse())) return;
  const double factors[] = {1.0, -1.0, 0.5, 2.0};
  const double tolerances[] = {0.0, 0.0, kNan, -1.0, 2.0};
  const double s = factors[m.random.below(4)];
  const double tolerance = tolerances[m.random.below(5)];
  m.begin("qxsmAddGinv", *g, *b, p, off, s, tolerance);
  const SmStatus got = qxsmAddGinv(g->handle, b->handle, p ? p->handle : nullptr, off, s, tolerance);
  m.answer(got, model_add_block(*g, *b, p, off, s, tolerance));
}

SmStatus model_vaxpy(Model& c, const Model& a, const Model& b, double scale, double tolerance) {
  if (&a == &c) return model_add_block(c, b, nullptr, 0, scale, tolerance);
  if (&c == &b) return SM_BAD_ARGUMENT;
  if (a.none() || b.none() || c.none()) return SM_UNTYPED;
  if (!a.closed() || !b.closed()) return SM_NOT_CLOSED;
  if (a.rows != b.rows || a.cols != b.cols) return SM_DIMENSION_MISMATCH;
  const SmStatus status = model_convert(a, c, true);
  if (status != SM_OK) return status;
  return model_add_block(c, b, nullptr, 0, scale, tolerance);
}

void call_vaxpy(Machine& m) {
  Model* c = m.any();
  Model* b = m.other({c}, [&](const Model& y) { return c && addable(*c, y); });
  const auto fits = [&](const Model& y) { return b && y.rows == b->rows && y.cols == b->cols; };
  Model* a = m.random.chance(15) ? c : m.other({c}, fits);
  if (!c || !a || !b || (b->empty() && !c->sparse())) return;
  const double factors[] = {1.0, -1.0, 0.5, 2.0};
  const double tolerances[] = {0.0, kNan, -1.0, 2.0};
  const double scale = factors[m.random.below(4)];
  const double tolerance = tolerances[m.random.below(4)];
  m.begin("qxsmvaxpy", *c, *a, *b, scale, tolerance);
  const SmStatus got = m.fn().qxsmvaxpy(c->handle, a->handle, b->handle, scale, tolerance);
  m.answer(got, model_vaxpy(*c, *a, *b, scale, tolerance));
}

void update_sparse(Model& g, const Model& a, const Model& b, Index r, Index c, double s) {
  for (Index i = 0; i < a.rows; ++i)
    for (Index j = i; j < a.rows; ++j) {
      if (r + i < 0 || r + j >= g.rows || !g.stored(r + i, r + j)) continue;
      const double from_a = element_read(a, i, j);
      g.v(r + i, r + j) = (std::isnan(s) ? from_a : s * from_a) + element_read(b, c + i, c + j);
    }
}

// The values of A are used up one by one; in format 23 the columns end at the order of A.
void update_packed(Model& g, const Model& a, const Model& b, Index r, Index c, double s) {
  const std::vector<double> values = array_of(a.kind, a.format, a.v);
  std::size_t used = 0;
  for (Index p = r; p < r + a.rows; ++p) {
    const bool by_columns = g.format == SM_FORMAT_COLUMNS;
    for (Index q = by_columns ? r : p; q < (by_columns ? p + 1 : a.rows); ++q) {
      const Index row = c + std::min(p, q) - r;
      const Index col = c + std::max(p, q) - r;
      if (std::min(p, q) < 0 || std::max(p, q) >= g.rows || row < 0 || col >= b.rows) continue;
      const double from_a = std::isnan(s) ? 0.0 : s * values[used];
      used += 1;
      g.v(std::min(p, q), std::max(p, q)) = from_a + b.v(row, col);
    }
  }
}

SmStatus model_update(Model& g, const Model& a, const Model& b, Index r, Index c, double s) {
  if (g.empty()) return SM_OK;
  if (!g.closed()) return SM_NOT_CLOSED;
  if (&g == &a || &g == &b) return SM_BAD_ARGUMENT;
  if (!a.symmetric() || !b.symmetric()) return SM_KIND_MISMATCH;
  if (!g.symmetric()) return SM_KIND_MISMATCH;
  if (b.format != g.format || (g.packed() && a.format != g.format)) return SM_UNAVAILABLE;
  if (g.packed())
    update_packed(g, a, b, r, c, s);
  else
    update_sparse(g, a, b, r, c, s);
  const bool factored = g.state == SM_STATE_FACTORED;
  if (g.dense() && factored) g.spoiled = !g.separate, g.separate = false;
  if (g.state == SM_STATE_INVERTED) g.changed();
  if (factored) g.state = SM_STATE_SYMBOLIC;
  g.void_results();
  return SM_OK;
}

void call_update(Machine& m) {
  Model* g = m.any([&](const Model& y) { return y.symmetric() || m.random.chance(3); });
  const auto fits = [&](const Model& y) { return g && y.format == g->format && y.symmetric(); };
  Model* b = m.other({g}, fits);
  Model* a = m.other({g}, fits);
  if (!a || m.random.chance(10)) a = m.any();
  if (!b || m.random.chance(5)) b = m.any();
  if (!g || !a || !b) return;
  const Index r = m.random.chance(50) ? 0 : m.random.below(4) - 1;
  const Index c = m.random.chance(50) ? 0 : m.random.below(4) - 1;
  const double factors[] = {1.0, -1.0, 0.5, kNan};
  const double s = factors[m.random.below(4)];
  m.begin("qxsmUpdateGinv", *g, *a, *b, r, c, s);
  const SmStatus got = m.fn().qxsmUpdateGinv(g->handle, a->handle, b->handle, r, c, s);
  m.answer(got, model_update(*g, *a, *b, r, c, s));
}

// Removes row i from row k; false when rounding could decide what is stored.
bool remove_component(Model& a, Index i, Index k, double squared, double tolerance) {
  Sum along;
  for (Index j = 0; j < a.cols; ++j) along.add(a.v(i, j), a.v(k, j));
  const double c = along.value() / squared;
  if (std::fabs(std::fabs(c) - tolerance) < 1e-9) return false;
  if (!(std::fabs(c) > tolerance)) return true;
  for (Index j = 0; j < a.cols; ++j) {
    const double value = a.v(k, j) - c * a.v(i, j);
    if (std::fabs(value) > 1e-13 && std::fabs(value) < 1e-11) return false;
    a.stored(k, j) = std::fabs(value) < kTolerance;
    a.v(k, j) = a.stored(k, j) ? value : 0.0;
    a.touched += 1;
  }
  return true;
}

bool model_orthogonal(Model& a, std::vector<std::int16_t>& active, Index lo, Index hi, double tolerance) {
  for (Index i = 0; i < a.rows; ++i) {
    std::int16_t& flag = active[static_cast<std::size_t>(i)];
    if (flag == 0 || (i >= lo && i < hi)) continue;
    flag = 0;
    Sum squared;
    for (Index j = 0; j < a.cols; ++j) squared.add(a.v(i, j), a.v(i, j));
    if (!(squared.value() > tolerance)) continue;
    for (Index k = 0; k < a.rows; ++k)
      if (active[static_cast<std::size_t>(k)] && !remove_component(a, i, k, squared.value(), tolerance)) return false;
  }
  a.void_results();
  a.slack = 1e-12;
  return true;
}

void call_orthogonal(Machine& m) {
  Model* a = m.any([&](const Model& y) { return (y.general_sparse() && y.rows == y.cols) || m.random.chance(3); });
  if (!a) return;
  const Index lo = m.random.below(a->rows + 1);
  const Index hi = m.random.below(a->rows + 1);
  std::vector<std::int16_t> active;
  for (Index i = 0; i < a->rows + 1; ++i) active.push_back(m.random.chance(80) ? 1 : 0);
  Model after = *a;
  std::vector<std::int16_t> left = active;
  const bool served = a->general_sparse() && a->rows == a->cols && !a->empty();
  if (served && !model_orthogonal(after, left, lo, hi, 1e-6)) return;
  m.begin("qxsmorth", *a, lo, hi);
  const SmStatus got = qxsmorth(a->handle, active.data(), lo, hi, 1e-6);
  if (const auto refused = not_readable(*a)) return m.answer(got, *refused);
  if (a->rows != a->cols) return m.answer(got, SM_NOT_SQUARE);
  if (!served) return m.answer(got, SM_UNAVAILABLE);
  m.answer(got, SM_OK);
  *a = after;
  if (active != left) m.wrong("the flags differ");
}

}  // namespace

void add_update_calls(std::vector<Call>& list) {
  list.insert(list.end(), {{call_add_block, 14}, {call_vaxpy, 18}, {call_update, 18}, {call_orthogonal, 6}});
}

}  // namespace sm::test
