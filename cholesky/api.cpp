// The C boundary of ordering, factorization and direct solves.
#include "cholesky/steps.hpp"

extern "C" SmStatus qxsmmd(SmMatrix* matrix) { return sm::order(*matrix); }
extern "C" SmStatus qxsmorder(SmMatrix* matrix, const int64_t* perm) { return sm::order_as_given(*matrix, perm); }
extern "C" SmStatus qxsmreorder(SmMatrix* matrix) { return sm::reorder(*matrix); }
extern "C" SmStatus qxsmsymbfact(SmMatrix* matrix) { return sm::factor_symbolic(*matrix); }
extern "C" SmStatus qxsmnumfact(SmMatrix* matrix) { return sm::factor_numeric(*matrix); }

extern "C" SmStatus qxsmrefill(SmMatrix* matrix, const double* values) { return sm::refill(*matrix, values); }

extern "C" SmStatus qxsmfact(SmMatrix* matrix, int32_t in_place) {
  return sm::factor(*matrix, static_cast<int16_t>(in_place) != 0);
}

extern "C" SmStatus qxsmlogdet(SmMatrix* matrix, double* out) { return sm::log_determinant(*matrix, *out); }
extern "C" SmStatus qxsmrank(SmMatrix* matrix, int64_t* out) { return sm::rank(*matrix, *out); }

extern "C" SmStatus qxsmsubst(SmMatrix* matrix, const double* b, double* x, int32_t count) {
  return sm::substitute(*matrix, b, x, count);
}

extern "C" SmStatus qxsminvmultv(SmMatrix* matrix, const double* b, double* x, int64_t count) {
  return sm::apply_inverse(*matrix, b, x, count);
}

extern "C" SmStatus qxsmsoldirect(SmMatrix* matrix, const double* b, double* x, int32_t count) {
  return sm::solve_direct(*matrix, b, x, count);
}

extern "C" SmStatus qxsminvdiag(SmMatrix* matrix, double* x) { return sm::inverse_diagonal(*matrix, x); }

extern "C" SmStatus qxsminvpattern(SmMatrix* matrix, double* values) { return sm::inverse_on_pattern(*matrix, values); }
