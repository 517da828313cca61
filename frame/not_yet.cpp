// Operations that this release declares but does not serve yet: each answers 124 and touches nothing.
#include "frame/core.hpp"

extern "C" SmStatus qxsmmultv(SmMatrix*, const double*, double*, int64_t, int64_t, int64_t, int64_t, int64_t, int32_t) {
  return SM_UNAVAILABLE;
}
extern "C" SmStatus qxsmvmult(const double*, SmMatrix*, double*, int64_t, int32_t) { return SM_UNAVAILABLE; }
extern "C" SmStatus qxsmquadv(SmMatrix*, const double*, double*, int64_t, int64_t, int64_t) { return SM_UNAVAILABLE; }
extern "C" SmStatus qxsmbilin(SmMatrix*, const double*, const double*, double*, int64_t, int64_t) {
  return SM_UNAVAILABLE;
}
extern "C" SmStatus qxsmquad(SmMatrix*, SmMatrix*, SmMatrix*, int32_t) { return SM_UNAVAILABLE; }
extern "C" SmStatus qxsmDenseQuad(SmMatrix*, const double*, SmMatrix*, int32_t) { return SM_UNAVAILABLE; }
extern "C" SmStatus qxsminvquadv(SmMatrix*, const double*, double*, int64_t, int32_t) { return SM_UNAVAILABLE; }
extern "C" SmStatus qxsminvquad(SmMatrix*, SmMatrix*, SmMatrix*) { return SM_UNAVAILABLE; }
extern "C" SmStatus qxsminvbilin(SmMatrix*, const double*, const double*, double*, int64_t, int64_t) {
  return SM_UNAVAILABLE;
}
extern "C" SmStatus qxsmmults(SmMatrix*, double) { return SM_UNAVAILABLE; }
extern "C" SmStatus qxsmmultm(SmMatrix*, SmMatrix*, SmMatrix*, int32_t) { return SM_UNAVAILABLE; }
