// What a computed and a given ordering have in common.
#pragma once

#include "frame/core.hpp"

namespace sm {

[[nodiscard]] Gate may_order(const SmMatrix& m);

// Takes the workspace that an ordering of a graph with so many edges leaves, in steps of nnz words from 4n + 5 nnz on,
// in place of the one there is. After a refusal (105, 101) there is none.
[[nodiscard]] SmStatus take_workspace(SmMatrix& m, i64 edges);

}  // namespace sm
