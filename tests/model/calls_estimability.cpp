// Estimability, Hermite forms, updates of generalized inverses, the iterative solver.
#include "model/machine.hpp"

namespace sm::test {

void add_estimability_calls(std::vector<Call>& list) { (void)list; }

}  // namespace sm::test
