// What a computed and a given ordering have in common.
#pragma once

#include "frame/core.hpp"

namespace sm {

[[nodiscard]] Gate may_order(const SmMatrix& m);

// Takes a workspace one step larger than the one there is, which goes back; the first is of 4n + 5 nnz words. After a
// refusal (105, 101) there is none.
[[nodiscard]] SmStatus grow_workspace(SmMatrix& m);

}  // namespace sm
