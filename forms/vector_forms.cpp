// Forms of plain vectors around a square matrix.
//
//                           X A X'      X' A Y
//   general 21, 22, 23      as stored   124
//   symmetric 21, 22, 23    yes         yes
//   diagonal                yes         yes
#include "forms/lines.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

// Element (a, b), a <= b, at b(b+1)/2 + a.
struct PackedForm {
  double* r;
  i64 p, q;
  i64 first_col(i64 a) const { return a; }
  i64 rows_of(i64 b) const { return b + 1; }
  double& at(i64 a, i64 b) const { return r[PackedColumns{p}.at(a, b)]; }
};

// Element (a, b) at a + b p.
struct FullForm {
  double* r;
  i64 p, q;
  i64 first_col(i64) const { return 0; }
  i64 rows_of(i64) const { return p; }
  double& at(i64 a, i64 b) const { return r[a + b * p]; }
};

// Vectors of `length` components, one after the other.
struct Vectors {
  const double* v;
  i64 length;
  const double* at(i64 k) const { return v + k * length; }
};

// What line o adds to the form: its sum with each vector is taken once and meets component o of every partner.
template <class View, class Form>
void add_line(const View& view, i64 o, Range range, const Vectors& x, const Vectors& y, const Form& form) {
  const i64 at = o - range.first;
  const bool is_row = lines_are_rows(view);
  const auto sum_is_right = [&](i64 b, const LineSum& sum) {  // x_a[o] (A y_b)[o]
    if (!View::one_triangle && !is_row) return;
    if (!sum.has_any()) return;
    for (i64 a = 0; a < form.rows_of(b); ++a) form.at(a, b) += x.at(a)[at] * sum.total();
  };
  const auto sum_is_left = [&](i64 a, const LineSum& sum) {  // (x_a' A)[o] y_b[o], of a triangle the mirrored part
    if (!View::one_triangle && is_row) return;
    if (!sum.has_off) return;
    for (i64 b = form.first_col(a); b < form.q; ++b) form.at(a, b) += sum.off * y.at(b)[at];
  };
  const bool same = x.v == y.v && form.p == form.q;
  for (i64 b = 0; b < form.q; ++b) {
    const LineSum sum = line_sum(view, o, range, y.at(b));
    sum_is_right(b, sum);
    if (same) sum_is_left(b, sum);
  }
  for (i64 a = 0; a < form.p && !same; ++a) sum_is_left(a, line_sum(view, o, range, x.at(a)));
}

template <class View, class Form>
void add_form(const View& view, Range range, const double* x, const double* y, const Form& form) {
  const i64 length = range.size();
  for (i64 o = range.first; o <= range.last; ++o) add_line(view, o, range, {x, length}, {y, length}, form);
}

Gate may_form(const SmMatrix& a) {
  SM_STOP_WITH(may_read(a));
  SM_STOP_IF(a.rows != a.cols, SM_NOT_SQUARE);
  return {};
}

}  // namespace

SmStatus form_of_vectors(SmMatrix& a, const double* x, double* r, i64 p, Range range) {
  SM_PASS(may_form(a));
  if (!range.is_within(a.rows)) return SM_DIMENSION_MISMATCH;
  const auto form = [&](const auto& view) {
    if (p < 1) return SM_OK;
    std::fill_n(r, p * (p + 1) / 2, 0.0);
    add_form(view, range, x, x, PackedForm{r, p, p});
    return SM_OK;
  };
  return visit(a, form, SM_OK);
}

SmStatus bilinear_form(SmMatrix& a, const double* x, const double* y, double* r, i64 p, i64 q) {
  SM_PASS(may_form(a));
  if (x == r || y == r) return SM_BAD_ARGUMENT;
  if (p > 0 && q > 0) std::fill_n(r, p * q, 0.0);
  if (a.kind == SM_KIND_GENERAL) return SM_UNAVAILABLE;
  const auto form = [&](const auto& view) {
    if (p > 0 && q > 0) add_form(view, {0, a.rows - 1}, x, y, FullForm{r, p, q});
    return SM_OK;
  };
  return visit(a, form, SM_OK);
}

}  // namespace sm
