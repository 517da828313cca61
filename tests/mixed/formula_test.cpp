#include "mixed/formula.hpp"

#include <gtest/gtest.h>

#include "support.hpp"

namespace sm::mixed::test {
namespace {

using Strings = std::vector<std::string>;

Strings labels(const TermList& list) {
  Strings found;
  if (list.intercept) found.emplace_back("1");
  for (std::size_t t = 0; t < list.terms.size(); ++t) found.push_back(list.label(t));
  return found;
}

Strings fixed(const std::string& formula) { return labels(parse_formula(formula).fixed); }

// "1 + x | g; known" of each random term.
Strings random(const std::string& formula) {
  Strings found;
  for (const RandomPart& part : parse_formula(formula).random) {
    std::string text;
    for (const std::string& label : labels(part.terms)) text += (text.empty() ? "" : " + ") + label;
    found.push_back(text + " | " + part.group_label() + (part.known.empty() ? "" : "; " + part.known));
  }
  return found;
}

void expect_refused(const std::string& formula, std::int64_t column, const std::string& what) {
  const Fault fault = fault_of([&] { parse_formula(formula); });
  EXPECT_EQ(fault.column, column) << formula << "\n" << fault.what;
  EXPECT_NE(fault.what.find(what), std::string::npos) << formula << "\n" << fault.what;
}

TEST(Formula, orders_main_effects_by_appearance_and_interactions_behind) {
  EXPECT_EQ(fixed("y ~ b:a + c + a*b"), (Strings{"1", "c", "a", "b", "b:a"}));
  EXPECT_EQ(fixed("y ~ a*b*c"), (Strings{"1", "a", "b", "c", "a:b", "a:c", "b:c", "a:b:c"}));
  EXPECT_EQ(fixed("y ~ x"), (Strings{"1", "x"}));
  EXPECT_EQ(fixed("y ~ 1"), (Strings{"1"}));
}

TEST(Formula, expands_powers_nesting_and_what_is_left_out) {
  EXPECT_EQ(fixed("y ~ (a + b + c)^2"), (Strings{"1", "a", "b", "c", "a:b", "a:c", "b:c"}));
  EXPECT_EQ(fixed("y ~ (a + b + c)^2 - a:b"), (Strings{"1", "a", "b", "c", "a:c", "b:c"}));
  EXPECT_EQ(fixed("y ~ a/b"), (Strings{"1", "a", "a:b"}));
  EXPECT_EQ(fixed("y ~ (a + b)/c"), (Strings{"1", "a", "b", "a:b:c"}));
  EXPECT_EQ(fixed("y ~ a*b - b"), (Strings{"1", "a", "a:b"}));
  EXPECT_EQ(fixed("y ~ a:a + a"), (Strings{"1", "a"}));
  EXPECT_EQ(fixed("y ~ (a + b):c"), (Strings{"1", "a:c", "b:c"}));
  EXPECT_EQ(fixed("y ~ a*(b - b:a)"), (Strings{"1", "a", "b", "a:b"}));
}

TEST(Formula, leaves_the_intercept_out_in_every_way_of_writing_it) {
  for (const char* formula : {"y ~ 0 + x", "y ~ x - 1", "y ~ -1 + x", "y ~ x + 0", "y ~ 1 + x - 1"}) {
    EXPECT_EQ(fixed(formula), (Strings{"x"})) << formula;
  }
  for (const char* formula : {"y ~ 0 + x + 1", "y ~ x - 0", "y ~ +x"}) {
    EXPECT_EQ(fixed(formula), (Strings{"1", "x"})) << formula;
  }
}

TEST(Formula, labels_computed_variables_as_they_are_printed) {
  EXPECT_EQ(fixed("y ~ I(x^2)+log( x+1 )*z+I((x-1)/2)"),
            (Strings{"1", "I(x^2)", "log(x + 1)", "z", "I((x - 1)/2)", "log(x + 1):z"}));
  EXPECT_EQ(fixed("y ~ `odd name` + `plain`"), (Strings{"1", "`odd name`", "plain"}));
  EXPECT_EQ(parse_formula("log(y)/2 ~ x").response_label, "log(y)/2");
  EXPECT_EQ(parse_formula("-y ~ x").response_label, "-y");
}

TEST(Formula, writes_random_terms_out) {
  EXPECT_EQ(random("y ~ (1|g)"), (Strings{"1 | g"}));
  EXPECT_EQ(random("y ~ (x|g) + z + (0 + x | h) + (x - 1 | k)"), (Strings{"1 + x | g", "x | h", "x | k"}));
  EXPECT_EQ(random("y ~ (x*z || g)"), (Strings{"1 | g", "x | g", "z | g", "x:z | g"}));
  EXPECT_EQ(random("y ~ (1 | a/b)"), (Strings{"1 | a", "1 | a:b"}));
  EXPECT_EQ(random("y ~ (x | a/b/c)"), (Strings{"1 + x | a", "1 + x | a:b", "1 + x | a:b:c"}));
  EXPECT_EQ(random("y ~ (1 | a:b) + (1 | id; pedigree) + (1 | id)"),
            (Strings{"1 | a:b", "1 | id; pedigree", "1 | id"}));
  EXPECT_EQ(fixed("y ~ (x | g)"), (Strings{"1"}));
  EXPECT_EQ(fixed("y ~ 0 + (x | g)"), (Strings{}));
}

TEST(Formula, shows_a_caret_below_the_place_of_an_error) {
  const Fault fault = fault_of([] { parse_formula("y ~ \xc3\xa9 + + )"); });
  EXPECT_EQ(fault.column, 11);
  EXPECT_EQ(fault.excerpt, "  y ~ \xc3\xa9 + + )\n            ^");
}

TEST(Formula, refuses_what_is_no_formula_at_its_place) {
  expect_refused("", 1, "empty");
  expect_refused("~ x", 1, "no response");
  expect_refused("y", 2, "no tilde");
  expect_refused("y x ~ z", 3, "\"x\"");
  expect_refused("", 1, "the formula is empty");
  EXPECT_EQ(fault_of([] { parse_formula(""); }).file, "formula");
  expect_refused("y ~", 4, "no term");
  expect_refused("y ~ x ~ z", 7, "second tilde");
  expect_refused("y ~ x +", 8, "the end");
  expect_refused("y ~ x z", 7, "\"z\"");
  expect_refused("y ~ (x", 5, "never closed");
  expect_refused("y ~ log(x", 8, "never closed");
  expect_refused("y ~ x)", 6, "never opened");
  expect_refused("y ~ x | g", 7, "outside parentheses");
  expect_refused("y ~ (x | )", 10, "\")\"");
  expect_refused("y ~ (x | g; 3)", 13, "\"3\"");
  expect_refused("y ~ `x", 5, "never closed");
  expect_refused("y ~ ``", 5, "no name");
  expect_refused("y ~ 3x", 5, "3x");
  expect_refused("y ~ x # z", 7, "#");
  expect_refused("y ~ \"x\"", 5, "quote");
  expect_refused("1 ~ x", 1, "the response");
  expect_refused("(y | g) ~ x", 1, "where a number is computed");
}

TEST(Formula, refuses_by_name_what_it_does_not_have_and_says_what_to_write) {
  for (const auto& [formula, what, advice] :
       std::vector<std::array<std::string, 3>>{{"y ~ poly(x, 2)", "poly()", "I(x^2)"},
                                               {"y ~ ns(x)", "ns()", "spline"},
                                               {"y ~ x + offset(o)", "offset()", "response"},
                                               {"y ~ factor(x)", "factor()", "--factor"},
                                               {"y ~ f(x)", "f()", "in the data"},
                                               {"cbind(y, z) ~ x", "cbind()", "one response"},
                                               {"y ~ log(x, 2)", "2 arguments", "log2"},
                                               {"y ~ a %in% b", "%in%", "a:b"},
                                               {"y ~ x == 2", "==", "TRUE"},
                                               {"y ~ .", "point", "write them out"},
                                               {"y ~ x^1.5", "power", "I(x^2)"},
                                               {"y ~ 2 + x", "number 2", "I()"},
                                               {"y ~ x:1", "\"1\"", "outside"},
                                               {"y ~ x*(1 | g)", "inside a product", "+ (x | g)"},
                                               {"y ~ ((1 | g) | h)", "inside another", "side by side"},
                                               {"y ~ (1 | g + h)", "group", "(1 | a) + (1 | b)"},
                                               {"y ~ (1 | log(g))", "group", "in the data"},
                                               {"y ~ (0 | g)", "without a coefficient", "(1 | g)"},
                                               {"y ~ x - z", "no such term", "name"},
                                               {"y ~ x - (1 | g)", "behind a minus", "leave it out"},
                                               {"y ~ y + x", "response is also a term", "leave it out"},
                                               {"y ~ (1 | g) + (x | g)", "another one holds", "(0 + x | g)"},
                                               {"y ~ I((x | g))", "where a number is computed", "outside"}}) {
    const Fault fault = fault_of([&] { parse_formula(formula); });
    EXPECT_NE(fault.what.find(what), std::string::npos) << formula << ": " << fault.what;
    EXPECT_NE(fault.advice.find(advice), std::string::npos) << formula << ": " << fault.advice;
    EXPECT_GT(fault.column, 0) << formula;
  }
}

TEST(Formula, bounds_what_it_takes_on) {
  EXPECT_NE(fault_of([] { parse_formula("y ~ " + std::string(1000, '(') + "x"); }).what.find("too deep"),
            std::string::npos);
  EXPECT_NE(fault_of([] { parse_formula("y ~ " + std::string(1000, '-') + "x"); }).what.find("too deep"),
            std::string::npos);
  std::string many = "y ~ a0";
  std::string crossed = "y ~ b0";
  for (int i = 1; i < 3000; ++i) many += "+a" + std::to_string(i);
  for (int i = 1; i < 20; ++i) crossed += "*b" + std::to_string(i);
  EXPECT_NE(fault_of([&] { parse_formula(many); }).what.find("words"), std::string::npos);
  EXPECT_NE(fault_of([&] { parse_formula(crossed); }).what.find("terms"), std::string::npos);
  EXPECT_NE(fault_of([] { parse_formula("y ~ " + std::string(200'000, 'x')); }).what.find("bytes"), std::string::npos);
}

}  // namespace
}  // namespace sm::mixed::test
