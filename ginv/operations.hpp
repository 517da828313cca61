// Pivots, estimability, accumulation, block updates, inversion, Hermite form: behind the C boundary.
#pragma once

#include "frame/core.hpp"

namespace sm {

[[nodiscard]] SmStatus pivots(SmMatrix& m, char* out);
[[nodiscard]] SmStatus check_estimable(SmMatrix& m, const double* vectors, std::int32_t k, i64& failed,
                                       std::int32_t* flags, char mode, double tolerance);
[[nodiscard]] SmStatus accumulate(SmMatrix& a, SmMatrix& b, double s);
[[nodiscard]] SmStatus update_ginv(SmMatrix& g, SmMatrix& a, SmMatrix& b, i64 r, i64 c, double s);
[[nodiscard]] SmStatus add_ginv(SmMatrix& g, SmMatrix& b, SmMatrix* p, i64 off, double s, double tolerance);
[[nodiscard]] SmStatus invert(SmMatrix& a, bool in_place, double tolerance);
[[nodiscard]] SmStatus hermite(SmMatrix& a, SmMatrix& h);
[[nodiscard]] SmStatus orthogonalise(SmMatrix& a, std::int16_t* active, i64 lo, i64 hi, double tolerance);

}  // namespace sm
