// The C boundary of products and forms.
#include "forms/operations.hpp"

extern "C" SmStatus qxsmmultv(SmMatrix* a, const double* x, double* y, int64_t r0, int64_t r1, int64_t c0, int64_t c1,
                              int64_t k, int32_t accumulate) {
  return sm::multiply(*a, {x, y, k, accumulate != 0}, {r0, r1}, {c0, c1});
}

extern "C" SmStatus qxsmvmult(const double* x, SmMatrix* a, double* y, int64_t k, int32_t accumulate) {
  return sm::multiply_transposed(*a, {x, y, k, accumulate != 0});
}

extern "C" SmStatus qxsmquadv(SmMatrix* a, const double* x, double* r, int64_t p, int64_t c0, int64_t c1) {
  return sm::form_of_vectors(*a, x, r, p, {c0, c1});
}

extern "C" SmStatus qxsmbilin(SmMatrix* a, const double* x, const double* y, double* r, int64_t p, int64_t q) {
  return sm::bilinear_form(*a, x, y, r, p, q);
}

extern "C" SmStatus qxsmquad(SmMatrix* a, SmMatrix* x, SmMatrix* r, int32_t keep) {
  return sm::form_of_matrix(*a, *x, *r, keep != 0);
}

extern "C" SmStatus qxsmDenseQuad(SmMatrix* g, const double* s, SmMatrix* r, int32_t keep) {
  return sm::form_around_array(*g, s, *r, keep != 0);
}

extern "C" SmStatus qxsminvquadv(SmMatrix* a, const double* x, double* r, int64_t p, int32_t format) {
  return sm::inverse_form_of_vectors(*a, x, r, p, format);
}

extern "C" SmStatus qxsminvquad(SmMatrix* a, SmMatrix* x, SmMatrix* r) {
  return sm::inverse_form_of_matrix(*a, *x, *r);
}

extern "C" SmStatus qxsminvbilin(SmMatrix* a, const double* x, const double* y, double* r, int64_t p, int64_t q) {
  return sm::inverse_bilinear_form(*a, x, y, r, p, q);
}

extern "C" SmStatus qxsmmults(SmMatrix* a, double s) { return sm::scale(*a, s); }

extern "C" SmStatus qxsmmultm(SmMatrix* a, SmMatrix* b, SmMatrix* c, int32_t keep) {
  return sm::multiply_matrices(*a, *b, *c, keep != 0);
}
