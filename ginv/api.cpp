// The C boundary of generalized inverses.
#include "ginv/operations.hpp"

extern "C" SmStatus qxsmpivot(SmMatrix* matrix, char* pivots) { return sm::pivots(*matrix, pivots); }

extern "C" SmStatus qxsmcke(SmMatrix* matrix, const double* vectors, int32_t k, int64_t* failed_count, int32_t* flags,
                            char mode, double tolerance) {
  return sm::check_estimable(*matrix, vectors, k, *failed_count, flags, mode, tolerance);
}

extern "C" SmStatus qxsmAddSS(SmMatrix* a, SmMatrix* b, double s) { return sm::accumulate(*a, *b, s); }

extern "C" SmStatus qxsmUpdateGinv(SmMatrix* g, SmMatrix* a, SmMatrix* b, int64_t r, int64_t c, double s) {
  return sm::update_ginv(*g, *a, *b, r, c, s);
}

extern "C" SmStatus qxsmAddGinv(SmMatrix* g, SmMatrix* b, SmMatrix* p, int64_t off, double s, double tolerance) {
  return sm::add_ginv(*g, *b, p, off, s, tolerance);
}

extern "C" SmStatus qxsminv(SmMatrix* a, int16_t in_place, double tolerance) {
  return sm::invert(*a, in_place != 0, tolerance);
}

extern "C" SmStatus qxsmhermite(SmMatrix* a, SmMatrix* h) { return sm::hermite(*a, *h); }

extern "C" SmStatus qxsmorth(SmMatrix* a, int16_t* active, int64_t lo, int64_t hi, double tolerance) {
  return sm::orthogonalise(*a, active, lo, hi, tolerance);
}
