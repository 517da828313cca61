// Scaling, sums and products of matrices.
#include <cmath>

#include "model/machine.hpp"

namespace sm::test {

namespace {

void scale(Model& a, Values& values, double s) {
  for (Index r = 0; r < a.rows; ++r)
    for (Index c = 0; c < a.cols; ++c)
      if (a.stored(r, c)) values(r, c) *= s;
}

// The separate array of s A, s > 0: the factor grows with the root of s, the inverse shrinks with s.
void scale_separate(Model& a, double s) {
  scale(a, a.w, a.state == SM_STATE_FACTORED ? std::sqrt(s) : 1 / s);
  a.separate_slack = 1e-12;
}

void call_mults(Machine& m) {
  Model* a = m.any();
  if (!a) return;
  const double factors[] = {2.0, 0.5, 1.0, -1.0, 0.0, 0.25};
  const double s = factors[m.random.below(6)];
  m.begin("qxsmmults", *a, s);
  const SmStatus got = m.fn().qxsmmults(a->handle, s);
  if (const auto refused = not_readable(*a)) return m.answer(got, *refused);
  m.answer(got, SM_OK);
  scale(*a, a->v, s);
  if (s > 0) a->log_det += static_cast<double>(a->rank) * std::log(s);
  if (a->symmetric_sparse() && a->state == SM_STATE_FACTORED) {
    for (double& r : a->factor.reciprocal)
      if (r > 0) r /= s;
    // A reciprocal pivot divided by zero is infinite: what it solves is nobody's business, so the record goes.
    if (s == 0) {
      m.begin("qxsmdelete", *a);
      m.answer(m.fn().qxsmdelete(a->handle), SM_OK);
      model_reset(*a);
    }
  } else if (a->dense() && a->state >= SM_STATE_FACTORED) {
    if (a->separate && s > 0) scale_separate(*a, s);
    if (!a->separate) a->spoiled = true;
  }
}

// The answer of A <- A + s B; nothing when little is told about the operands.
std::optional<SmStatus> model_sum(Model& a, Model& b, double s) {
  if (s == 0) return SM_OK;
  if (a.none()) return SM_UNAVAILABLE;
  if (!a.general() && a.rows < b.rows) return SM_DIMENSION_MISMATCH;
  if (a.diagonal() && !b.diagonal()) return SM_UNAVAILABLE;
  if (a.symmetric_sparse() && a.state >= SM_STATE_CLOSED) return SM_ALREADY_CLOSED;
  if (a.general() ? !a.sparse() || !b.general_sparse() : a.kind != b.kind) return SM_KIND_MISMATCH;
  if (a.symmetric() && a.format != b.format) return SM_KIND_MISMATCH;
  if (a.symmetric_sparse() && &a != &b && b.state < SM_STATE_CLOSED) model_close(b, kNan);
  if (a.sparse()) {
    a.takes_cached = a.empty();  // whether adding nothing to nothing voids them is not told
    const Model source = b;
    for (Index r = 0; r < source.rows; ++r)
      for (Index c = 0; c < source.cols; ++c)
        if (source.stored(r, c)) model_assign(a, r, c, true, s == 1 ? source.v(r, c) : s * source.v(r, c));
    return SM_OK;
  }
  const std::vector<double> added = array_of(b.kind, b.format, b.v);
  std::vector<double> sums = array_of(a.kind, a.format, a.v);
  for (std::size_t k = 0; k < added.size(); ++k) sums[k] += s * added[k];
  for (Index r = 0; r < a.rows; ++r)
    for (Index c = 0; c < a.cols; ++c)
      if (a.stored(r, c)) a.v(r, c) = sums[static_cast<std::size_t>(slot_of(a.kind, a.format, a.rows, a.cols, r, c))];
  a.changed();
  return SM_OK;
}

void call_sum(Machine& m) {
  Model* a = m.any();
  Model* b = a && m.random.chance(75)
                 ? m.any([&](const Model& y) { return y.kind == a->kind && y.format == a->format; })
                 : m.any();
  if (!a || !b) return;
  // Nothing is told about what becomes of a dense A that a B without elements is added to, or of a B without rows.
  if ((a->dense() && b->empty()) || (b->symmetric_sparse() && b->state >= SM_STATE_CLOSED && !b->closed())) return;
  const double factors[] = {1.0, -1.0, 0.5, 0.0, 2.0};
  const double s = factors[m.random.below(5)];
  const bool tenth = m.random.chance(50);
  m.begin(tenth ? "qxsmAddSS_10" : "qxsmAddSS", *a, *b, s);
  const SmStatus got = (tenth ? m.fn().qxsmAddSS_10 : m.fn().qxsmAddSS)(a->handle, b->handle, s);
  m.answer(got, *model_sum(*a, *b, s));
}

}  // namespace

void add_product_calls(std::vector<Call>& list) { list.insert(list.end(), {{call_mults, 8}, {call_sum, 20}}); }

}  // namespace sm::test
