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

// The old block goes to p, which is a packed matrix or, for a diagonal target, a dense one of its kind.
SmStatus save_block(const Model& g, Index order, Index off, Model& p) {
  if (g.symmetric()) model_resize(p, order, order);
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
  if (!addable(g, b)) return SM_UNAVAILABLE;
  if (off < 0 || (g.diagonal() && off + b.rows > g.rows)) return SM_BAD_ARGUMENT;
  if (g.symmetric()) {
    if (b.rows != g.rows - off) return SM_DIMENSION_MISMATCH;
    if (g.sparse() && g.state > SM_STATE_OPEN) return SM_ALREADY_CLOSED;
    if (!b.closed()) return SM_NOT_CLOSED;
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
  Model* b = m.any([&](const Model& y) { return addable(*g, y) && (g->general() || y.rows == g->rows - off); });
  if (!b || m.random.chance(5)) b = m.any();
  Model* p = m.random.chance(40) ? m.any([&](const Model& y) { return y.packed() && y.rows > 0; }) : nullptr;
  // Left out: operands without elements; an open B of a packed target; a diagonal block that ends before G, of which it
  // is not told how far the tolerance goes; and a block that is saved where it does not fit.
  if (!b || b->empty() || (!g->sparse() && !b->closed())) return;
  if (g->diagonal() && (off + b->rows != g->rows || (p && p->rows < b->rows))) return;
  // Nor is it told whether a general B is refused for its kind or for its place.
  if (g->symmetric() && b->general() && (off < 0 || b->rows != g->rows - off)) return;
  const double factors[] = {1.0, -1.0, 0.5, 2.0};
  const double tolerances[] = {0.0, 0.0, kNan, -1.0, 2.0};
  const double s = factors[m.random.below(4)];
  const double tolerance = tolerances[m.random.below(5)];
  m.begin("qxsmAddGinv", m.number(*g), m.number(*b), p ? m.number(*p) : -1, off, s, tolerance);
  const SmStatus got = qxsmAddGinv(g->handle, b->handle, p ? p->handle : nullptr, off, s, tolerance);
  m.answer(got, model_add_block(*g, *b, p, off, s, tolerance));
}

SmStatus model_vaxpy(Model& c, const Model& a, const Model& b, double scale, double tolerance) {
  if (&c == &b) return SM_BAD_ARGUMENT;
  if (&a == &c) return model_add_block(c, b, nullptr, 0, scale, tolerance);
  if (a.none() || b.none() || c.none()) return SM_UNTYPED;
  if (!a.closed() || !b.closed()) return SM_NOT_CLOSED;
  if (a.rows != b.rows || a.cols != b.cols) return SM_DIMENSION_MISMATCH;
  const SmStatus status = model_convert(a, c, true);
  if (status != SM_OK) return status;
  return model_add_block(c, b, nullptr, 0, scale, tolerance);
}

void call_vaxpy(Machine& m) {
  Model* c = m.any();
  Model* a = m.random.chance(15) ? c : m.any();
  Model* b = a ? m.any([&](const Model& y) {
    return (y.rows == a->rows && y.cols == a->cols && y.kind == a->kind) || m.random.chance(3);
  })
               : nullptr;
  if (!c || !a || !b || b->empty() || a->empty()) return;
  if (a == c && c->symmetric() && b->general() && b->rows != c->rows) return;  // as for the block
  const double factors[] = {1.0, -1.0, 0.5, 2.0};
  const double tolerances[] = {0.0, kNan, -1.0, 2.0};
  const double scale = factors[m.random.below(4)];
  const double tolerance = tolerances[m.random.below(4)];
  m.begin("qxsmvaxpy", m.number(*c), m.number(*a), m.number(*b), scale, tolerance);
  const SmStatus got = m.fn().qxsmvaxpy(c->handle, a->handle, b->handle, scale, tolerance);
  m.answer(got, model_vaxpy(*c, *a, *b, scale, tolerance));
}

SmStatus model_update(Model& g, const Model& a, const Model& b, Index r, Index c, double s) {
  if (g.empty()) return SM_OK;
  if (!g.closed()) return SM_NOT_CLOSED;
  if (&g == &a || &g == &b) return SM_BAD_ARGUMENT;
  if (!a.symmetric() || !b.symmetric()) return SM_KIND_MISMATCH;
  if (!g.symmetric()) return SM_KIND_MISMATCH;
  if (b.format != g.format || (g.packed() && a.format != g.format)) return SM_UNAVAILABLE;
  for (Index i = 0; i < a.rows && r + i < g.rows; ++i)
    for (Index j = i; j < a.rows && r + j < g.rows; ++j) {
      if (!g.stored(r + i, r + j)) continue;
      // Packed operands are read as they lie, sparse ones through the element reader.
      const double from_a = g.packed() ? a.v(i, j) : element_read(a, i, j);
      const double from_b = g.packed() ? b.v(c + i, c + j) : element_read(b, c + i, c + j);
      const double scaled = std::isnan(s) ? (g.packed() ? 0.0 : from_a) : s * from_a;
      g.v(r + i, r + j) = scaled + from_b;
    }
  const bool factored = g.state == SM_STATE_FACTORED;
  if (g.dense() && factored) g.separate = false, g.spoiled = true;
  if (g.state == SM_STATE_INVERTED) g.changed();
  if (factored) g.state = SM_STATE_SYMBOLIC;
  g.void_results();
  return SM_OK;
}

void call_update(Machine& m) {
  Model* g = m.any([&](const Model& y) { return y.symmetric() || m.random.chance(3); });
  Model* b = g ? m.any([&](const Model& y) { return y.format == g->format && y.symmetric(); }) : nullptr;
  Model* a = g ? m.any([&](const Model& y) { return y.format == g->format && y.symmetric(); }) : nullptr;
  if (!a || m.random.chance(10)) a = m.any();
  if (!b || m.random.chance(5)) b = m.any();
  if (!g || !a || !b || a->empty() || b->empty()) return;
  Index r = m.random.below(3);
  Index c = m.random.below(3);
  // Only the leading blocks of packed operands have a meaning of their own, as far as each of them goes. Elements below
  // the diagonal of a packed A, and packed places that are not there, are not asked of the element reader.
  if (g->packed()) {
    r = c = 0;
    if (a->rows > g->rows || a->rows > b->rows) return;
  }
  const double factors[] = {1.0, -1.0, 0.5, kNan};
  const double s = factors[m.random.below(4)];
  m.begin("qxsmUpdateGinv", m.number(*g), m.number(*a), m.number(*b), r, c, s);
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
  m.begin("qxsmorth", m.number(*a), lo, hi);
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
  list.insert(list.end(), {{call_add_block, 14}, {call_vaxpy, 14}, {call_update, 14}, {call_orthogonal, 6}});
}

}  // namespace sm::test
