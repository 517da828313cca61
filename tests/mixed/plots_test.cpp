#include "mixed/plots.hpp"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>

#include "mixed/example_fit.hpp"
#include "mixed/scratch_folder.hpp"
#include "mixed/xml.hpp"

namespace sm::mixed::test {
namespace {

using Strings = std::vector<std::string>;

constexpr std::size_t kMegabyte = 1'000'000;

// The texts of a drawing, in order.
Strings texts(const std::string& svg) {
  Strings out;
  for (const Element& element : named(parsed_xml(svg), "text")) out.push_back(element.text);
  return out;
}

bool says(const std::string& svg, const std::string& text) {
  const Strings all = texts(svg);
  return std::find(all.begin(), all.end(), text) != all.end();
}

std::size_t dots(const std::string& svg) { return named(parsed_xml(svg), "circle").size(); }

void expect_sound(const Example& e, const std::string& what) {
  for (const NamedText& plot : plots(e.model, e.fit)) {
    const Document document = parsed_xml(plot.text);
    EXPECT_EQ(document.fault, "") << what << " " << plot.name;
    EXPECT_LT(plot.text.size(), kMegabyte) << what << " " << plot.name;
    EXPECT_EQ(plot.text.find("nan"), std::string::npos) << what << " " << plot.name;
    EXPECT_EQ(plot.text.find("inf"), std::string::npos) << what << " " << plot.name;
  }
}

// A pattern of which no two neighbours are alike, which no run of cells shortens.
SpyPattern checkered(std::int64_t order) {
  SpyPattern pattern{.order = order, .entries = 0, .places = {}};
  for (std::int64_t row = 0; row < order; ++row) {
    for (std::int64_t col = row; col < order; ++col) {
      for (std::int64_t times = (row + col) % 4; times > 0; --times) pattern.places.emplace_back(row, col);
    }
  }
  pattern.entries = static_cast<std::int64_t>(pattern.places.size());
  return pattern;
}

TEST(Plots, are_well_formed_and_small_whatever_the_fit_holds) {
  expect_sound(example_fit(), "example");
  expect_sound(Example{}, "nothing");
  expect_sound(drawn_fit(1, 1), "one level");
  expect_sound(drawn_fit(6, 40), "six levels");
  Example large = drawn_fit(10'000, 100'000);
  large.fit.spy_equations = large.fit.spy_factor = checkered(200);
  expect_sound(large, "large");
  Example dotted = drawn_fit(150, 5'000);
  for (int i = 0; i < 29; ++i) dotted.fit.ranef.push_back(dotted.fit.ranef[0]);
  expect_sound(dotted, "many terms");
}

TEST(Plots, survive_hostile_names_and_numbers) {
  Example e = drawn_fit(hostile_names().size(), 20);
  e.fit.ranef[0].levels = hostile_names();
  for (const std::string& name : hostile_names()) {
    e.model.formula = e.model.response = e.fit.ranef[0].group = e.fit.ranef[0].term = name;
    expect_sound(e, name);
  }
  e.fit.residuals[3] = std::nan("");
  e.fit.fitted[4] = HUGE_VAL;
  e.fit.sigma = 0.0;
  e.fit.iterations = {{std::nan(""), std::nan(""), 0.0}, {5.0, 0.0, 0.0}, {5.0, HUGE_VAL, 0.0}};
  e.fit.ranef[0].estimate[0] = std::nan("");
  e.fit.ranef[0].pev_sd[1] = std::nan("");
  e.fit.spy_factor = {.order = 2, .entries = 2, .places = {{0, 0}, {5, 9}}};
  expect_sound(e, "numbers");
}

TEST(CaterpillarPlot, has_a_row_for_each_level_in_order_of_the_effects) {
  const Example e = example_fit();
  const std::string svg = caterpillar_plot(e.model, e.fit);
  EXPECT_EQ(dots(svg), 6U);
  EXPECT_TRUE(says(svg, "Random effects with 95 % prediction intervals"));
  EXPECT_TRUE(says(svg, "y ~ x + f + (x | g)"));
  EXPECT_TRUE(says(svg, "g · (Intercept)"));
  EXPECT_TRUE(says(svg, "g · x"));
  EXPECT_TRUE(says(svg, "3 levels"));
  Strings levels = texts(svg);
  std::erase_if(levels, [](const std::string& text) { return text != "u" && text != "v" && text != "w"; });
  EXPECT_EQ(levels, (Strings{"v", "u", "w", "v", "u", "w"}));
}

TEST(CaterpillarPlot, draws_bars_of_1_96_prediction_errors) {
  const Example e = drawn_fit(2, 3);
  const Document document = parsed_xml(caterpillar_plot(e.model, e.fit));
  std::vector<double> at;
  for (const Element& circle : named(document, "circle")) at.push_back(std::stod(circle.attributes.at("cx")));
  ASSERT_EQ(at.size(), 2U);
  std::vector<double> estimates = e.fit.ranef[0].estimate;
  std::sort(estimates.begin(), estimates.end());
  const double scale = (at[1] - at[0]) / (estimates[1] - estimates[0]);
  std::string bars;
  for (const Element& path : named(document, "path")) {
    if (path.attributes.at("d").find('H') != std::string::npos) bars = path.attributes.at("d");
  }
  const double from = std::stod(bars.substr(1));
  const double to = std::stod(bars.substr(bars.find('H') + 1));
  EXPECT_NEAR(to - from, 2.0 * 1.96 * 0.75 * scale, 0.05);
  EXPECT_NEAR(0.5 * (from + to), at[0], 0.02);
}

TEST(CaterpillarPlot, thins_many_levels_and_keeps_the_extremes) {
  const Example e = drawn_fit(10'000, 10);
  const std::string svg = caterpillar_plot(e.model, e.fit);
  EXPECT_EQ(dots(svg), 100U);
  EXPECT_TRUE(says(svg, "100 of 10,000 levels, evenly by rank"));
  const std::vector<double>& estimate = e.fit.ranef[0].estimate;
  const auto [least, most] = std::minmax_element(estimate.begin(), estimate.end());
  for (const auto place : {least, most}) {
    EXPECT_TRUE(says(svg, e.model.random[0].levels[static_cast<std::size_t>(place - estimate.begin())]));
  }
  EXPECT_EQ(dots(caterpillar_plot(drawn_fit(150, 10).model, drawn_fit(150, 10).fit)), 150U);
}

TEST(CaterpillarPlot, says_what_it_cannot_show) {
  Example e = drawn_fit(4, 10);
  std::fill(e.fit.ranef[0].estimate.begin(), e.fit.ranef[0].estimate.end(), 0.0);
  EXPECT_TRUE(says(caterpillar_plot(e.model, e.fit), "4 levels; the variance is zero"));
  e.fit.ranef[0].pev_sd.clear();
  EXPECT_TRUE(says(caterpillar_plot(e.model, e.fit), "Random effects"));
  EXPECT_TRUE(says(caterpillar_plot(Model{}, Fit{}), "There are no random effects."));
}

TEST(ResidualPlot, has_a_dot_for_each_of_few_observations) {
  const Example e = drawn_fit(3, 500);
  const std::string svg = residual_plot(e.model, e.fit);
  EXPECT_EQ(dots(svg), 500U);
  EXPECT_TRUE(says(svg, "500 observations"));
  EXPECT_TRUE(says(svg, "fitted y"));
  EXPECT_TRUE(says(svg, "residual"));
  EXPECT_TRUE(says(svg, "local regression"));
  EXPECT_FALSE(says(residual_plot(drawn_fit(3, 29).model, drawn_fit(3, 29).fit), "local regression"));
}

TEST(ResidualPlot, has_hexagons_for_many) {
  const Example e = drawn_fit(3, 30'000);
  const std::string svg = residual_plot(e.model, e.fit);
  EXPECT_EQ(dots(svg), 0U);
  EXPECT_TRUE(says(svg, "30,000 observations"));
  EXPECT_TRUE(says(svg, "≥ 1"));
}

TEST(QuantilePlot, has_a_panel_for_the_residuals_and_for_each_coefficient) {
  const Example e = example_fit();
  const std::string svg = quantile_plot(e.model, e.fit);
  EXPECT_EQ(dots(svg), 4U + 3U + 3U);
  EXPECT_TRUE(says(svg, "Residuals"));
  EXPECT_TRUE(says(svg, "g · x"));
  EXPECT_TRUE(says(svg, "standardised residual"));
}

TEST(QuantilePlot, thins_the_middle_and_keeps_the_tails) {
  const Example e = drawn_fit(10, 50'000);
  const Document document = parsed_xml(quantile_plot(e.model, e.fit));
  std::vector<double> xs;
  for (const Element& circle : named(document, "circle")) xs.push_back(std::stod(circle.attributes.at("cx")));
  ASSERT_GT(xs.size(), 1'000U);
  ASSERT_LT(xs.size(), 1'600U);
  // The first panel's: symmetric about its middle to the last of both tails.
  const std::size_t n = xs.size() - 10;
  for (std::size_t i = 0; i < 20; ++i) EXPECT_NEAR(xs[i] + xs[n - 1 - i], xs[0] + xs[n - 1], 0.03);
}

TEST(CriterionPlot, has_a_dot_for_each_iteration_and_rings_for_the_smallest_value) {
  const Example e = example_fit();
  const std::string svg = criterion_plot(e.model, e.fit);
  const std::vector<Element> circles = named(parsed_xml(svg), "circle");
  EXPECT_EQ(circles.size(), 8U);
  EXPECT_EQ(
      std::count_if(circles.begin(), circles.end(), [](const Element& c) { return c.attributes.count("stroke"); }), 1);
  EXPECT_TRUE(says(svg, "open circles: at the smallest value, 50.500000"));
  EXPECT_TRUE(says(svg, "at the end 2.5e-11"));
}

TEST(CriterionPlot, says_why_there_is_nothing_to_draw) {
  Example e = example_fit();
  e.fit.iterations.clear();
  EXPECT_TRUE(says(criterion_plot(e.model, e.fit), "There were no iterations."));
  e.fit.variances_given = true;
  EXPECT_TRUE(says(criterion_plot(e.model, e.fit), "The variances are given: nothing was iterated."));
}

TEST(SpyPlot, mirrors_the_equations_but_not_the_factor) {
  const Example e = example_fit();
  const std::string svg = spy_plot(e.model, e.fit);
  Strings cells;
  for (const Element& path : named(parsed_xml(svg), "path")) {
    if (path.attributes.count("fill") > 0) cells.push_back(path.attributes.at("d"));
  }
  EXPECT_EQ(cells, (Strings{"M0 0h1v1h-1zM2 0h1v1h-1zM1 1h1v1h-1zM0 2h1v1h-1zM2 2h1v1h-1z",
                            "M0 0h1v1h-1zM2 0h1v1h-1zM1 1h2v1h-2zM2 2h1v1h-1z"}));
  EXPECT_TRUE(says(svg, "30 entries in the upper triangle"));
  EXPECT_TRUE(says(svg, "33 entries, fill ratio 1.10"));
}

TEST(SpyPlot, says_what_it_was_drawn_from) {
  Example e = example_fit();
  e.fit.spy_factor.entries = 1'000'000;
  EXPECT_TRUE(says(spy_plot(e.model, e.fit), "order 3, drawn from a sample of 5 entries"));
  e.fit.spy_equations.places.clear();
  EXPECT_TRUE(says(spy_plot(e.model, e.fit), "no pattern was kept"));
}

TEST(Plots, say_that_a_fit_did_not_converge) {
  Example e = example_fit();
  e.fit.convergence = Convergence::stopped;
  EXPECT_TRUE(says(residual_plot(e.model, e.fit), "NOT CONVERGED: y ~ x + f + (x | g)"));
  e.fit.variances_given = true;
  EXPECT_TRUE(says(residual_plot(e.model, e.fit), "y ~ x + f + (x | g)"));
}

TEST(Plots, are_written_as_five_files) {
  const Example e = example_fit();
  const ScratchFolder folder;
  write_plots(folder.path() + "/pictures", e.model, e.fit);
  EXPECT_EQ(names_in(folder.path() + "/pictures"),
            (Strings{"caterpillar.svg", "criterion.svg", "qq.svg", "residuals.svg", "spy.svg"}));
  EXPECT_EQ(content(folder.path() + "/pictures/spy.svg"), spy_plot(e.model, e.fit));
}

}  // namespace
}  // namespace sm::mixed::test
