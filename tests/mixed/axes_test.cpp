#include "mixed/axes.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

namespace sm::mixed::test {
namespace {

TEST(Ticks, are_round_numbers_inside_the_range) {
  EXPECT_EQ(nice_ticks({-1.0, 1.0}, 4), (std::vector<double>{-1.0, -0.5, 0.0, 0.5, 1.0}));
  EXPECT_EQ(nice_ticks({3.0, 47.0}, 5), (std::vector<double>{10.0, 20.0, 30.0, 40.0}));
  const std::vector<double> small = nice_ticks({1e-7, 9e-7}, 4);
  ASSERT_EQ(small.size(), 4U);
  EXPECT_DOUBLE_EQ(small[0], 2e-7);
}

TEST(Ticks, are_two_or_more_in_every_range) {
  for (int i = 0; i < 2000; ++i) {
    const double lo = std::sin(1.0 + i) * std::pow(10.0, i % 13 - 6);
    const double length = (1.1 + std::cos(3.0 * i)) * std::pow(10.0, i % 7 - 3);
    for (const int count : {3, 5, 8}) {
      const std::vector<double> ticks = nice_ticks({lo, lo + length}, count);
      EXPECT_GE(ticks.size(), 2U) << lo << " " << length << " " << count;
      EXPECT_LE(ticks.size(), static_cast<std::size_t>(2 * count)) << lo << " " << length << " " << count;
      EXPECT_GE(ticks.front(), lo - 1e-6 * length);
      EXPECT_LE(ticks.back(), lo + length * (1.0 + 1e-6));
    }
  }
}

TEST(Ticks, have_the_decimals_of_their_step) {
  EXPECT_EQ(tick_text(0.0, 0.5), "0");
  EXPECT_EQ(tick_text(-0.5, 0.5), "−0.5");
  EXPECT_EQ(tick_text(20.0, 10.0), "20");
  EXPECT_EQ(tick_text(0.25, 0.05), "0.25");
  EXPECT_EQ(tick_text(3e6, 1e6), "3e+06");
  EXPECT_EQ(tick_text(12'500'000.0, 500'000.0), "1.25e+07");
  EXPECT_EQ(tick_text(-2e-7, 1e-7), "−2e-07");
}

TEST(Ranges, pass_over_what_is_no_number_and_are_never_empty) {
  const double values[] = {std::nan(""), 2.0, -1.0, std::numeric_limits<double>::infinity()};
  EXPECT_EQ(range_of(values).lo, -1.0);
  EXPECT_EQ(range_of(values).hi, 2.0);
  EXPECT_EQ(padded({0.0, 0.0}).lo, -1.0);
  EXPECT_EQ(padded({0.0, 0.0}).hi, 1.0);
  EXPECT_EQ(padded({4.0, 4.0}).lo, 2.0);
  const Range rounded = padded({4.0, 4.0 + 4e-15});
  EXPECT_GT(rounded.hi - rounded.lo, 1.0);
  EXPECT_DOUBLE_EQ(padded({0.0, 10.0}, 0.1).hi, 11.0);
}

TEST(Counts, have_their_thousands_apart) {
  EXPECT_EQ(count_text(0), "0");
  EXPECT_EQ(count_text(999), "999");
  EXPECT_EQ(count_text(1000), "1,000");
  EXPECT_EQ(count_text(1234567), "1,234,567");
  EXPECT_EQ(count_text(-100000), "-100,000");
}

TEST(Panel, maps_its_range_to_its_rectangle) {
  svg::Canvas canvas(300.0, 200.0, "");
  const Panel panel(canvas, 50.0, 20.0, 200.0, 100.0, {-1.0, 1.0}, {0.0, 10.0});
  EXPECT_EQ(panel.x(-1.0), 50.0);
  EXPECT_EQ(panel.x(1.0), 250.0);
  EXPECT_EQ(panel.y(0.0), 120.0);
  EXPECT_EQ(panel.y(10.0), 20.0);
}

TEST(Panels, stand_three_abreast_and_four_by_twos) {
  EXPECT_EQ(panels_across(1), 1U);
  EXPECT_EQ(panels_across(3), 3U);
  EXPECT_EQ(panels_across(4), 2U);
  EXPECT_EQ(panels_across(7), 3U);
}

}  // namespace
}  // namespace sm::mixed::test
