#include "mixed/design.hpp"

#include <gtest/gtest.h>

#include <cmath>

#include "support.hpp"

namespace sm::mixed::test {
namespace {

using Strings = std::vector<std::string>;
using Numbers = std::vector<double>;
using Rows = std::vector<Numbers>;
using Indices = std::vector<std::int64_t>;

// Two factors of two and three levels, every cell twice, and a number.
const std::string kCrossed =
    "y,f,g,x\n1,b,q,1\n2,a,p,2\n3,b,r,3\n4,a,q,4\n5,b,p,5\n7,a,r,6\n"
    "6,b,q,7\n8,a,p,8\n9,b,r,9\n10,a,q,10\n12,b,p,11\n11,a,r,0\n";

Strings names(const std::string& formula, const DesignOptions& options = {}) {
  return model_of(kCrossed, formula, options).fixed.names;
}

TEST(Design, codes_factors_by_treatment_contrasts_beside_their_margins) {
  const Model model = model_of(kCrossed, "y ~ f*g + x");
  EXPECT_EQ(model.fixed.names, (Strings{"(Intercept)", "fb", "gq", "gr", "x", "fb:gq", "fb:gr"}));
  EXPECT_EQ(model.fixed.term_names, (Strings{"(Intercept)", "f", "g", "x", "f:g"}));
  EXPECT_EQ(model.fixed.term, (Indices{0, 1, 2, 2, 3, 4, 4}));
  const Rows x = dense(model.fixed.x);
  EXPECT_EQ(x[0], (Numbers{1, 1, 1, 0, 1, 1, 0}));
  EXPECT_EQ(x[1], (Numbers{1, 0, 0, 0, 2, 0, 0}));
  EXPECT_EQ(x[2], (Numbers{1, 1, 0, 1, 3, 0, 1}));
  EXPECT_EQ(model.fixed.rank(), 7);
  EXPECT_EQ(model.y[5], 7.0);
  ASSERT_EQ(model.factors.size(), 2u);
  EXPECT_EQ(model.factors[1].levels, (Strings{"p", "q", "r"}));
}

TEST(Design, codes_a_factor_by_dummies_where_its_margin_is_absent) {
  EXPECT_EQ(names("y ~ f:g"), (Strings{"(Intercept)", "fa:gp", "fb:gp", "fa:gq", "fb:gq", "fa:gr", "fb:gr"}));
  EXPECT_EQ(names("y ~ f + f:g"), (Strings{"(Intercept)", "fb", "fa:gq", "fb:gq", "fa:gr", "fb:gr"}));
  EXPECT_EQ(names("y ~ g + f:g"), (Strings{"(Intercept)", "gq", "gr", "gp:fb", "gq:fb", "gr:fb"}));
  EXPECT_EQ(names("y ~ x:f"), (Strings{"(Intercept)", "x:fa", "x:fb"}));
  EXPECT_EQ(names("y ~ x + x:f"), (Strings{"(Intercept)", "x", "x:fb"}));
  EXPECT_EQ(names("y ~ f + f:x"), (Strings{"(Intercept)", "fb", "fa:x", "fb:x"}));
}

TEST(Design, puts_each_row_of_an_interaction_into_the_column_of_its_levels) {
  for (const char* formula : {"y ~ 0 + f:g", "y ~ 0 + g:f"}) {
    const Model model = model_of(kCrossed, formula);
    const Strings cells = formula == std::string("y ~ 0 + f:g")
                              ? Strings{"fb:gq", "fa:gp", "fb:gr", "fa:gq", "fb:gp", "fa:gr"}
                              : Strings{"gq:fb", "gp:fa", "gr:fb", "gq:fa", "gp:fb", "gr:fa"};
    const Rows x = dense(model.fixed.x);
    for (std::size_t i = 0; i < x.size(); ++i) {
      for (std::size_t j = 0; j < 6; ++j)
        EXPECT_EQ(x[i][j], model.fixed.names[j] == cells[i % 6] ? 1.0 : 0.0) << i << j;
    }
  }
}

TEST(Design, gives_the_first_factor_all_its_dummies_without_an_intercept) {
  EXPECT_EQ(names("y ~ 0 + f + g"), (Strings{"fa", "fb", "gq", "gr"}));
  EXPECT_EQ(names("y ~ 0 + x + f + g"), (Strings{"x", "fa", "fb", "gq", "gr"}));
  EXPECT_EQ(names("y ~ 0 + f:g"), (Strings{"fa:gp", "fb:gp", "fa:gq", "fb:gq", "fa:gr", "fb:gr"}));
  EXPECT_EQ(names("y ~ 0 + x + x:f"), (Strings{"x", "x:fa", "x:fb"}));
  EXPECT_EQ(model_of(kCrossed, "y ~ 0 + x + x:f").fixed.dependence, (Numbers{1, -1}));
  EXPECT_EQ(names("y ~ 0 + f*g"), (Strings{"fa", "fb", "gq", "gr", "fb:gq", "fb:gr"}));
}

TEST(Design, codes_sum_contrasts_by_number) {
  const DesignOptions sum{.contrasts = Contrasts::sum};
  const Model model = model_of(kCrossed, "y ~ f*g", sum);
  EXPECT_EQ(model.fixed.names, (Strings{"(Intercept)", "f1", "g1", "g2", "f1:g1", "f1:g2"}));
  const Rows x = dense(model.fixed.x);
  EXPECT_EQ(x[1], (Numbers{1, 1, 1, 0, 1, 0}));     // a, p
  EXPECT_EQ(x[0], (Numbers{1, -1, 0, 1, 0, -1}));   // b, q
  EXPECT_EQ(x[2], (Numbers{1, -1, -1, -1, 1, 1}));  // b, r
  for (std::size_t j = 1; j < 6; ++j) {             // balanced: each column sums to nothing
    double total = 0.0;
    for (const Numbers& row : x) total += row[j];
    EXPECT_EQ(total, 0.0) << j;
  }
  EXPECT_TRUE(model.sum_contrasts);
}

TEST(Design, computes_expressions_on_both_sides) {
  EXPECT_EQ(dense(model_of(kCrossed, "y ~ I(x^3^2) + I(-x^2)").fixed.x)[1], (Numbers{1, 512, -4}));
  const Model model = model_of(kCrossed, "log(y) ~ I(x^2) + sqrt(x)*f + I(-(x - 1)/2)");
  EXPECT_EQ(model.response, "log(y)");
  EXPECT_EQ(model.y[2], std::log(3.0));
  EXPECT_EQ(model.fixed.names, (Strings{"(Intercept)", "I(x^2)", "sqrt(x)", "fb", "I(-(x - 1)/2)", "sqrt(x):fb"}));
  EXPECT_EQ(dense(model.fixed.x)[2], (Numbers{1, 9, std::sqrt(3.0), 1, -1, std::sqrt(3.0)}));
}

TEST(Design, sorts_levels_as_integers_or_bytewise_or_as_given) {
  const std::string table = "y,g,h\n1,10,z\n2,9,B\n3,10,a\n4,-1,a\n5,9,z\n";
  EXPECT_EQ(model_of(table, "y ~ g + h", {.factors = {"g"}, .variances_given = true}).fixed.names,
            (Strings{"(Intercept)", "g9", "g10", "ha", "hz"}));
  const DesignOptions given{.levels = {{"h", {"z", "unseen", "a", "B"}}, {"g", {"9", "10", "-1"}}},
                            .variances_given = true};
  const Model model = model_of(table, "y ~ h + g", given);
  EXPECT_EQ(model.fixed.names, (Strings{"(Intercept)", "ha", "hB", "g10", "g-1"}));
  ASSERT_EQ(model.notes.size(), 1u);
  EXPECT_NE(model.notes[0].find("\"unseen\""), std::string::npos);
}

TEST(Design, takes_equal_numbers_for_one_level_and_labels_it_as_first_written) {
  const Model model = model_of("y,id\n1,007\n2,10\n3,7\n4,10\n5,007\n", "y ~ (1 | id)");
  EXPECT_EQ(model.random[0].levels, (Strings{"007", "10"}));
  EXPECT_EQ(model.random[0].level, (Indices{0, 1, 0, 1, 0}));
}

TEST(Design, takes_numbers_close_together_or_far_apart_and_fractions_for_levels) {
  for (const std::string largest : {"12", "2000000000", "9.5"}) {
    const std::string table = "y,id\n1," + largest + "\n2,-3\n3,8\n4,-3\n5," + largest + "\n";
    const RandomTerm term = model_of(table, "y ~ (1 | id)").random[0];
    EXPECT_EQ(term.levels, (Strings{"-3", "8", largest}));
    EXPECT_EQ(term.level, (Indices{2, 0, 1, 0, 2})) << largest;
  }
}

TEST(Design, takes_true_and_false_for_levels) {
  EXPECT_EQ(model_of("y,t\n1,TRUE\n2,FALSE\n3,TRUE\n", "y ~ t").fixed.names, (Strings{"(Intercept)", "tTRUE"}));
}

TEST(Design, drops_rows_with_missing_values_and_counts_them_by_variable) {
  const std::string table = "y,x,g,other\n1,2,a,\n,3,a,1\n3,.,b,1\n4,1,NA,1\nNA,NA,b,1\n6,7,b,1\n7,1,a,1\n";
  const Model model = model_of(table, "y ~ x + (1 | g)");
  EXPECT_EQ(model.row, (Indices{0, 5, 6}));
  EXPECT_EQ(model.rows_dropped, 4);
  EXPECT_EQ(model.missing, (std::vector<std::pair<std::string, std::int64_t>>{{"y", 2}, {"x", 2}, {"g", 1}}));
  EXPECT_EQ(model.y, (Numbers{1, 6, 7}));
  const Fault fault = fault_of([&] { model_of(table, "y ~ x + (1 | g)", {.missing = MissingValues::fail}); });
  EXPECT_EQ(fault.line, 3);
  EXPECT_EQ(fault.column, 1);
  EXPECT_EQ(fault.variable, "y");
}

TEST(Design, weighs_rows_and_leaves_out_those_of_weight_zero) {
  const Model model = model_of("y,w,f\n1,2,a\n2,0,c\n3,0.5,b\n4,1,a\n", "y ~ f", {.weights = "w"});
  EXPECT_EQ(model.weights, (Numbers{2, 0.5, 1}));
  EXPECT_EQ(model.row, (Indices{0, 2, 3}));
  EXPECT_EQ(model.fixed.names, (Strings{"(Intercept)", "fb"}));
  ASSERT_EQ(model.notes.size(), 1u);
  const Fault fault = fault_of([] { model_of("y,w\n1,2\n2,-1\n", "y ~ 1", {.weights = "w"}); });
  EXPECT_EQ(fault.line, 3);
  EXPECT_EQ(fault.column, 3);
  EXPECT_NE(fault_of([] { model_of("y,w\n1,0\n2,0\n", "y ~ 1", {.weights = "w"}); }).what.find("every weight"),
            std::string::npos);
}

TEST(Design, names_a_dependence_of_columns) {
  const Model model = model_of("y,x,z\n1,1,4\n2,2,6\n3,3,8\n4,5,12\n7,8,18\n", "y ~ x + z");
  EXPECT_EQ(model.fixed.aliased, (Indices{2}));
  EXPECT_EQ(model.fixed.dependence, (Numbers{2.0, 2.0}));
}

TEST(Design, orders_random_terms_by_levels_and_those_of_combinations_by_the_first_factor) {
  const Model model = model_of(kCrossed, "y ~ (1 | f) + (x | g) + (1 | g:f)");
  ASSERT_EQ(model.random.size(), 3u);
  EXPECT_EQ(model.random[0].group, "g:f");
  EXPECT_EQ(model.random[0].levels, (Strings{"p:a", "p:b", "q:a", "q:b", "r:a", "r:b"}));
  EXPECT_EQ(model.random[0].level, (Indices{3, 0, 5, 2, 1, 4, 3, 0, 5, 2, 1, 4}));
  EXPECT_EQ(model.random[1].group, "g");
  EXPECT_EQ(model.random[1].coefs, (Strings{"(Intercept)", "x"}));
  EXPECT_EQ(Numbers(model.random[1].z.begin(), model.random[1].z.begin() + 4), (Numbers{1, 1, 1, 2}));
  EXPECT_EQ(model.random[2].group, "f");
}

TEST(Design, keeps_the_order_of_the_formula_among_random_terms_with_as_many_levels) {
  std::string table = "y,x,a,b,c\n";
  for (int i = 0; i < 18; ++i) {
    table += std::to_string(i * i % 7) + "," + std::to_string(i % 5) + "," + std::to_string(i % 3) + "," +
             std::to_string(i / 6) + "," + std::to_string(i % 6) + "\n";
  }
  const auto groups = [&](const std::string& formula) {
    Strings found;
    for (const RandomTerm& term : model_of(table, formula).random) found.push_back(term.group + " " + term.coefs[0]);
    return found;
  };
  EXPECT_EQ(groups("y ~ (1 | b) + (x || a) + (1 | c)"),
            (Strings{"c (Intercept)", "b (Intercept)", "a (Intercept)", "a x"}));
  EXPECT_EQ(groups("y ~ (0 + x | a) + (1 | a) + (1 | b)"), (Strings{"a x", "a (Intercept)", "b (Intercept)"}));
}

TEST(Design, gives_a_combination_the_levels_that_occur) {
  const Model model = model_of("y,a,b\n1,u,k\n2,u,m\n3,v,k\n4,u,k\n5,u,m\n", "y ~ (1 | a:b)");
  EXPECT_EQ(model.random[0].levels, (Strings{"u:k", "u:m", "v:k"}));
}

TEST(Design, codes_factors_of_random_terms_by_the_same_rules) {
  EXPECT_EQ(model_of(kCrossed, "y ~ (0 + f | g)").random[0].coefs, (Strings{"fa", "fb"}));
  EXPECT_EQ(model_of(kCrossed, "y ~ (f | g)").random[0].coefs, (Strings{"(Intercept)", "fb"}));
  EXPECT_EQ(model_of(kCrossed, "y ~ (f | g)", {.contrasts = Contrasts::sum}).random[0].coefs,
            (Strings{"(Intercept)", "f1"}));
  const Model split = model_of(kCrossed, "y ~ (x + f || g)");
  ASSERT_EQ(split.random.size(), 3u);
  EXPECT_EQ(split.random[0].coefs, (Strings{"(Intercept)"}));
  EXPECT_EQ(split.random[1].coefs, (Strings{"x"}));
  EXPECT_EQ(split.random[2].coefs, (Strings{"fa", "fb"}));
  ASSERT_EQ(split.notes.size(), 1u);
  EXPECT_NE(split.notes[0].find("'f' stay correlated"), std::string::npos);
}

TEST(Design, takes_the_levels_of_a_known_precision_with_and_without_records) {
  const auto precision = std::make_shared<Precision>();
  std::string asked;
  const DesignOptions options{.known = [&](const std::string& name) {
    asked = name;
    return KnownPrecision{.labels = {"s", "t", "7", "u"}, .precision = precision};
  }};
  const std::string table = "y,id\n1,u\n2,7\n3,u\n4,s\n";
  const Model model = model_of(table, "y ~ (1 | id; kin)", options);
  EXPECT_EQ(asked, "kin");
  EXPECT_EQ(model.random[0].known, "kin");
  EXPECT_EQ(model.random[0].precision, precision);
  EXPECT_EQ(model.random[0].levels, (Strings{"s", "t", "7", "u"}));
  EXPECT_EQ(model.random[0].level, (Indices{3, 2, 3, 0}));
  const Fault fault = fault_of([&] { model_of("y,id\n1,u\n2,nobody\n3,s\n", "y ~ (1 | id; kin)", options); });
  EXPECT_EQ(fault.line, 3);
  EXPECT_EQ(fault.column, 3);
  EXPECT_NE(fault.what.find("\"nobody\""), std::string::npos);
  EXPECT_NE(fault_of([&] { model_of(table, "y ~ (1 | id; pedigree)"); }).advice.find("--pedigree"), std::string::npos);
}

TEST(Design, refuses_groups_that_no_variance_can_be_told_from) {
  const std::string table = "y,one,each,g\n1,a,a,p\n2,a,b,q\n3,a,c,p\n4,a,d,q\n";
  EXPECT_NE(fault_of([&] { model_of(table, "y ~ (1 | one)"); }).what.find("one level"), std::string::npos);
  const Fault each = fault_of([&] { model_of(table, "y ~ (1 | each)"); });
  EXPECT_NE(each.what.find("4 levels for 4 observations"), std::string::npos);
  EXPECT_EQ(each.column, 5);
  EXPECT_EQ(each.variable, "each");
  EXPECT_NE(fault_of([&] { model_of(table, "y ~ (1 + each | g)"); }).what.find("random effects"), std::string::npos);
  EXPECT_EQ(model_of(table, "y ~ (1 | each)", {.variances_given = true}).random[0].level_count(), 4);
}

TEST(Design, refuses_a_group_whose_levels_are_fixed_effects_too) {
  const Fault fault = fault_of([] { model_of(kCrossed, "y ~ g + x + (1 | g)"); });
  EXPECT_EQ(fault.variable, "g");
  EXPECT_EQ(fault.column, 13);
  EXPECT_NE(fault.what.find("the fixed part holds 'g' as a factor too"), std::string::npos) << fault.what;
  EXPECT_NE(fault_of([] { model_of(kCrossed, "y ~ f*g + (1 | g:f)"); }).what.find("'f:g'"), std::string::npos);
  EXPECT_NE(fault_of([] { model_of(kCrossed, "y ~ f + (1 | f/g)"); }).advice.find("(1 | a:b)"), std::string::npos);
  // A number and a part of an interaction are no such factor, nor is a slope; given variances are as they are.
  EXPECT_EQ(model_of(kCrossed, "y ~ f + (1 | f:g)").random.size(), 1u);
  EXPECT_EQ(model_of("y,t\n1,1\n2,2\n4,3\n4,1\n5,2\n7,3\n", "y ~ t + (1 | t)").random.size(), 1u);
  EXPECT_EQ(model_of(kCrossed, "y ~ f + (0 + x | f)").random.size(), 1u);
  EXPECT_EQ(model_of(kCrossed, "y ~ g + (1 | g)", {.variances_given = true}).random.size(), 1u);
}

TEST(Design, refuses_responses_that_are_no_numbers_or_all_the_same) {
  const Fault text = fault_of([] { model_of("y,x\n1,2\n\"12,5\",3\n", "y ~ x"); });
  EXPECT_EQ(text.line, 3);
  EXPECT_EQ(text.column, 1);
  EXPECT_EQ(text.variable, "y");
  EXPECT_EQ(text.what, "found \"12,5\"");
  EXPECT_EQ(text.advice, "write a decimal point here, and in other cells like it");
  EXPECT_NE(fault_of([] { model_of("y,x\n1,2\n1,3\n", "y ~ x"); }).what.find("is 1 in all rows"), std::string::npos);
  EXPECT_NE(fault_of([] { model_of("y,x\n1,2\n2,3\n", "y ~ x", {.factors = {"y"}}); }).what.find("by option"),
            std::string::npos);
}

TEST(Design, refuses_infinite_words_and_values_at_their_cell) {
  const Fault word = fault_of([] { model_of("y,x\n1,2\n2,inf\n3,4\n", "y ~ I(x)"); });
  EXPECT_EQ(word.line, 3);
  EXPECT_EQ(word.column, 3);
  const Fault value = fault_of([] { model_of("y,x\n1,2\n2,0\n3,4\n", "y ~ log(x)"); });
  EXPECT_EQ(value.line, 3);
  EXPECT_EQ(value.variable, "log(x)");
  EXPECT_EQ(value.what, "log(0) is the logarithm of a number that is not positive, where 'x' is \"0\"");
}

TEST(Design, says_which_part_of_an_expression_has_no_value_and_for_which_cells) {
  const std::vector<std::array<std::string, 2>> cases{
      {"log(x - 3)", "log(-2.5) is the logarithm of a number that is not positive, where 'x' is \"0.50\""},
      {"log2(z) + log10(x - z)",
       "log10(-3.5) is the logarithm of a number that is not positive, where 'x' is "
       "\"0.50\" and 'z' is \"4\""},
      {"log1p(-z)", "log1p(-4) is the logarithm of a number that is not above -1, where 'z' is \"4\""},
      {"sqrt(x - 1)", "sqrt(-0.5) is the square root of a negative number, where 'x' is \"0.50\""},
      {"I(1 / (z - 4))", "1 / 0 is a division by zero, where 'z' is \"4\""},
      {"I((z - 4)^-1)", "0^-1 is a division by zero, where 'z' is \"4\""},
      {"I((-z)^x)", "-4^0.5 is a negative number to a power that is not whole, where 'z' is \"4\" and 'x' is \"0.50\""},
      {"exp(1000 * z)", "exp(4000) is too large, where 'z' is \"4\""}};
  for (const auto& [expression, what] : cases) {
    const Fault fault = fault_of([&] { model_of("y,x,z\n1,5,0.25\n2,0.50,4\n3,7,0.5\n", "y ~ " + expression); });
    EXPECT_EQ(fault.what, what);
    EXPECT_EQ(fault.line, 3) << expression;
    EXPECT_EQ(fault.column, what.find("'x' is") < what.find("'z' is") ? 3 : 8) << expression;
  }
}

TEST(Design, takes_no_numbers_with_decimal_commas_for_levels_however_few_they_are) {
  const std::string table = "y;dose\n1;0,5\n2;1\n3;0,5\n4;2,5\n5;1\n6;2,5\n";
  const Fault fault = fault_of([&] { model_of(table, "y ~ dose"); });
  EXPECT_EQ(fault.line, 2);
  EXPECT_EQ(fault.column, 3);
  EXPECT_EQ(fault.what, "found \"0,5\"");
  EXPECT_NE(fault.advice.find("write a decimal point"), std::string::npos);
  EXPECT_NE(fault.advice.find("--factor dose"), std::string::npos);
  EXPECT_EQ(model_of(table, "y ~ dose", {.factors = {"dose"}}).fixed.names,
            (Strings{"(Intercept)", "dose1", "dose2,5"}));
  EXPECT_EQ(model_of("y,f\n1,\"a,b\"\n2,3\n3,\"a,b\"\n4,3\n", "y ~ f").fixed.names, (Strings{"(Intercept)", "fa,b"}));
}

TEST(Design, notes_levels_that_differ_in_capital_letters_only) {
  const std::string table = "y,f,g\n1,Wheat,p\n2,rye,q\n4,wheat,p\n3,rye,q\n3,wheat,q\n2,rye,p\n1,Wheat,p\n";
  const Model model = model_of(table, "y ~ f + g");
  ASSERT_EQ(model.notes.size(), 1u);
  EXPECT_EQ(model.notes[0],
            "'f': the levels \"Wheat\" and \"wheat\" differ in capital letters only, and are taken for two");
}

TEST(Design, refuses_a_slip_in_a_column_of_numbers_unless_it_is_called_a_factor) {
  std::string table = "y,x\n";
  for (int i = 0; i < 20; ++i) table += std::to_string(i) + "," + (i == 12 ? "1O" : std::to_string(100 + i)) + "\n";
  const Fault fault = fault_of([&] { model_of(table, "y ~ x"); });
  EXPECT_EQ(fault.line, 14);
  EXPECT_EQ(fault.what, "found \"1O\"");
  EXPECT_NE(fault.advice.find("--factor x"), std::string::npos);
  EXPECT_EQ(model_of(table, "y ~ x", {.factors = {"x"}, .variances_given = true}).fixed.x.cols(), 20);
}

TEST(Design, refuses_unknown_columns_and_names_the_nearest) {
  const Fault fault = fault_of([] { model_of(kCrossed, "y ~ F + x"); });
  EXPECT_EQ(fault.column, 5);
  EXPECT_NE(fault.advice.find("'f'"), std::string::npos);
  EXPECT_EQ(fault_of([] { model_of(kCrossed, "y ~ x", {.weights = "ww"}); }).variable, "ww");
  const auto advice = [](const std::string& table, const std::string& formula) {
    return fault_of([&] { model_of(table, formula); }).advice;
  };
  EXPECT_EQ(advice("a,b,c\n1,2,3\n", "y ~ x"), "its columns are a, b, c");
  EXPECT_EQ(advice("p,1.5,7\nq,2.5,8\n", "yield ~ x"),
            "its first line, p, 1.5, 7, seems to be data: put a line with the names of the columns above it");
  EXPECT_EQ(advice("block yield\n1 2\n", "yield ~ x"),
            "its only column is \"block yield\": separate columns with commas, tabs or semicolons");
  EXPECT_EQ(advice("yield (t/ha),x\n1,2\n", "yield ~ x"),
            "did you mean 'yield (t/ha)'? In a formula it stands in backquotes: `yield (t/ha)`");
  EXPECT_EQ(fault_of([] { model_of(kCrossed, "y ~ x", {.factors = {"q"}}); }).variable, "q");
}

TEST(Design, refuses_a_factor_by_option_where_a_number_is_computed) {
  const Fault fault = fault_of([] { model_of(kCrossed, "y ~ log(x)", {.factors = {"x"}}); });
  EXPECT_EQ(fault.variable, "x");
  EXPECT_EQ(fault.column, 9);
  // A group is a factor in its own right, whatever the column is elsewhere.
  EXPECT_EQ(model_of("y,t\n1,1\n2,2\n4,3\n4,1\n5,2\n7,3\n", "y ~ t + (1 | t)").fixed.names,
            (Strings{"(Intercept)", "t"}));
}

TEST(Design, refuses_levels_that_are_not_those_given) {
  const Fault fault = fault_of([] { model_of(kCrossed, "y ~ g", {.levels = {{"g", {"p", "q"}}}}); });
  EXPECT_EQ(fault.line, 4);
  EXPECT_EQ(fault.column, 5);
  EXPECT_NE(fault.what.find("\"r\""), std::string::npos);
  EXPECT_NE(fault_of([] {
              model_of(kCrossed, "y ~ g", {.levels = {{"g", {"p", "p", "q", "r"}}}});
            }).what.find("twice"),
            std::string::npos);
}

TEST(Design, refuses_factors_of_one_level_and_tables_without_a_complete_row) {
  EXPECT_NE(fault_of([] { model_of("y,f\n1,a\n2,a\n", "y ~ f"); }).what.find("one level"), std::string::npos);
  const Fault none = fault_of([] { model_of("y,x\n1,\nNA,2\n", "y ~ x"); });
  EXPECT_NE(none.what.find("no observation is left"), std::string::npos);
  EXPECT_NE(none.what.find("'y' 1, 'x' 1"), std::string::npos);
}

TEST(Design, refuses_as_many_independent_columns_as_observations) {
  const std::string table = "y,x,z\n1,2,1\n2,3,5\n5,1,1\n";
  EXPECT_NE(fault_of([&] { model_of(table, "y ~ x + z"); }).what.find("3 independent columns for 3 observations"),
            std::string::npos);
  EXPECT_EQ(model_of(table, "y ~ x + z", {.variances_given = true}).fixed.rank(), 3);
}

TEST(Design, reads_names_in_backquotes) {
  const Model model = model_of("the y,my x\n1,2\n2,3\n4,1\n", "`the y` ~ `my x`");
  EXPECT_EQ(model.fixed.names, (Strings{"(Intercept)", "`my x`"}));
}

}  // namespace
}  // namespace sm::mixed::test
