// Moving the stored rows of a symmetric sparse matrix into the factor's order, and back.
#pragma once

#include "frame/core.hpp"

namespace sm {

// Undoes reorder in the workspace that ordering left: upper triangle, columns ascending. Allocates nothing.
void restore_order(SmMatrix& m);

}  // namespace sm
