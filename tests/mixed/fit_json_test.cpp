#include "mixed/fit_json.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <fstream>
#include <limits>
#include <nlohmann/json.hpp>

#include "mixed/error.hpp"
#include "mixed/example_fit.hpp"
#include "mixed/schema.hpp"

namespace sm::mixed::test {
namespace {

using Json = nlohmann::json;
using Strings = std::vector<std::string>;

Json schema() { return Json::parse(std::ifstream(QXESM_FIT_SCHEMA)); }
Json written(const Example& e) { return Json::parse(fit_json(e.model, e.fit)); }

TEST(FitJson, conforms_to_the_published_schema) {
  const Example e = example_fit();
  EXPECT_EQ(violations(schema(), written(e)), Strings{});
  EXPECT_EQ(violations(schema(), written(drawn_fit(30, 200))), Strings{});
  EXPECT_EQ(violations(schema(), written(Example{})), Strings{});
}

TEST(FitJson, schema_refuses_what_does_not_conform) {
  Json json = written(example_fit());
  json.erase("theta");
  json["fixef"][1]["se"] = "large";
  json["novel"] = 1;
  json["method"] = "least squares";
  EXPECT_EQ(violations(schema(), json),
            (Strings{": has an unknown novel", "/fixef/1/se: not of type [\"number\",\"null\"]",
                     "/method: not one of [\"REML\",\"ML\"]", ": lacks theta"}));
}

TEST(FitJson, holds_the_numbers_of_the_fit) {
  const Example e = example_fit();
  const Json json = written(e);
  EXPECT_EQ(json["schema"], "qxsm-fit/1");
  EXPECT_EQ(json["criterion"], 50.5);
  EXPECT_EQ(json["theta"], Json({0.966, 0.015, 0.231}));
  EXPECT_EQ(json["fixed_columns"], Json({"(Intercept)", "x", "fb", "fc"}));
  ASSERT_EQ(json["fixef"].size(), 3U);
  EXPECT_EQ(json["fixef"][1], Json::parse(R"({"name": "x", "estimate": 10.46729, "se": 1.54579, "t": 6.771485,
                                              "df_satterthwaite": 17.0})"));
  EXPECT_EQ(json["fixef"][2]["df_satterthwaite"], nullptr);
  EXPECT_EQ(json["aliased"], Json::parse(R"([{"name": "fc", "estimate": null, "aliased": true,
                                              "dependence": "fc = (Intercept) - fb"}])"));
  EXPECT_EQ(json["vcov_fixef"], Json::parse("[[4.0, -1.0, 0.0], [-1.0, 1.0, 0.5], [0.0, 0.5, 4.0]]"));
  EXPECT_EQ(json["varcomp"][3], Json::parse(R"({"group": "Residual", "var1": null, "var2": null, "vcov": 654.0,
                                                "sdcor": 25.5734, "se_observed": 77.25, "se_average": null})"));
  // By rows here, by columns in the fit.
  EXPECT_EQ(json["information"]["observed"], Json::parse("[[4.0, 2.0], [1.0, 8.0]]"));
  EXPECT_EQ(json["information"]["free"], Json({1, 3}));
  EXPECT_EQ(json["ranef"][1]["term"], "x");
  EXPECT_EQ(json["ranef"][1]["sum"], 0.0);
  EXPECT_EQ(json["ranef"][1]["sum_of_squares"], 2.25 * 2.25 + 40.5 * 40.5 + 38.25 * 38.25);
  EXPECT_EQ(json["ranef"][1]["sum_pev"], 13.0 * 13.0 + 13.5 * 13.5 + 14.0 * 14.0);
  EXPECT_FALSE(json["ranef"][1].contains("reliability"));
}

TEST(FitJson, gives_no_number_of_a_contrast_that_is_not_estimable) {
  Example e = example_fit();
  e.fit.contrasts[1].estimate = 17.0;
  const Json json = written(e);
  EXPECT_EQ(json["contrasts"][0]["estimate"], -0.25);
  EXPECT_EQ(json["contrasts"][0]["df"], 12.25);
  for (const char* key : {"estimate", "se", "df", "t"}) EXPECT_EQ(json["contrasts"][1][key], nullptr) << key;
  EXPECT_EQ(json["contrasts"][1]["reason"], "it needs 'fc' alone");
}

TEST(FitJson, writes_what_reads_back_as_the_same_double_and_null_for_no_number) {
  Example e = example_fit();
  e.fit.theta = {0.1 + 0.2, 5e-324, -1.7976931348623157e308};
  e.fit.sigma = std::nan("");
  e.fit.fixef[0].t = std::numeric_limits<double>::infinity();
  const Json json = written(e);
  EXPECT_EQ(json["theta"].get<std::vector<double>>(), e.fit.theta);
  EXPECT_EQ(json["sigma"], nullptr);
  EXPECT_EQ(json["fixef"][0]["t"], nullptr);
}

TEST(FitJson, survives_hostile_names) {
  Example e = drawn_fit(hostile_names().size(), 5);
  e.fit.ranef[0].levels = hostile_names();
  e.model.formula = hostile_names()[2];
  const Json json = written(e);
  EXPECT_EQ(violations(schema(), json), Strings{});
  for (std::size_t i = 0; i < hostile_names().size(); ++i) {
    if (i == 5) continue;  // the one that is not UTF-8
    EXPECT_EQ(json["ranef"][0]["levels"][i], hostile_names()[i]);
  }
  EXPECT_EQ(json["ranef"][0]["levels"][5], "not UTF-8: \xEF\xBF\xBD\xEF\xBF\xBD\xEF\xBF\xBD");
}

TEST(Start, reads_theta_back_with_its_terms) {
  const Example e = example_fit();
  const auto start = read_start(fit_json(e.model, e.fit));
  ASSERT_TRUE(start);
  EXPECT_EQ(start->theta, e.fit.theta);
  ASSERT_EQ(start->terms.size(), 1U);
  EXPECT_EQ(start->terms[0].group, "g");
  EXPECT_EQ(start->terms[0].coefs, (Strings{"(Intercept)", "x"}));
}

TEST(Start, is_nothing_when_the_text_is_no_fit) {
  Json json = written(example_fit());
  EXPECT_TRUE(read_start(json.dump()));
  for (const char* text : {"", "{", "[]", "17", "{\"schema\": \"mixed-case/1\"}", "{\"schema\": \"qxsm-fit/1\"}"}) {
    EXPECT_FALSE(read_start(text)) << text;
  }
  json["theta"] = {1.0, 2.0};
  EXPECT_FALSE(read_start(json.dump()));
  json["theta"] = {1.0, nullptr, 3.0};
  EXPECT_FALSE(read_start(json.dump()));
}

std::string refusal(const std::string& text, const Model& model) {
  try {
    start_theta(text, model, "fit.json");
  } catch (const ModelError& error) {
    return error.what();
  }
  return "";
}

TEST(Start, finds_the_terms_wherever_they_stand) {
  Example e = example_fit();
  RandomTerm other;
  other.group = "h";
  other.coefs = {"(Intercept)"};
  e.model.random.push_back(other);
  e.fit.theta.push_back(7.0);
  const std::string text = fit_json(e.model, e.fit);
  EXPECT_EQ(start_theta(text, e.model, ""), (std::vector<double>{0.966, 0.015, 0.231, 7.0}));
  std::swap(e.model.random[0], e.model.random[1]);
  EXPECT_EQ(start_theta(text, e.model, ""), (std::vector<double>{7.0, 0.966, 0.015, 0.231}));
}

TEST(Start, says_what_is_wrong_with_the_earlier_fit) {
  const Example e = example_fit();
  const std::string text = fit_json(e.model, e.fit);
  EXPECT_EQ(refusal("{\n \"schema\": no}", e.model),
            "fit.json:2:13: is not JSON from here on, expected a fit of schema qxsm-fit/1; give the fit.json that an "
            "earlier fit of this model wrote with --out");
  EXPECT_EQ(
      refusal("{\"schema\": \"mixed-case/1\"}", e.model),
      "fit.json: 'schema': found \"mixed-case/1\", expected \"qxsm-fit/1\"; give the fit.json that an earlier fit "
      "of this model wrote with --out");
  Model model = e.model;
  model.random[0].coefs = {"(Intercept)"};
  EXPECT_EQ(refusal(text, model),
            "fit.json: '((Intercept) | g)': this term of the model is not in the earlier fit, expected the same random "
            "effects; start without --start, or from a fit of this formula");
  model.random.clear();
  EXPECT_EQ(refusal(text, model),
            "fit.json: '((Intercept) + x | g)': this term of the earlier fit is not in the model, expected the same "
            "random effects; start without --start, or from a fit of this formula");
}

}  // namespace
}  // namespace sm::mixed::test
