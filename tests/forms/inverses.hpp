// What the suites of forms around an inverse share.
#pragma once

#include "forms/forms_support.hpp"

namespace sm::test {

// Whether forms can be had of it: an inverse in format 22 cannot be solved with.
inline bool solvable(Operand operand) {
  return !(operand.shape == kSymmetricColumns && operand.state == SM_STATE_INVERTED);
}

}  // namespace sm::test
