// qxsmUpdateGinv: G[r+i][r+j] <- s A[i][j] + B[c+i][c+j] over what G stores.
#include <array>

#include "ginv/ginv_support.hpp"

namespace sm::test {
namespace {

using Index = std::int64_t;
constexpr Index kLowest = std::numeric_limits<Index>::min();

class UpdateTest : public ModuleTest {
 protected:
  SmMatrix* with(Shape shape, const Dense& a) { return build(session(), shape, a); }
  SmStatus update(SmMatrix* g, SmMatrix* a, SmMatrix* b, Index r = 0, Index c = 0, double s = 1.0) {
    return fn().qxsmUpdateGinv(g, a, b, r, c, s);
  }
  // Answers the status of a refusal that must leave all three as they were.
  SmStatus refused(SmMatrix* g, SmMatrix* a, SmMatrix* b) {
    const Snapshot before[] = {snapshot(g), snapshot(a), snapshot(b)};
    const SmStatus status = update(g, a, b);
    EXPECT_TRUE(snapshot(g) == before[0] && snapshot(a) == before[1] && snapshot(b) == before[2]);
    return status;
  }
};
INSTANTIATE_BOTH_HOSTS(UpdateTest);

// What qxsmget leaves in its output for element (row, col) of a matrix that stores `a`.
double as_read(const Dense& a, Index row, Index col) {
  if (row < 0 || col < 0 || row >= a.rows() || col >= a.rows()) return kNan;
  return static_cast<double>(a(row, col));
}

// The entries of a sparse G afterwards.
Nonzeros expected_entries(Nonzeros g, const Dense& a, const Dense& b, Index r, Index c, double s) {
  for (auto& [place, value] : g) {
    const Index t = place.first - r;
    const Index u = place.second - r;
    if (t < 0 || t >= a.rows() || u < 0 || u >= a.rows()) continue;
    const double from_a = as_read(a, t, u);
    value = (std::isnan(s) ? from_a : from_a * s) + as_read(b, c + t, c + u);
  }
  return g;
}

bool same(const Nonzeros& got, const Nonzeros& want) {
  if (got.size() != want.size()) return false;
  for (const auto& [place, value] : want) {
    const auto found = got.find(place);
    if (found == got.end()) return false;
    if (std::isnan(value) ? !std::isnan(found->second) : found->second != value) return false;
  }
  return true;
}

// The elements of a packed G afterwards: its rows r .. r+m-1 in turn, each over the columns that the format prescribes,
// one value of A in storage order for each element written.
Dense expected_packed(Dense g, const std::vector<double>& a, Index m, const Dense& b, Index r, Index c, double s,
                      std::int32_t format) {
  const auto inside = [](Index i, Index n) { return i >= 0 && i < n; };
  std::size_t next = 0;
  for (Index p = r; p < r + m; ++p) {
    const bool by_rows = format == SM_FORMAT_ROWS;
    for (Index q = by_rows ? p : r; by_rows ? q < m : q <= p; ++q) {
      const Index i = c + (p - r);
      const Index j = c + (q - r);
      if (!inside(p, g.rows()) || !inside(q, g.rows()) || !inside(i, b.rows()) || !inside(j, b.rows())) continue;
      const double from_a = a[next++];
      g(p, q) = (std::isnan(s) ? 0.0 : s * from_a) + static_cast<double>(b(i, j));
      g(q, p) = g(p, q);
    }
  }
  return g;
}

TEST_P(UpdateTest, rewrites_the_stored_entries_of_a_sparse_block) {
  Random random(71);
  for (const auto& [r, c, m] : std::vector<std::array<Index, 3>>{{0, 0, 6}, {2, 1, 3}, {3, 0, 3}, {0, 3, 2}, {5, 5, 1}})
    for (const double s : {1.0, -2.5, 0.0}) {
      const Dense g = random_symmetric(random, 6, 40);
      const Dense a = random_symmetric(random, m, 60);
      const Dense b = random_symmetric(random, 6, 50);
      for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
        SmMatrix* target = with(kSymmetricSparse, g);
        SmMatrix* a_read = with(shape, a);
        SmMatrix* b_read = with(kSymmetricSparse, b);
        const Snapshot before[] = {snapshot(a_read), snapshot(b_read)};
        const Nonzeros want = expected_entries(entries(target), a, b, r, c, s);
        ASSERT_EQ(update(target, a_read, b_read, r, c, s), SM_OK);
        EXPECT_TRUE(same(compressed(target), want)) << r << ' ' << c << ' ' << m << ' ' << name_of(shape);
        EXPECT_TRUE(snapshot(a_read) == before[0] && snapshot(b_read) == before[1]);
        EXPECT_EQ(target->state, SM_STATE_CLOSED);
      }
    }
}

TEST_P(UpdateTest, a_sparse_block_with_its_diagonal_alone_gets_no_new_entries) {
  SmMatrix* g = with(kSymmetricSparse, from_diagonal({1, 2, 3}));
  const Dense full = from_rows({{1, 2}, {2, 4}});
  ASSERT_EQ(update(g, with(kSymmetricSparse, full), with(kSymmetricSparse, full), 1, 0, 10.0), SM_OK);
  EXPECT_EQ(compressed(g), (Nonzeros{{{0, 0}, 1.0}, {{1, 1}, 11.0}, {{2, 2}, 44.0}}));
}

TEST_P(UpdateTest, a_sparse_matrix_in_any_state_is_updated_where_its_entries_lie) {
  Random random(72);
  const Problem problem = positive_definite(random_graph(random, 8, 50), random);
  const Dense a = random_symmetric(random, 4);
  const Dense b = random_symmetric(random, 5);
  for (std::int32_t state = SM_STATE_CLOSED; state <= SM_STATE_FACTORED; ++state) {
    SmMatrix* g = new_sparse(session(), problem);
    ASSERT_EQ(bring_to(g, state), SM_OK);
    const Nonzeros want = expected_entries(entries(g), a, b, 3, 1, 2.0);
    ASSERT_EQ(update(g, with(kSymmetricSparse, a), with(kSymmetricSparse, b), 3, 1, 2.0), SM_OK);
    EXPECT_TRUE(same(entries(g), want)) << "state " << state;
    EXPECT_EQ(g->state, state == SM_STATE_FACTORED ? SM_STATE_SYMBOLIC + 0 : state);
    expect_voided(g);
  }
}

TEST_P(UpdateTest, a_factored_sparse_matrix_is_factored_again_with_the_new_values) {
  Random random(73);
  const Problem problem = positive_definite(grid(3, 3), random);
  const Dense a = positive_definite(clique(4), random).dense();
  SmMatrix* g = new_sparse(session(), problem);
  ASSERT_EQ(fn().qxsmfact(g, 0), SM_OK);
  SmMatrix* zero = with(kSymmetricSparse, Dense(4, 4));
  ASSERT_EQ(update(g, with(kSymmetricSparse, a), zero, 5, 0, 100.0), SM_OK);
  EXPECT_EQ(g->state, SM_STATE_SYMBOLIC);
  const Dense now = contents(g);
  EXPECT_GT(now(8, 8), 100.0);
  double log_det = 0.0;
  ASSERT_EQ(fn().qxsmlogdet(g, &log_det), SM_OK);
  EXPECT_NEAR(log_det, static_cast<double>(log_determinant(now)), 1e-11);
  EXPECT_TRUE(near(product(now, solved_identity(g)), identity(9), 1e-12));
}

TEST_P(UpdateTest, what_cannot_be_read_enters_a_sparse_block_as_the_missing_value) {
  const Dense a = from_rows({{1, 2, 3}, {2, 4, 5}, {3, 5, 6}});
  const Dense g = from_rows({{7, 7, 7}, {7, 7, 7}, {7, 7, 7}});
  const Dense b = from_rows({{10, 20}, {20, 40}});
  for (const Index c : {Index{0}, Index{1}, Index{2}, Index{-1}, Index{-5}, kHuge, kHuge - 1, kLowest}) {
    SmMatrix* target = with(kSymmetricSparse, g);
    const bool near_b = c > -10 && c < 10;
    const Nonzeros want = expected_entries(entries(target), a, near_b ? b : Dense(0, 0), 0, near_b ? c : 0, 1.0);
    ASSERT_EQ(update(target, with(kSymmetricSparse, a), with(kSymmetricSparse, b), 0, c), SM_OK);
    EXPECT_TRUE(same(compressed(target), want)) << c;
  }
  SmMatrix* open_a = with(kSymmetricSparse, g);
  ASSERT_EQ(update(open_a, build_open(session(), a), with(kSymmetricSparse, a)), SM_OK);
  for (const auto& [place, value] : entries(open_a)) EXPECT_TRUE(std::isnan(value));
  SmMatrix* reordered_b = with(kSymmetricSparse, a);
  ASSERT_EQ(qxsmmd(reordered_b), SM_OK);
  SmMatrix* target = with(kSymmetricSparse, g);
  ASSERT_EQ(update(target, with(kSymmetricSparse, a), reordered_b), SM_OK);
  for (const auto& [place, value] : entries(target)) {
    if (place.first == place.second) {
      EXPECT_EQ(value, static_cast<double>(2 * a(place.first, place.first)));
    } else {
      EXPECT_TRUE(std::isnan(value)) << place.first << ' ' << place.second;
    }
  }
}

TEST_P(UpdateTest, an_element_that_a_sparse_operand_does_not_store_reads_as_0) {
  SmMatrix* g = with(kSymmetricSparse, from_rows({{9, 9}, {9, 9}}));
  const Dense none = from_diagonal({1, 2});
  ASSERT_EQ(update(g, with(kSymmetricSparse, none), with(kSymmetricSparse, none), 0, 0, 3.0), SM_OK);
  EXPECT_EQ(compressed(g), (Nonzeros{{{0, 0}, 4.0}, {{0, 1}, 0.0}, {{1, 1}, 8.0}}));
}

TEST_P(UpdateTest, rows_of_a_sparse_block_that_lie_outside_are_skipped) {
  Random random(74);
  const Dense g = random_symmetric(random, 5);
  const Dense a = random_symmetric(random, 3);
  const Dense b = random_symmetric(random, 8);
  for (const Index r : {Index{-1}, Index{-2}, Index{-3}, Index{3}, Index{4}, Index{5}, Index{77}, kHuge, kHuge - 2,
                        kLowest, kLowest + 1}) {
    SmMatrix* target = with(kSymmetricSparse, g);
    Nonzeros want = entries(target);
    if (r > -10 && r < 10) want = expected_entries(want, a, b, r, 2, -1.0);
    ASSERT_EQ(update(target, with(kSymmetricSparse, a), with(kSymmetricSparse, b), r, 2, -1.0), SM_OK);
    EXPECT_TRUE(same(compressed(target), want)) << r;
  }
}

TEST_P(UpdateTest, a_nan_as_scale_adds_a_unscaled_to_a_sparse_g_and_drops_it_from_a_packed_one) {
  const Dense g = from_rows({{9, 9}, {9, 9}});
  const Dense a = from_rows({{1, 2}, {2, 3}});
  const Dense b = from_rows({{10, 20}, {20, 30}});
  SmMatrix* sparse = with(kSymmetricSparse, g);
  ASSERT_EQ(update(sparse, with(kSymmetricSparse, a), with(kSymmetricSparse, b), 0, 0, kNan), SM_OK);
  EXPECT_TRUE(near(contents(sparse), from_rows({{11, 22}, {22, 33}}), 0.0));
  Dense wild = a;
  wild(0, 0) = kInfinity;
  wild(0, 1) = wild(1, 0) = kNan;
  for (const Shape shape : kPacked) {
    SmMatrix* packed = with(shape, g);
    ASSERT_EQ(update(packed, with(shape, wild), with(shape, b), 0, 0, kNan), SM_OK);
    EXPECT_TRUE(near(contents(packed), b, 0.0)) << name_of(shape);
  }
}

TEST_P(UpdateTest, rewrites_the_leading_block_of_a_packed_matrix) {
  Random random(75);
  for (const Shape shape : kPacked)
    for (const Index m : {1, 3, 5})
      for (const Index c : {0, 2})
        for (const double s : {1.0, -0.5, 0.0}) {
          const Dense g = random_symmetric(random, 5);
          const Dense a = random_symmetric(random, m);
          const Dense b = random_symmetric(random, 7);
          Dense want = g;
          for (Index i = 0; i < m; ++i)
            for (Index j = 0; j < m; ++j) want(i, j) = s * a(i, j) + b(c + i, c + j);
          SmMatrix* target = with(shape, g);
          ASSERT_EQ(update(target, with(shape, a), with(shape, b), 0, c, s), SM_OK);
          EXPECT_TRUE(near(contents(target), want, 0.0)) << name_of(shape) << ' ' << m << ' ' << c;
        }
}

TEST_P(UpdateTest, a_packed_block_elsewhere_keeps_the_bounds_of_its_format) {
  Random random(76);
  for (const Shape shape : kPacked)
    for (const Index m : {2, 3, 5})
      for (const Index r : {Index{-4}, Index{-1}, Index{1}, Index{2}, Index{4}, Index{6}})
        for (const Index c : {Index{-2}, Index{-1}, Index{0}, Index{1}, Index{4}, Index{9}})
          for (const double s : {2.0, kNan}) {
            const Dense g = random_symmetric(random, 5);
            const Dense a = random_symmetric(random, m);
            const Dense b = random_symmetric(random, 6);
            SmMatrix* target = with(shape, g);
            ASSERT_EQ(update(target, with(shape, a), with(shape, b), r, c, s), SM_OK);
            const Dense want = expected_packed(g, laid_out(shape, a), m, b, r, c, s, shape.format);
            EXPECT_TRUE(near(contents(target), want, 0.0))
                << name_of(shape) << " m " << m << " r " << r << " c " << c << " s " << s;
          }
}

TEST_P(UpdateTest, a_shifted_block_in_format_22_is_the_block_and_in_format_23_its_rows_above_the_order_of_a) {
  const Dense a = from_rows({{1, 2}, {2, 3}});
  const Dense b = from_rows({{10, 20}, {20, 30}});
  SmMatrix* columns = with(kSymmetricColumns, Dense(3, 3));
  ASSERT_EQ(update(columns, with(kSymmetricColumns, a), with(kSymmetricColumns, b), 1), SM_OK);
  EXPECT_TRUE(near(contents(columns), from_rows({{0, 0, 0}, {0, 11, 22}, {0, 22, 33}}), 0.0));
  SmMatrix* rows = with(kSymmetricRows, Dense(3, 3));
  ASSERT_EQ(update(rows, with(kSymmetricRows, a), with(kSymmetricRows, b), 1), SM_OK);
  EXPECT_TRUE(near(contents(rows), from_rows({{0, 0, 0}, {0, 11, 0}, {0, 0, 0}}), 0.0));
}

TEST_P(UpdateTest, packed_offsets_far_outside_write_nothing) {
  Random random(77);
  const Dense g = random_symmetric(random, 4);
  const Dense a = random_symmetric(random, 3);
  for (const Shape shape : kPacked)
    for (const Index far : {kHuge, kHuge - 1, kLowest, kLowest + 2, Index{1} << 60})
      for (const bool of_g : {true, false}) {
        SmMatrix* target = with(shape, g);
        EXPECT_EQ(update(target, with(shape, a), with(shape, g), of_g ? far : 0, of_g ? 0 : far), SM_OK);
        EXPECT_TRUE(near(contents(target), g, 0.0)) << name_of(shape) << ' ' << far;
      }
}

TEST_P(UpdateTest, operands_whose_values_could_not_be_had_give_a_packed_g_nothing_and_a_sparse_one_zeros) {
  const Dense g = from_rows({{7, 8}, {8, 9}});
  const Dense a = from_rows({{1, 2}, {2, 3}});
  for (const Shape shape : kPacked) {
    for (const bool of_a : {true, false}) {
      SmMatrix* missing = new_without_values(session(), shape, 2);
      SmMatrix* there = with(shape, a);
      SmMatrix* target = with(shape, g);
      EXPECT_EQ(update(target, of_a ? missing : there, of_a ? there : missing), SM_OK) << name_of(shape) << of_a;
      EXPECT_TRUE(near(contents(target), g, 0.0)) << name_of(shape) << of_a;
    }
    SmMatrix* sparse = with(kSymmetricSparse, g);
    EXPECT_EQ(update(sparse, new_without_values(session(), shape, 2), with(kSymmetricSparse, a)), SM_OK);
    EXPECT_TRUE(near(contents(sparse), a, 0.0)) << name_of(shape);
  }
}

TEST_P(UpdateTest, a_changed_packed_target_loses_its_separate_array_rank_and_log_determinant) {
  const Dense g = from_rows({{4, 0}, {0, 9}});
  const Dense one = from_diagonal({1, 1});
  for (const Shape shape : kPacked) {
    SCOPED_TRACE(name_of(shape));
    SmMatrix* a = with(shape, one);
    SmMatrix* b = with(shape, one);
    const std::int64_t blocks = host().live_blocks();
    SmMatrix* factored = with(shape, g);
    ASSERT_EQ(fn().qxsmfact(factored, 0), SM_OK);
    SmMatrix* inverted = with(shape, g);
    ASSERT_EQ(fn().qxsminv(inverted, 0, kNan), SM_OK);
    SmMatrix* factored_in_place = with(shape, g);
    ASSERT_EQ(fn().qxsmfact(factored_in_place, 1), SM_OK);
    for (SmMatrix* m : {factored, inverted, factored_in_place}) {
      ASSERT_EQ(update(m, a, b, 0, 0, 3.0), SM_OK);
      EXPECT_EQ(m->state, m == inverted ? SM_STATE_CLOSED : SM_STATE_SYMBOLIC);
      EXPECT_EQ(m->dense_factor, nullptr);
      expect_voided(m);
      EXPECT_TRUE(near(contents(m), from_diagonal({4, 4}), 0.0));
      double log_det = 0.0;
      EXPECT_EQ(fn().qxsmlogdet(m, &log_det), SM_OK);
      EXPECT_NEAR(log_det, std::log(16.0), 1e-14);
    }
    for (SmMatrix* m : {factored, inverted, factored_in_place})
      EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
    EXPECT_EQ(host().live_blocks(), blocks);
  }
}

TEST_P(UpdateTest, an_empty_a_writes_nothing_and_lowers_the_state_all_the_same) {
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
    SmMatrix* g = with(shape, from_diagonal({4, 9}));
    ASSERT_EQ(fn().qxsmfact(g, 0), SM_OK);
    SmMatrix* empty = new_sized(session(), shape, 0, 0);
    ASSERT_EQ(update(g, empty, with(shape, from_diagonal({1, 1}))), SM_OK);
    EXPECT_EQ(g->state, SM_STATE_SYMBOLIC) << name_of(shape);
    EXPECT_TRUE(near(contents(g), from_diagonal({4, 9}), 0.0));
    std::int64_t rank = 0;
    EXPECT_EQ(fn().qxsmrank(g, &rank), SM_OK);
    EXPECT_EQ(rank, 2);
  }
}

TEST_P(UpdateTest, a_and_b_may_be_the_same_matrix) {
  const Dense a = from_rows({{1, 2}, {2, 3}});
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
    SmMatrix* g = with(shape, from_rows({{9, 9}, {9, 9}}));
    SmMatrix* both = with(shape, a);
    ASSERT_EQ(update(g, both, both, 0, 0, 2.0), SM_OK);
    EXPECT_TRUE(near(contents(g), scaled(a, 3.0L), 0.0)) << name_of(shape);
  }
}

TEST_P(UpdateTest, a_tied_target_is_changed_where_it_lies_and_never_freed) {
  const Dense a = from_rows({{1, 2}, {2, 3}});
  for (const Shape shape : kPacked) {
    std::vector<double> data = laid_out(shape, from_rows({{4, 1}, {1, 9}}));
    SmMatrix* g = new_tied(session(), shape, data, 2, 2);
    ASSERT_EQ(fn().qxsmfact(g, 0), SM_OK);
    ASSERT_EQ(update(g, with(shape, a), with(shape, a), 0, 0, 2.0), SM_OK);
    EXPECT_EQ(data, laid_out(shape, scaled(a, 3.0L)));
    EXPECT_EQ(g->values, data.data());
  }
}

TEST_P(UpdateTest, its_checks_come_in_order) {
  const Dense one = from_diagonal({1, 2});
  SmMatrix* empty = build_open(session(), Dense(0, 0));
  SmMatrix* general = with(kGeneralRows, one);
  EXPECT_EQ(refused(empty, empty, general), SM_OK);  // empty before open, the same handle and the kinds
  EXPECT_EQ(refused(new_untyped(session()), general, general), SM_OK);
  SmMatrix* open = build_open(session(), one);
  EXPECT_EQ(refused(open, open, general), SM_NOT_CLOSED);  // open before the same handle
  EXPECT_EQ(refused(open, general, open), SM_NOT_CLOSED);
  SmMatrix* none = new_untyped_with_an_entry(session());
  EXPECT_EQ(refused(none, general, general), SM_NOT_CLOSED);
  SmMatrix* diagonal = with(kDiagonalRows, one);
  EXPECT_EQ(refused(diagonal, diagonal, general), SM_BAD_ARGUMENT);  // the same handle before the kinds
  EXPECT_EQ(refused(diagonal, general, diagonal), SM_BAD_ARGUMENT);
  SmMatrix* rows = with(kSymmetricRows, one);
  SmMatrix* columns = with(kSymmetricColumns, one);
  EXPECT_EQ(refused(rows, rows, columns), SM_BAD_ARGUMENT);  // and before the formats
  for (const Shape shape : {kGeneralSparse, kGeneralColumns, kGeneralRows, kDiagonalColumns, kDiagonalRows}) {
    SmMatrix* other = with(shape, one);
    EXPECT_EQ(refused(other, rows, columns), SM_KIND_MISMATCH) << name_of(shape);
    EXPECT_EQ(refused(rows, other, columns), SM_KIND_MISMATCH);  // the kinds before the formats
    EXPECT_EQ(refused(rows, columns, other), SM_KIND_MISMATCH);
  }
  EXPECT_EQ(refused(rows, new_untyped(session()), columns), SM_KIND_MISMATCH);
  EXPECT_EQ(refused(rows, columns, new_untyped(session())), SM_KIND_MISMATCH);
}

TEST_P(UpdateTest, formats_that_do_not_pair_answer_124) {
  const Dense one = from_diagonal({1, 2});
  constexpr Shape kSymmetric[] = {kSymmetricSparse, kSymmetricColumns, kSymmetricRows};
  for (const Shape g : kSymmetric)
    for (const Shape a : kSymmetric)
      for (const Shape b : kSymmetric) {
        const bool served = b.format == g.format && (is_sparse(g) || a.format == g.format);
        SCOPED_TRACE(name_of(g) + ", " + name_of(a) + ", " + name_of(b));
        SmMatrix* target = with(g, one);
        if (served) {
          EXPECT_EQ(update(target, with(a, one), with(b, one)), SM_OK);
          EXPECT_TRUE(near(contents(target), from_diagonal({2, 4}), 0.0));
        } else {
          EXPECT_EQ(refused(target, with(a, one), with(b, one)), SM_UNAVAILABLE);
        }
      }
}

TEST_P(UpdateTest, needs_no_memory) {
  const Dense one = from_diagonal({1, 2});
  for (const Shape shape : {kSymmetricSparse, kSymmetricColumns, kSymmetricRows}) {
    SmMatrix* g = with(shape, one);
    SmMatrix* a = with(shape, one);
    SmMatrix* b = with(shape, one);
    host().fail_request(0, true);
    EXPECT_EQ(update(g, a, b), SM_OK);
    EXPECT_EQ(host().stop_failing(), 0);
  }
}

}  // namespace
}  // namespace sm::test
