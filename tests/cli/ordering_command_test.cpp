// --ordering: the same answers by every order, at different costs.
#include <cmath>

#include "cli/command.hpp"

namespace sm::test {
namespace {

const std::vector<std::string> kOrderings{"md", "amd", "metis", "natural"};

class OrderingOption : public CommandTest {
 protected:
  static PrintedJson json_of(std::vector<std::string> arguments, const std::string& ordering) {
    arguments.insert(arguments.end(), {"--ordering", ordering, "--json"});
    const Outcome run = qxsm(arguments);
    EXPECT_EQ(run.code, 0) << run.err;
    EXPECT_EQ(run.err, "");
    return run.json();
  }

  // n on the diagonal for the first row, 2 for the others, and a first column of ones.
  std::string arrowhead(int n) const {
    std::string text = std::to_string(n) + " " + std::to_string(n) + " " + std::to_string(2 * n - 1) + "\n";
    for (int i = 1; i <= n; ++i) {
      text += std::to_string(i) + " " + std::to_string(i) + " " + std::to_string(i == 1 ? n : 2) + "\n";
      if (i > 1) text += std::to_string(i) + " 1 1\n";
    }
    return matrix("arrow.mtx", "coordinate real symmetric", text);
  }

  // The Laplacian of a ring of 200 points, and two points apart from it, of which one is zero: of rank 200.
  std::string ring() const {
    std::string text = "202 202 402\n201 201 3\n202 202 0\n";
    for (int i = 1; i <= 200; ++i) {
      text += std::to_string(i) + " " + std::to_string(i) + " 2\n";
      text += i < 200 ? std::to_string(i + 1) + " " + std::to_string(i) + " -1\n" : "200 1 -1\n";
    }
    return matrix("ring.mtx", "coordinate real symmetric", text);
  }
};

TEST_F(OrderingOption, every_order_solves_to_rounding) {
  for (const char* name : {"bcsstk13.mtx", "gr_30_30.mtx"}) {
    const auto plain = qxsm({"factor", shipped(name), "--json"}).json();
    EXPECT_EQ(plain.at("ordering"), "md") << "when none is asked for";
    const double log_determinant = plain.at("log_determinant").get<double>();
    for (const std::string& ordering : kOrderings) {
      const auto json = json_of({"solve", shipped(name)}, ordering);
      EXPECT_EQ(json.at("ordering"), ordering);
      EXPECT_EQ(json.at("rank"), json.at("rows")) << name << ordering;
      EXPECT_LT(json.at("largest_residual").get<double>(), 1e-14) << name << ordering;
      EXPECT_NEAR(json.at("log_determinant").get<double>(), log_determinant, 1e-7 * log_determinant);
      bool timed = false;
      for (const auto& phase : json.at("phases")) timed = timed || phase.at("name") == "ordering";
      EXPECT_TRUE(timed);
    }
  }
}

TEST_F(OrderingOption, the_order_decides_the_fill) {
  const int n = 60;
  const std::string arrow = arrowhead(n);
  EXPECT_EQ(json_of({"factor", arrow}, "natural").at("nnz_u"), n * (n - 1) / 2) << "the head first: all fills in";
  for (const std::string ordering : {"md", "amd", "metis"}) {
    const auto json = json_of({"factor", arrow}, ordering);
    EXPECT_EQ(json.at("nnz_u"), n - 1) << ordering;
    // 60 less the sum of the halves that the arms take from it, times 2 to the 59th.
    EXPECT_NEAR(json.at("log_determinant").get<double>(), std::log(60.0 - 59.0 / 2.0) + 59.0 * std::log(2.0), 1e-12);
  }
  const auto natural = json_of({"factor", shipped("gr_30_30.mtx")}, "natural").at("nnz_u").get<std::int64_t>();
  // Along the rows of a 30 x 30 grid with nine points: every row reaches 31 columns on, once the first has filled in.
  EXPECT_GT(natural, 900 * 29);
  for (const std::string ordering : {"md", "amd", "metis"}) {
    EXPECT_LT(json_of({"factor", shipped("gr_30_30.mtx")}, ordering).at("nnz_u").get<std::int64_t>(), natural * 7 / 10);
  }
}

TEST_F(OrderingOption, a_singular_matrix_has_the_same_rank_in_every_order) {
  const std::string a = ring();
  for (const std::string& ordering : kOrderings) {
    const auto json = json_of({"factor", a}, ordering);
    EXPECT_EQ(json.at("rank"), 200) << ordering;
    EXPECT_EQ(json.at("rows_dropped").size(), 2u) << ordering;
    EXPECT_EQ(json.at("rows_dropped")[1], 202) << ordering;
    // The ring without the dropped row: a path of 199 points with 2 on the diagonal has the determinant 200.
    EXPECT_NEAR(json.at("log_determinant").get<double>(), std::log(200.0) + std::log(3.0), 1e-10) << ordering;
  }
}

TEST_F(OrderingOption, matrices_without_edges_or_rows_are_served) {
  const std::string none = matrix("none.mtx", "coordinate real symmetric", "0 0 0\n");
  const std::string one = matrix("one.mtx", "coordinate real symmetric", "1 1 1\n1 1 2\n");
  const std::string diagonal = matrix("d.mtx", "coordinate real symmetric", "4 4 3\n1 1 2\n2 2 2\n4 4 2\n");
  for (const std::string& ordering : kOrderings) {
    EXPECT_EQ(json_of({"factor", none}, ordering).at("rank"), 0) << ordering;
    EXPECT_EQ(json_of({"factor", one}, ordering).at("rank"), 1) << ordering;
    const auto json = json_of({"factor", diagonal}, ordering);
    EXPECT_EQ(json.at("rank"), 3) << ordering;
    EXPECT_EQ(json.at("rows_dropped").get<std::vector<int>>(), std::vector<int>{3});
    EXPECT_EQ(json.at("nnz_u"), 0);
  }
}

TEST_F(OrderingOption, serves_every_subcommand_that_factors) {
  const std::string a = shipped("bcsstk01.mtx");
  const std::string x = scattered("x.mtx", 3, 48, false, 3);
  const auto trace = json_of({"trace", a, "--inverse"}, "md").at("trace").get<double>();
  for (const std::string& ordering : kOrderings) {
    EXPECT_NEAR(json_of({"trace", a, "--inverse"}, ordering).at("trace").get<double>(), trace, 1e-10 * trace);
    EXPECT_GT(json_of({"info", a, "--fill"}, ordering).at("nnz_u").get<int>(), 0);
    for (const auto& command : std::vector<std::vector<std::string>>{
             {"invdiag", a}, {"hermite", a}, {"estimable", a, x}, {"quad", a, x, "--inverse"}}) {
      const auto json = json_of(command, ordering);
      EXPECT_EQ(json.at("ordering"), ordering) << command[0];
    }
  }
  const auto diagonal = json_of({"invdiag", a}, "md").at("first_values").get<std::vector<double>>();
  const auto by_metis = json_of({"invdiag", a}, "metis").at("first_values").get<std::vector<double>>();
  ASSERT_EQ(by_metis.size(), diagonal.size());
  for (std::size_t i = 0; i < diagonal.size(); ++i) EXPECT_NEAR(by_metis[i], diagonal[i], 1e-9 * diagonal[i]);
}

TEST_F(OrderingOption, the_text_says_by_which_order) {
  EXPECT_EQ(qxsm({"factor", shipped("bcsstk01.mtx")}).fact("ordered by"), "md, the module's minimum degree");
  const Outcome run = qxsm({"factor", shipped("bcsstk01.mtx"), "--ordering", "metis"});
  EXPECT_EQ(run.fact("ordered by"), "metis, nested dissection");
  EXPECT_NE(run.fact("ordering").find(" s"), std::string::npos);
}

TEST_F(OrderingOption, other_names_are_refused_with_the_list) {
  for (const char* command : {"factor", "solve", "invdiag", "hermite"}) {
    expect_message(qxsm({command, "a.mtx", "--ordering", "colamd"}), 2,
                   {"--ordering: found \"colamd\", expected md, amd, metis or natural", "; see qxsm"});
  }
}

TEST_F(OrderingOption, is_refused_where_nothing_is_factored) {
  const std::string a = shipped("bcsstk01.mtx");
  expect_message(qxsm({"solve", a, "--method", "cg", "--ordering", "amd"}), 2,
                 {"--ordering is given, expected --method direct with it", "; see qxsm solve --help"});
  expect_message(qxsm({"quad", a, a, "--ordering", "amd"}), 2, {"expected --inverse with it", "; see qxsm quad"});
  expect_message(qxsm({"trace", a, "--ordering", "md"}), 2, {"expected --inverse with it", "; see qxsm trace"});
  expect_message(qxsm({"info", a, "--ordering", "metis"}), 2, {"expected --fill with it", "; see qxsm info"});
}

// Whatever phase the ceiling hits, that of an order found outside the module included.
TEST_F(OrderingOption, every_ceiling_ends_with_3_or_0) {
  for (const std::string ordering : {"amd", "metis"}) {
    const auto peak = json_of({"solve", shipped("nos3.mtx")}, ordering).at("peak_pool_bytes").get<std::uint64_t>();
    int refused = 0;
    for (std::uint64_t step = 0; step < 24; ++step) {
      const Outcome run = qxsm({"solve", shipped("nos3.mtx"), "--ordering", ordering, "--memory",
                                std::to_string(2048 + peak * step / 20), "--quiet"});
      EXPECT_TRUE(run.code == 3 || run.code == 0) << ordering << step << ": " << run.err;
      refused += run.code == 3 ? 1 : 0;
    }
    EXPECT_GE(refused, 10);
    EXPECT_LE(refused, 21);
  }
}

}  // namespace
}  // namespace sm::test
