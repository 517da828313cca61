#include "mixed/factor_algebra.hpp"

#include <gtest/gtest.h>

#include <cmath>

namespace sm::mixed::test {
namespace {

TEST(FactorOfCovariance, keeps_the_digits_of_a_small_variance_beside_a_large_one) {
  for (const double unit : {1.0, 1e-5, 1e-9, 1e-12}) {
    const Dense covariance{600.0, 12.0 * unit, 12.0 * unit, 35.0 * unit * unit};
    const std::optional<Dense> factor = lower_factor_of_covariance(covariance, 2);
    ASSERT_TRUE(factor);
    const double slope = 12.0 / std::sqrt(600.0);
    EXPECT_NEAR((*factor)[0], std::sqrt(600.0), 1e-13);
    EXPECT_NEAR((*factor)[1] / unit, slope, 1e-14);
    EXPECT_EQ((*factor)[2], 0.0);
    EXPECT_NEAR((*factor)[3] / unit, std::sqrt(35.0 - slope * slope), 1e-14);
  }
}

TEST(FactorOfCovariance, takes_correlations_of_one_and_refuses_larger_ones) {
  const std::optional<Dense> singular = lower_factor_of_covariance({4.0, 2e-6, 2e-6, 1e-12}, 2);
  ASSERT_TRUE(singular);
  EXPECT_NEAR((*singular)[1], 1e-6, 1e-20);
  EXPECT_LT((*singular)[3], 1e-13);
  EXPECT_TRUE(lower_factor_of_covariance({0.0, 0.0, 0.0, 3.0}, 2));
  EXPECT_FALSE(lower_factor_of_covariance({4.0, 2.1e-6, 2.1e-6, 1e-12}, 2));
  EXPECT_FALSE(lower_factor_of_covariance({1.0, 0.0, 0.0, -1e-9}, 2));
}

}  // namespace
}  // namespace sm::mixed::test
