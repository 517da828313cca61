// The symbolic factorization with words of a given width.
#pragma once

#include "cholesky/index_width.hpp"
#include "frame/core.hpp"

namespace sm {

// Half words hold twice the number of rows.
[[nodiscard]] SmStatus factor_symbolic(SmMatrix& m, IndexWidth width);

}  // namespace sm
