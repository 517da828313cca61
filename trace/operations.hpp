// Traces, behind the C boundary.
#pragma once

#include "frame/core.hpp"

namespace sm {

[[nodiscard]] SmStatus trace(SmMatrix& a, double& result);
[[nodiscard]] SmStatus trace_of_product(SmMatrix& a, SmMatrix& b, double& result);
[[nodiscard]] SmStatus trace_of_inverse_product(SmMatrix& a, SmMatrix& b, i64 start, double& result);

}  // namespace sm
