// Boundaries of the parameter space that are none.
#include <gtest/gtest.h>

#include "loaded_module.hpp"
#include "mixed/estimate.hpp"
#include "support.hpp"

namespace sm::mixed::test {
namespace {

// Effects with a correlation of nearly one and variances 1e6 times the residual's: the curvature across the boundary is
// small beside that along it, and the criterion falls inside all the same.
TEST(NearlyABoundary, is_left_when_the_criterion_falls_inside) {
  const std::string table =
      "y,x,g\n-477.7733432,0.392222,g0\n1718.375987,0,g1\n-812.1233729,0.016289,g2\n117.446522,0.0570928,g3\n"
      "-690.3687361,1,g0\n2244.469448,0.305996,g1\n-1598.069252,1,g2\n220.5635279,1,g3\n-1033.628057,2,g0\n"
      "1726.217437,0.00415112,g1\n-2400.764271,2,g2\n957.7422166,7.77323,g3\n-1377.90261,3,g0\n"
      "1878.279619,0.0926084,g1\n-3662.683401,3.58135,g2\n1747.74988,15.0425,g3\n-8583.777659,23.8464,g0\n"
      "8590.084417,4,g1\n-3999.295935,4,g2\n209.6767739,0.91189,g3\n-517.7337903,0.505541,g0\n"
      "63718.72083,36.0994,g1\n-1040.888252,0.303367,g2\n655.5871857,5,g3\n-1542.96304,3.47023,g0\n";
  LoadedModule loaded;
  const Model model = model_of(table, "y ~ x + (x | g)");
  const Fit found = fit(model, loaded.module(), {});
  const Fit inside = fit(model, loaded.module(), {.start = {found.theta[0], found.theta[1], 0.4}});
  EXPECT_EQ(found.convergence, Convergence::converged);
  EXPECT_LE(found.criterion, inside.criterion + 1e-5);
}

}  // namespace
}  // namespace sm::mixed::test
