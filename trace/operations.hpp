// Traces, behind the C boundary.
#pragma once

#include "frame/core.hpp"

namespace sm {

[[nodiscard]] SmStatus trace(SmMatrix& a, double& result);
[[nodiscard]] SmStatus trace_of_product(SmMatrix& a, SmMatrix& b, double& result);
[[nodiscard]] SmStatus trace_of_inverse_product(SmMatrix& a, SmMatrix& b, i64 start, double& result);
// The trace of A^- B from selected inversion, for a factored A. False, and the result left alone, where that does not
// serve: A is not sparse, B not symmetric or reordered, an element of B not on the pattern of the factor, no memory.
[[nodiscard]] bool trace_on_pattern(SmMatrix& a, SmMatrix& b, double& result);

}  // namespace sm
