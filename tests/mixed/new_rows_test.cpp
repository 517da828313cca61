#include <gtest/gtest.h>

#include "mixed/contrast_rows.hpp"
#include "support.hpp"

namespace sm::mixed::test {
namespace {

using Numbers = std::vector<double>;
using Indices = std::vector<std::int64_t>;

const std::string kTable =
    "y,f,g,x\n1,b,q,1\n2,a,p,2\n3,b,r,3\n4,a,q,4\n5,b,p,5\n7,a,r,6\n6,b,q,7\n8,a,p,8\n9,b,r,9\n10,a,q,10\n";

Numbers row_of(const std::string& contrast, const std::string& formula, const DesignOptions& options = {}) {
  const Model model = model_of(kTable, formula, options);
  return parse_contrast(contrast, *model.recipe).l;
}

TEST(NewRows, of_the_models_own_data_are_its_rows) {
  for (const Contrasts contrasts : {Contrasts::treatment, Contrasts::sum}) {
    const Model model =
        model_of(kTable, "y ~ f*g + I(x^2) + (x | g) + (1 | f:g)", {.contrasts = contrasts, .variances_given = true});
    const NewRows rows = new_rows(*model.recipe, table_of(kTable));
    EXPECT_EQ(dense(rows.x), dense(model.fixed.x));
    ASSERT_EQ(rows.random.size(), model.random.size());
    for (std::size_t t = 0; t < rows.random.size(); ++t) {
      EXPECT_EQ(rows.random[t].level, model.random[t].level);
      EXPECT_EQ(rows.random[t].z, model.random[t].z);
      EXPECT_EQ(rows.random[t].unseen, 0);
    }
  }
}

TEST(NewRows, need_no_response_no_order_of_columns_and_not_all_levels) {
  const Model model = model_of(kTable, "y ~ f + x + (1 | g)");
  const NewRows rows = new_rows(*model.recipe, table_of("x;g;f\n2;q;b\n;q;b\n4;new;b\n"));
  EXPECT_EQ(rows.row, (Indices{0, 2}));
  EXPECT_EQ(rows.rows_dropped, 1);
  EXPECT_EQ(dense(rows.x), (std::vector<Numbers>{{1, 1, 2}, {1, 1, 4}}));
  EXPECT_EQ(rows.random[0].level, (Indices{1, -1}));
  EXPECT_EQ(rows.random[0].unseen, 1);
}

TEST(NewRows, match_levels_of_numbers_by_value) {
  const Model model =
      model_of("y,k\n1,1\n2,2\n3,1\n5,2\n", "y ~ k + (1 | k)", {.factors = {"k"}, .variances_given = true});
  const NewRows rows = new_rows(*model.recipe, table_of("k\n2.0\n01\n"));
  EXPECT_EQ(dense(rows.x), (std::vector<Numbers>{{1, 1}, {1, 0}}));
  EXPECT_EQ(rows.random[0].level, (Indices{1, 0}));
}

TEST(NewRows, refuse_a_level_of_a_fixed_factor_that_the_model_has_not_seen) {
  const Model model = model_of(kTable, "y ~ f + x");
  const Fault fault = fault_of([&] { new_rows(*model.recipe, table_of("x,f\n1,a\n2,c\n")); });
  EXPECT_EQ(fault.line, 3);
  EXPECT_EQ(fault.column, 3);
  EXPECT_NE(fault.what.find("\"c\""), std::string::npos);
  EXPECT_NE(fault.expected.find("a, b"), std::string::npos);
  EXPECT_EQ(fault_of([&] { new_rows(*model.recipe, table_of("x\n1\n")); }).variable, "f");
}

TEST(Contrast, sums_effects_of_levels_numbers_and_columns) {
  // (Intercept) fb gq gr x fb:gq fb:gr
  const std::string formula = "y ~ f*g + x";
  EXPECT_EQ(row_of("f[b] - f[a]", formula), (Numbers{0, 1, 0, 0, 0, 0, 0}));
  EXPECT_EQ(row_of("-0.5*g[q] + 2 * g[r]", formula), (Numbers{0, 0, -0.5, 2, 0, 0, 0}));
  EXPECT_EQ(row_of("1*(Intercept) + 8*x", formula), (Numbers{1, 0, 0, 0, 8, 0, 0}));
  EXPECT_EQ(row_of("x[8]", formula), (Numbers{0, 0, 0, 0, 8, 0, 0}));
  EXPECT_EQ(row_of("g[r]:f[b] - f[a]:g[q]", formula), (Numbers{0, 0, 0, 0, 0, 0, 1}));
  EXPECT_EQ(row_of("fb + `fb:gq` - 1e-1*fb:gr", formula), (Numbers{0, 1, 0, 0, 0, 1, -0.1}));
  EXPECT_EQ(row_of("f[\"b\"]", formula), (Numbers{0, 1, 0, 0, 0, 0, 0}));
}

TEST(Contrast, codes_levels_by_sum_contrasts) {
  // (Intercept) f1 g1 g2 f1:g1 f1:g2
  const DesignOptions sum{.contrasts = Contrasts::sum};
  EXPECT_EQ(row_of("g[r]", "y ~ f*g", sum), (Numbers{0, 0, -1, -1, 0, 0}));
  EXPECT_EQ(row_of("f[b]:g[q]", "y ~ f*g", sum), (Numbers{0, 0, 0, 0, 0, -1}));
  EXPECT_EQ(row_of("g[p] + g[q] + g[r]", "y ~ f*g", sum), (Numbers{0, 0, 0, 0, 0, 0}));
}

TEST(Contrast, of_cells_are_the_rows_of_the_model) {
  const Model model = model_of(kTable, "y ~ f*g + log(x) + I(x^2)");
  const auto rows = dense(model.fixed.x);
  EXPECT_EQ(parse_contrast("at(f=a, g=q, x=4)", *model.recipe).l, rows[3]);
  Numbers difference = rows[2];
  for (std::size_t j = 0; j < difference.size(); ++j) difference[j] = 0.25 * rows[2][j] - 2.0 * rows[5][j];
  EXPECT_EQ(parse_contrast("0.25*at(x=3,f=b,g=r) - 2*at(g=\"r\", f = a, x = 6)", *model.recipe).l, difference);
}

TEST(Contrast, takes_a_name_before_a_colon_and_a_blank) {
  const Model model = model_of(kTable, "y ~ f*g");
  EXPECT_EQ(parse_contrast("b against a (f): f[b]", *model.recipe).name, "b against a (f)");
  EXPECT_EQ(parse_contrast("f[b]:g[q]", *model.recipe).name, "f[b]:g[q]");
}

TEST(Contrast, refuses_what_it_cannot_mean_at_its_place) {
  const Model model = model_of(kTable, "y ~ f*g + x");
  for (const auto& [text, column, what] : std::vector<std::tuple<std::string, std::int64_t, std::string>>{
           {"", 1, "no combination"},
           {"L: ", 4, "no combination"},
           {"f", 1, "without a level"},
           {"f[c]", 3, "no level \"c\""},
           {"ff[b]", 1, "'ff' is neither"},
           {"x[b]", 3, "\"b\""},
           {"2", 1, "number 2 alone"},
           {"f[b] f[a]", 6, "\"f[a]\""},
           {"f[b] -", 7, "the end"},
           {"f[b", 3, "no end"},
           {"f[b]:x", 1, "no term of the model"},
           {"f[b]:f[a]", 6, "twice"},
           {"at(f=b, g=q)", 1, "'x' is not told"},
           {"at(f=b, g=q, x=1, z=2)", 19, "'z' is no variable"},
           {"at(f=b, g=q, x=u)", 14, "\"u\""},
           {"at(f=b, f=b, g=q, x=1)", 9, "twice"}}) {
    const Fault fault = fault_of([&] { parse_contrast(text, *model.recipe); });
    EXPECT_EQ(fault.column, column) << text << ": " << fault.what;
    EXPECT_NE(fault.what.find(what), std::string::npos) << text << ": " << fault.what;
  }
  const Model bare = model_of(kTable, "y ~ 0 + x");
  EXPECT_NE(fault_of([&] { parse_contrast("(Intercept)", *bare.recipe); }).what.find("no intercept"),
            std::string::npos);
}

}  // namespace
}  // namespace sm::mixed::test
