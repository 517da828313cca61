#include "mixed/ratio.hpp"

#include <gtest/gtest.h>

#include <cmath>

#include "mixed/error.hpp"

namespace sm::mixed::test {
namespace {

VarianceComponent component(const std::string& group, const std::string& var1, const std::string& var2 = {},
                            double value = 0.0) {
  VarianceComponent c;
  c.group = group;
  c.var1 = var1;
  c.var2 = var2;
  c.vcov = value;
  return c;
}

const std::vector<VarianceComponent>& components() {
  static const std::vector<VarianceComponent> all{component("animal", "(Intercept)", "", 3.0),
                                                  component("nest:year", "(Intercept)", "", 0.7),
                                                  component("Subject", "(Intercept)", "", 5.0),
                                                  component("Subject", "(Intercept)", "Days", -0.4),
                                                  component("Subject", "Days", "", 1.3),
                                                  component("my group (2)", "(Intercept)", "", 0.9),
                                                  component("Residual", "", "", 2.0)};
  return all;
}

std::vector<double> values() {
  std::vector<double> v;
  for (const VarianceComponent& c : components()) v.push_back(c.vcov);
  return v;
}

double value_of(const std::string& text) { return parse_ratio(text, components())(values()).value; }

std::string refusal(const std::string& text) {
  try {
    parse_ratio(text, components());
  } catch (const ModelError& error) {
    return error.what();
  }
  ADD_FAILURE() << "taken: " << text;
  return {};
}

TEST(Ratio, is_evaluated_by_the_rules_of_arithmetic) {
  EXPECT_DOUBLE_EQ(value_of("h2 = animal / (animal + residual)"), 3.0 / 5.0);
  EXPECT_DOUBLE_EQ(value_of("1 + 2 * 3 - 8 / 4 / 2"), 6.0);
  EXPECT_DOUBLE_EQ(value_of("10 - 3 - 2"), 5.0);
  EXPECT_DOUBLE_EQ(value_of("-animal * -2"), 6.0);
  EXPECT_DOUBLE_EQ(value_of("--3 - -1"), 4.0);
  EXPECT_DOUBLE_EQ(value_of("2.5e1 * .5"), 12.5);
  EXPECT_DOUBLE_EQ(value_of("((animal))"), 3.0);
}

TEST(Ratio, knows_groups_terms_covariances_and_sums) {
  EXPECT_DOUBLE_EQ(value_of("nest:year"), 0.7);
  EXPECT_DOUBLE_EQ(value_of("animal[(Intercept)]"), 3.0);
  EXPECT_DOUBLE_EQ(value_of("Subject[Days] / Subject[ (Intercept) ]"), 1.3 / 5.0);
  EXPECT_DOUBLE_EQ(value_of("Subject[Days, (Intercept)]"), -0.4);
  EXPECT_DOUBLE_EQ(value_of("`my group (2)`"), 0.9);
  EXPECT_DOUBLE_EQ(value_of("residual"), 2.0);
  EXPECT_DOUBLE_EQ(value_of("Residual"), 2.0);
  EXPECT_DOUBLE_EQ(value_of("total"), 3.0 + 0.7 + 5.0 + 1.3 + 0.9 + 2.0);
}

TEST(Ratio, lets_a_group_of_the_model_be_called_total) {
  const std::vector<VarianceComponent> own{component("total", "(Intercept)"), component("Residual", "")};
  EXPECT_EQ(parse_ratio("total", own)(std::vector<double>{3.0, 4.0}).value, 3.0);
}

TEST(Ratio, has_a_name_or_is_named_by_its_text) {
  EXPECT_EQ(parse_ratio(" h2 = animal/total", components()).name(), "h2");
  EXPECT_EQ(parse_ratio(" animal/total ", components()).name(), "animal/total");
}

TEST(Ratio, has_the_gradient_that_differences_show) {
  for (const char* text : {"animal / (animal + residual)", "total", "3 * animal * residual - Subject[Days] / total",
                           "-(animal - 2) / (1 + Subject[(Intercept),Days] * animal)", "4 / 3", "animal * animal"}) {
    const RatioFunction ratio = parse_ratio(text, components());
    const std::vector<double> gradient = ratio(values()).gradient;
    ASSERT_EQ(gradient.size(), components().size());
    for (std::size_t i = 0; i < gradient.size(); ++i) {
      const double h = 1e-5;
      std::vector<double> above = values();
      std::vector<double> below = values();
      above[i] += h;
      below[i] -= h;
      EXPECT_NEAR(gradient[i], (ratio(above).value - ratio(below).value) / (2 * h),
                  1e-7 * (1.0 + std::fabs(gradient[i])))
          << text << i;
    }
  }
}

TEST(Ratio, that_nobody_asked_for_is_each_variance_over_their_sum) {
  const std::vector<RatioFunction> ratios = default_ratios(components());
  ASSERT_EQ(ratios.size(), 5u);
  const std::vector<std::string> names{"animal / total", "nest:year / total", "Subject[(Intercept)] / total",
                                       "Subject[Days] / total", "my group (2) / total"};
  const std::vector<double> parts{3.0, 0.7, 5.0, 1.3, 0.9};
  for (std::size_t i = 0; i < ratios.size(); ++i) {
    EXPECT_EQ(ratios[i].name(), names[i]);
    EXPECT_DOUBLE_EQ(ratios[i](values()).value, parts[i] / 12.9);
  }
}

TEST(Ratio, has_a_standard_error_from_the_covariance_of_what_is_free) {
  const std::vector<VarianceComponent> two{component("a", "(Intercept)", "", 2.0), component("b", "(Intercept)"),
                                           component("Residual", "", "", 3.0)};
  const std::vector<std::size_t> free{0, 2};
  const std::vector<double> covariance{0.5, -0.1, -0.1, 0.25};
  const Ratio ratio = estimate_ratio(parse_ratio("h2 = a / total", two), two, free, covariance);
  EXPECT_EQ(ratio.name, "h2");
  EXPECT_DOUBLE_EQ(ratio.estimate, 0.4);
  // (3, -2) / 25 is the gradient.
  const double variance = (9.0 * 0.5 + 2.0 * 3.0 * -2.0 * -0.1 + 4.0 * 0.25) / 625.0;
  ASSERT_TRUE(ratio.se_delta.has_value());
  EXPECT_DOUBLE_EQ(*ratio.se_delta, std::sqrt(variance));
  EXPECT_FALSE(estimate_ratio(parse_ratio("a", two), two, free, {}).se_delta.has_value());
  const std::vector<double> indefinite{-0.5, 0.0, 0.0, 0.25};
  EXPECT_FALSE(estimate_ratio(parse_ratio("a", two), two, free, indefinite).se_delta.has_value());
}

TEST(Ratio, that_is_not_understood_is_refused_with_the_column) {
  EXPECT_EQ(
      refusal("h2 = animal / (animal + residual"),
      "column 33: 'h2 = animal / (animal + residual': the text ends, expected ')' or an operator; write the ratio "
      "like this: h2 = animal / (animal + residual)");
  const std::vector<std::pair<std::string, std::string>> cases{
      {"h2 = cow / total",
       "column 6: 'h2 = cow / total': 'cow' is no group of the model, expected 'animal', "
       "'nest:year', 'Subject', 'my group (2)', residual or total"},
      {"Subject / total",
       "column 1: 'Subject / total': 'Subject' has 2 variances, expected Subject[(Intercept)] or "
       "Subject[Days]"},
      {"Subject[Weeks]",
       "column 1: 'Subject[Weeks]': 'Subject' has no such term, expected Subject[(Intercept)] or "
       "Subject[(Intercept), Days] or Subject[Days]"},
      {"animal animal", "column 8: 'animal animal': found 'a', expected an operator (+ - * /) or the end"},
      {"animal +", "column 9: 'animal +': the text ends, expected a number, a group of the model"},
      {"animal + * 2", "column 10: 'animal + * 2': found '*', expected a number, a group"},
      {"= animal", "column 1: '= animal': found no name before '=', expected a name"},
      {"Subject[Days", "column 8: 'Subject[Days': the bracket is not closed, expected ']'"},
      {"`animal", "column 1: '`animal': the backquote is not closed"},
      {"1e999", "column 1: '1e999': found '1', expected a finite number"},
      {"", "column 1: the text ends, expected a number"},
      {"x = y = 2", "column 5: 'x = y = 2': 'y' is no group of the model"}};
  for (const auto& [text, message] : cases) {
    const std::string found = refusal(text);
    EXPECT_EQ(found.substr(0, message.size()), message) << text;
    EXPECT_NE(found.find("; write the ratio like this"), std::string::npos);
  }
  EXPECT_NE(refusal(std::string(5000, '(')).find("parentheses nest too deeply"), std::string::npos);
}

}  // namespace
}  // namespace sm::mixed::test
