// qxsmorth: rows of a general sparse matrix made orthogonal to each other.
#include "ginv/ginv_support.hpp"

namespace sm::test {
namespace {

using Index = std::int64_t;
using Active = std::vector<std::int16_t>;

class OrthogonalTest : public ModuleTest {
 protected:
  SmMatrix* with(const Dense& a) { return build(session(), kGeneralSparse, a); }
  SmStatus orthogonalise(SmMatrix* m, Active& active, Index lo = 0, Index hi = 0, double tolerance = 1e-12) {
    return qxsmorth(m, active.data(), lo, hi, tolerance);
  }
  // Answers the status of a refusal that must leave matrix and flags as they were.
  SmStatus refused(SmMatrix* m) {
    Active active(8, 1);
    const Snapshot before = snapshot(m);
    const SmStatus status = orthogonalise(m, active);
    EXPECT_TRUE(snapshot(m) == before);
    EXPECT_EQ(active, Active(8, 1));
    return status;
  }
};
INSTANTIATE_BOTH_HOSTS(OrthogonalTest);

struct Swept {
  Nonzeros rows;
  Active active;
};

// The rule, on plain rows: what is kept of a rewritten row is what is below `keep` in magnitude, zeros included.
Swept swept(const Nonzeros& rows, Index n, Active active, Index lo, Index hi, double tolerance, double keep) {
  std::vector<std::vector<double>> full(at(n), std::vector<double>(at(n), 0.0));
  std::vector<std::vector<bool>> held(at(n), std::vector<bool>(at(n), false));
  for (const auto& [place, value] : rows) {
    full[at(place.first)][at(place.second)] = value;
    held[at(place.first)][at(place.second)] = true;
  }
  const auto dot = [&](Index a, Index b) {
    double total = 0.0;
    for (Index j = 0; j < n; ++j) total += full[at(a)][at(j)] * full[at(b)][at(j)];
    return total;
  };
  for (Index i = 0; i < n; ++i) {
    if (!active[at(i)] || (i >= lo && i < hi)) continue;
    active[at(i)] = 0;
    const double length = dot(i, i);
    if (!(length > tolerance)) continue;
    for (Index k = 0; k < n; ++k) {
      const double component = active[at(k)] ? dot(i, k) / length : 0.0;
      if (!active[at(k)] || !(std::fabs(component) > tolerance)) continue;
      for (Index j = 0; j < n; ++j) {
        const double v = full[at(k)][at(j)] - component * full[at(i)][at(j)];
        held[at(k)][at(j)] = std::fabs(v) < keep;
        full[at(k)][at(j)] = held[at(k)][at(j)] ? v : 0.0;
      }
    }
  }
  Swept result{{}, active};
  for (Index i = 0; i < n; ++i)
    for (Index j = 0; j < n; ++j)
      if (held[at(i)][at(j)]) result.rows[{i, j}] = full[at(i)][at(j)];
  return result;
}

// The same places, and values to a few roundings.
bool alike(const Nonzeros& got, const Nonzeros& want) {
  if (got.size() != want.size()) return false;
  for (const auto& [place, value] : want) {
    const auto found = got.find(place);
    if (found == got.end() || !(std::fabs(found->second - value) <= 1e-9 * std::max(1.0, std::fabs(value))))
      return false;
  }
  return true;
}

TEST_P(OrthogonalTest, a_rewritten_row_keeps_only_what_is_below_the_threshold) {
  SmMatrix* m = with(from_rows({{1, 0, 0, 0}, {2, 0, 5, 0}, {0, 3, 0, 0}, {4, 0, 0, 0}}));
  Active active{1, 1, 1, 1};
  ASSERT_EQ(orthogonalise(m, active), SM_OK);
  // Row 1 becomes (0, 0, 5, 0), of which the 5 is not kept; row 3 becomes zeros; row 2 has nothing of row 0.
  EXPECT_EQ(entries(m), (Nonzeros{{{0, 0}, 1.0},
                                  {{1, 0}, 0.0},
                                  {{1, 1}, 0.0},
                                  {{1, 3}, 0.0},
                                  {{2, 1}, 3.0},
                                  {{3, 0}, 0.0},
                                  {{3, 1}, 0.0},
                                  {{3, 2}, 0.0},
                                  {{3, 3}, 0.0}}));
  EXPECT_EQ(active, Active(4, 0));
  EXPECT_EQ(m->nnz, 9);
  EXPECT_EQ(m->state, SM_STATE_CLOSED);
}

TEST_P(OrthogonalTest, a_row_with_nothing_below_the_threshold_becomes_empty) {
  SmMatrix* m = with(from_rows({{1, 0}, {0, 0}}));
  ASSERT_EQ(fn().qxsmassign(m, 1, 0, 0, 3.0), SM_OK);
  ASSERT_EQ(fn().qxsmassign(m, 0, 1, 0, 1.0), SM_OK);
  Active active{1, 1};  // (3, 0) less 1.5 (1, 1) is (1.5, -1.5)
  ASSERT_EQ(orthogonalise(m, active), SM_OK);
  EXPECT_EQ(entries(m), (Nonzeros{{{0, 0}, 1.0}, {{0, 1}, 1.0}}));
  EXPECT_EQ(m->nnz, 2);
  EXPECT_EQ(m->row_roots[1], 0U);
  EXPECT_EQ(fn().qxsmassign(m, 1, 1, 0, 8.0), SM_OK);
  EXPECT_EQ(entries(m).at({1, 1}), 8.0);
}

TEST_P(OrthogonalTest, the_threshold_is_setting_0_and_excludes_its_end) {
  for (const auto& [setting, kept] : {std::pair{0.5, 0U}, {std::nextafter(0.5, 1.0), 1U}}) {
    instance()->tolerances[0] = setting;
    SmMatrix* m = with(from_rows({{1, 0}, {1, 0.5}}));
    Active active{1, 1};
    ASSERT_EQ(orthogonalise(m, active), SM_OK);
    EXPECT_EQ(entries(m).count({1, 1}), kept);
    EXPECT_EQ(entries(m).count({1, 0}), 1U);
  }
  instance()->tolerances[0] = kSingular;
  for (const auto& [small, kept] : {std::pair{kSingular, 0U}, {std::nextafter(kSingular, 0.0), 1U}}) {
    SmMatrix* m = with(from_rows({{1, 0}, {1, small}}));
    Active active{1, 1};
    ASSERT_EQ(orthogonalise(m, active), SM_OK);
    EXPECT_EQ(entries(m).count({1, 1}), kept) << small;
  }
}

TEST_P(OrthogonalTest, with_a_high_threshold_the_rows_become_orthogonal) {
  Random random(101);
  instance()->tolerances[0] = 1e300;
  for (int round = 0; round < 10; ++round) {
    const Index n = 2 + random.below(9);
    SmMatrix* m = with(sum(random_dense(random, n, n, 40), scaled(identity(n), 16.0L)));
    const Dense before = contents(m);
    Active active(at(n), 1);
    ASSERT_EQ(orthogonalise(m, active), SM_OK);
    const Dense rows = contents(m);
    const Dense gram = product(rows, transposed(rows));
    for (Index i = 0; i < n; ++i)
      for (Index j = 0; j < i; ++j) EXPECT_NEAR(static_cast<double>(gram(i, j)), 0.0, 1e-9) << i << ' ' << j;
    for (Index j = 0; j < n; ++j) EXPECT_EQ(rows(0, j), before(0, j)) << "the first row stays";
    EXPECT_EQ(active, Active(at(n), 0));
    EXPECT_EQ(rank_by_full_pivoting(rows), rank_by_full_pivoting(before));
  }
}

TEST_P(OrthogonalTest, follows_the_rule_for_every_choice_of_rows_and_bounds) {
  Random random(102);
  for (int round = 0; round < 60; ++round) {
    const Index n = 1 + random.below(9);
    const double keep = round % 3 == 0 ? kSingular : std::ldexp(1.0, static_cast<int>(random.below(8)) - 2);
    instance()->tolerances[0] = keep;
    SmMatrix* m = with(random_dense(random, n, n, 50));
    if (m->nnz == 0) continue;
    Active active;
    for (Index i = 0; i < n; ++i) {
      constexpr std::int16_t kFlags[] = {0, 1, -1, 256};
      active.push_back(kFlags[random.below(4)]);
    }
    const Index lo = random.below(n + 2) - 1;
    const Index hi = random.below(n + 3) - 1;
    const double tolerance = round % 2 ? 1e-12 : 0.25;
    const Swept want = swept(entries(m), n, active, lo, hi, tolerance, keep);
    ASSERT_EQ(orthogonalise(m, active, lo, hi, tolerance), SM_OK);
    EXPECT_TRUE(alike(entries(m), want.rows)) << "round " << round;
    EXPECT_EQ(active, want.active) << "round " << round;
  }
}

TEST_P(OrthogonalTest, the_rows_between_the_bounds_stay_active_and_are_cleared_of_the_others) {
  instance()->tolerances[0] = 1e300;
  const Dense a = from_rows({{1, 0, 0}, {2, 3, 0}, {4, 5, 6}});
  SmMatrix* m = with(a);
  Active active{1, 1, 1};
  ASSERT_EQ(orthogonalise(m, active, 1, 3), SM_OK);
  EXPECT_EQ(active, (Active{0, 1, 1}));
  EXPECT_TRUE(near(contents(m), from_rows({{1, 0, 0}, {0, 3, 0}, {0, 5, 6}}), 0.0));
  for (const auto& [lo, hi] : {std::pair<Index, Index>{0, 3}, {-5, 100}, {std::numeric_limits<Index>::min(), kHuge}}) {
    SmMatrix* whole = with(a);
    const Snapshot before = snapshot(whole);
    Active flags{1, 0, 7};
    ASSERT_EQ(orthogonalise(whole, flags, lo, hi), SM_OK);
    EXPECT_EQ(flags, (Active{1, 0, 7}));
    EXPECT_TRUE(snapshot(whole) == before) << "no row is outside " << lo << ' ' << hi;
  }
}

TEST_P(OrthogonalTest, inactive_rows_neither_give_nor_receive) {
  instance()->tolerances[0] = 1e300;
  SmMatrix* m = with(from_rows({{1, 1, 0}, {1, 0, 0}, {1, 1, 1}}));
  Active active{0, 1, 1};
  ASSERT_EQ(orthogonalise(m, active), SM_OK);
  EXPECT_TRUE(near(contents(m), from_rows({{1, 1, 0}, {1, 0, 0}, {0, 1, 1}}), 0.0));
  EXPECT_EQ(active, Active(3, 0));
}

TEST_P(OrthogonalTest, short_rows_and_small_components_are_passed_over) {
  instance()->tolerances[0] = 1e300;
  const Dense a = from_rows({{0.5, 0}, {1, 4}});
  SmMatrix* short_row = with(a);
  Active active{1, 1};
  ASSERT_EQ(orthogonalise(short_row, active, 0, 0, 0.25), SM_OK) << "0.25 is not above 0.25";
  EXPECT_TRUE(near(contents(short_row), a, 0.0));
  EXPECT_EQ(active, Active(2, 0)) << "but it is taken out";
  SmMatrix* component = with(from_rows({{2, 0}, {1, 4}}));
  active = {1, 1};
  ASSERT_EQ(orthogonalise(component, active, 0, 0, 0.5), SM_OK);
  EXPECT_TRUE(near(contents(component), from_rows({{2, 0}, {1, 4}}), 0.0)) << "a component of exactly the tolerance";
  active = {1, 1};
  ASSERT_EQ(orthogonalise(component, active, 0, 0, 0.49), SM_OK);
  EXPECT_TRUE(near(contents(component), from_rows({{2, 0}, {0, 4}}), 0.0));
}

TEST_P(OrthogonalTest, a_nan_compares_with_nothing) {
  const Dense a = from_rows({{1, 0}, {1, 4}});
  SmMatrix* m = with(a);
  Active active{1, 1};
  ASSERT_EQ(orthogonalise(m, active, 0, 0, kNan), SM_OK);
  EXPECT_TRUE(near(contents(m), a, 0.0));
  EXPECT_EQ(active, Active(2, 0));
  SmMatrix* broken = with(a);
  ASSERT_EQ(fn().qxsmassign(broken, 0, 0, 0, kNan), SM_OK);
  active = {1, 1};
  ASSERT_EQ(orthogonalise(broken, active), SM_OK);
  EXPECT_EQ(entries(broken).at({1, 0}), 1.0);
  EXPECT_EQ(entries(broken).at({1, 1}), 4.0);
}

TEST_P(OrthogonalTest, a_matrix_without_small_roots_keeps_its_count_through_many_sweeps) {
  // Each sweep writes full rows of new nodes; the old ones are no longer counted.
  instance()->tolerances[0] = 1e300;
  Random random(103);
  SmMatrix* m = with(random_dense(random, 20, 20));
  for (int again = 0; again < 5; ++again) {
    Active active(20, 1);
    ASSERT_EQ(orthogonalise(m, active, 0, 0, 1e-30), SM_OK);
    EXPECT_EQ(m->nnz, 400);
    EXPECT_EQ(entries(m).size(), 400U);
  }
}

TEST_P(OrthogonalTest, its_checks_come_in_order) {
  EXPECT_EQ(refused(new_untyped(session())), SM_OK);
  EXPECT_EQ(refused(build_open(session(), Dense(0, 0))), SM_OK);  // empty before open
  EXPECT_EQ(refused(new_sized(session(), kGeneralSparse, 2, 3)), SM_OK);
  SmMatrix* none = new_untyped_with_an_entry(session());
  EXPECT_EQ(refused(none), SM_UNTYPED);  // the kind before the state
  std::vector<double> data(6, 1.0);
  EXPECT_EQ(refused(new_open_tied(session(), data, 2, 3, SM_KIND_GENERAL, SM_FORMAT_ROWS)),
            SM_NOT_CLOSED);  // the state before the shape
  EXPECT_EQ(refused(build_open(session(), from_diagonal({1}))), SM_NOT_CLOSED);
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows}) {
    EXPECT_EQ(refused(build(session(), shape, from_rows({{1, 2, 3}, {4, 5, 6}}))), SM_NOT_SQUARE);
  }
  for (const Shape shape : kShapes) {
    if (shape.kind == SM_KIND_GENERAL && is_sparse(shape)) continue;
    EXPECT_EQ(refused(build(session(), shape, from_diagonal({1, 2}))), SM_UNAVAILABLE) << name_of(shape);
  }
}

}  // namespace
}  // namespace sm::test
