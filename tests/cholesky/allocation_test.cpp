// Every request of every operation refused in turn, once and for ever.
#include <algorithm>
#include <cmath>
#include <functional>

#include "cholesky/cholesky_support.hpp"

namespace sm::test {
namespace {

constexpr std::int32_t kFormats[] = {SM_FORMAT_COLUMNS, SM_FORMAT_ROWS};
using Bits = std::vector<std::uint64_t>;

// One operation on one matrix: how to come by the matrix, what to call, what must be as before after a refusal, and
// what the answer consists of.
struct Operation {
  std::function<SmMatrix*(Session&)> prepare;
  std::function<SmStatus(Session&, SmMatrix*)> run;
  std::function<Bits(const SmMatrix*)> inputs;
  std::function<Bits(const SmMatrix*)> answer;
  bool solves = false;  // factoring may have succeeded before the refusal
};

class AllocationTest : public ModuleTest {
 protected:
  // Answers how many requests there were to refuse.
  std::int64_t survive(const Operation& op);
  // Right-hand sides and the solutions of the last run.
  std::vector<double> b_;
  std::vector<double> x_;

  Operation solving(std::function<SmMatrix*(Session&)> prepare,
                    std::function<SmStatus(Session&, SmMatrix*, const double*, double*)> solve);
};
INSTANTIATE_BOTH_HOSTS(AllocationTest);

std::int64_t AllocationTest::survive(const Operation& op) {
  Session calm(GetParam());
  SmMatrix* untroubled = op.prepare(calm);
  EXPECT_EQ(op.run(calm, untroubled), SM_OK);
  const Bits want = op.answer(untroubled);
  const std::int64_t blocks_at_end = calm.host().live_blocks();
  std::int64_t requests = 0;
  for (const bool for_ever : {false, true})
    for (std::int64_t k = 0; k < 1000; ++k) {
      Session session(GetParam());
      SmMatrix* m = op.prepare(session);
      const Bits inputs = op.inputs(m);
      const std::int32_t state = m->state;
      const std::int64_t loose = session.host().live_blocks() - owned_blocks(m);
      session.host().fail_request(k, for_ever);
      const SmStatus status = op.run(session, m);
      if (session.host().stop_failing() == 0) {
        EXPECT_EQ(status, SM_OK);
        requests = k;
        break;
      }
      EXPECT_EQ(status, SM_NO_MEMORY) << "request " << k << (for_ever ? " and on" : "");
      EXPECT_LE(m->state, op.solves ? untroubled->state : std::max(state, untroubled->state - 1)) << "request " << k;
      EXPECT_EQ(op.inputs(m), inputs) << "request " << k;
      EXPECT_LE(session.host().live_blocks() - owned_blocks(m), loose) << "request " << k;
      EXPECT_EQ(op.run(session, m), SM_OK) << "after request " << k;
      EXPECT_EQ(op.answer(m), want) << "after request " << k;
      EXPECT_EQ(session.host().live_blocks(), blocks_at_end) << "after request " << k;
      session.close();
      EXPECT_EQ(session.host().live_pools(), 0);
      EXPECT_EQ(session.host().violations(), 0);
      if (HasFailure()) return k;
    }
  return requests;
}

Bits of_words(const std::int64_t* array, std::int64_t count) { return {array, array + count}; }

// Rows of a matrix that ordering has not moved, or the values of a dense one.
Bits values_of(const SmMatrix* m) {
  if (m->format == SM_FORMAT_SPARSE) return m->nz_values ? bits(m->nz_values, m->nnz) : Bits{};
  return bits(m->values, static_cast<std::int64_t>(m->value_count));
}
Bits nothing(const SmMatrix*) { return {}; }

Bits results_of(const SmMatrix* m) {
  Bits all = bits(&m->log_det, 1);
  all.push_back(static_cast<std::uint64_t>(m->rank));
  all.push_back(static_cast<std::uint64_t>(m->state));
  Bits factor;
  if (m->format == SM_FORMAT_SPARSE) {
    factor = bits(m->factor_diag, m->rows);
    const Bits values = bits(m->factor_values, m->factor_iu[m->rows]);
    factor.insert(factor.end(), values.begin(), values.end());
  } else {
    factor = bits(m->dense_factor ? m->dense_factor : m->values, static_cast<std::int64_t>(m->value_count));
  }
  all.insert(all.end(), factor.begin(), factor.end());
  return all;
}

Problem definite(std::int64_t n) {
  Random random(static_cast<std::uint64_t>(n));
  return positive_definite(random_graph(random, n, 50), random);
}

Operation AllocationTest::solving(std::function<SmMatrix*(Session&)> prepare,
                                  std::function<SmStatus(Session&, SmMatrix*, const double*, double*)> solve) {
  Random random(1);
  b_ = random.vector(64);
  x_.assign(64, 0.0);
  return {std::move(prepare), [this, solve](Session& s, SmMatrix* m) { return solve(s, m, b_.data(), x_.data()); },
          nothing, [this](const SmMatrix*) { return bits(x_); }, true};
}

SmStatus substitute(Session& s, SmMatrix* m, const double* b, double* x) { return s.fn().qxsmsubst(m, b, x, 2); }
SmStatus multiply(Session&, SmMatrix* m, const double* b, double* x) { return qxsminvmultv(m, b, x, 2); }
SmStatus solve_directly(Session& s, SmMatrix* m, const double* b, double* x) {
  return s.fn().qxsmsoldirect(m, b, x, 2);
}

TEST_P(AllocationTest, ordering) {
  const Operation op{[](Session& s) { return new_sparse(s, definite(10)); },
                     [](Session&, SmMatrix* m) { return qxsmmd(m); },
                     [](const SmMatrix* m) {
                       Bits all = values_of(m);
                       for (const std::uint64_t w : of_words(m->row_start, m->rows + 1)) all.push_back(w);
                       for (const std::uint64_t w : of_words(m->col_index, m->nnz)) all.push_back(w);
                       return all;
                     },
                     [](const SmMatrix* m) { return of_words(m->perm, m->rows); }};
  EXPECT_EQ(survive(op), 3);
}

TEST_P(AllocationTest, factoring_a_sparse_matrix) {
  const Operation op{[](Session& s) { return new_sparse(s, definite(12)); },
                     [](Session& s, SmMatrix* m) { return s.fn().qxsmfact(m, 0); }, nothing, results_of};
  EXPECT_GE(survive(op), 3);
}

TEST_P(AllocationTest, factoring_a_sparse_matrix_whose_values_need_more_room) {
  const auto hub_first = [](Session& s) {
    Random random(2);
    SmMatrix* m = new_sparse(s, positive_definite(star(30, 0), random));
    EXPECT_EQ(qxsmmd(m), SM_OK);
    impose_order(m, natural_order(30));
    return m;
  };
  EXPECT_GE(survive({hub_first, [](Session& s, SmMatrix* m) { return s.fn().qxsmfact(m, 0); }, nothing, results_of}),
            1);
  const auto short_of_subscripts = [&](Session& s) {
    SmMatrix* m = hub_first(s);
    EXPECT_EQ(qxsmreorder(m), SM_OK);
    replace_work(m, 151);
    return m;
  };
  EXPECT_GE(survive({short_of_subscripts, [](Session& s, SmMatrix* m) { return s.fn().qxsmfact(m, 0); }, values_of,
                     results_of}),
            2);
}

TEST_P(AllocationTest, factoring_a_packed_matrix) {
  for (const std::int32_t format : kFormats)
    for (const std::int32_t in_place : {0, 1}) {
      const Operation op{[=](Session& s) { return new_packed(s, definite(9), format); },
                         [=](Session& s, SmMatrix* m) { return s.fn().qxsmfact(m, in_place); }, values_of, results_of};
      EXPECT_GE(survive(op), in_place ? 0 : 1);
    }
}

TEST_P(AllocationTest, factoring_a_diagonal_matrix) {
  for (const std::int32_t in_place : {0, 1}) {
    const Operation op{[](Session& s) {
                         return new_diagonal(s, {4.0, 0.0, 9.0});
                       },
                       [=](Session& s, SmMatrix* m) { return s.fn().qxsmfact(m, in_place); }, values_of, results_of};
    EXPECT_EQ(survive(op), in_place ? 0 : 1);
  }
}

TEST_P(AllocationTest, factoring_a_tied_array_that_has_no_pool_yet) {
  for (const std::int32_t format : kFormats) {
    std::vector<double> data = packed(definite(5), format);
    const Operation op{[&](Session& s) {
                         SmMatrix* m = new_open_tied(s, data, 5, 5, SM_KIND_SYMMETRIC, format);
                         EXPECT_EQ(s.fn().qxsmclose(m, 0.0), SM_OK);
                         return m;
                       },
                       [](Session& s, SmMatrix* m) { return s.fn().qxsmfact(m, 0); }, values_of, results_of};
    EXPECT_GE(survive(op), 2);
  }
}

TEST_P(AllocationTest, log_determinant) {
  for (const std::int32_t format : kFormats) {
    const Operation op{[=](Session& s) { return new_packed(s, definite(9), format); },
                       [](Session& s, SmMatrix* m) {
                         double out = 0.0;
                         return s.fn().qxsmlogdet(m, &out);
                       },
                       values_of, results_of};
    EXPECT_GE(survive(op), 1);
  }
}

TEST_P(AllocationTest, substitution) {
  const auto factored = [](SmMatrix* (*create)(Session&), std::int32_t in_place) {
    return [=](Session& s) {
      SmMatrix* m = create(s);
      EXPECT_EQ(s.fn().qxsmfact(m, in_place), SM_OK);
      return m;
    };
  };
  for (const std::int32_t in_place : {0, 1}) {
    EXPECT_EQ(survive(solving(factored([](Session& s) { return new_sparse(s, definite(8)); }, in_place), substitute)),
              0);
    EXPECT_EQ(
        survive(solving(factored([](Session& s) { return new_packed(s, definite(8), SM_FORMAT_COLUMNS); }, in_place),
                        substitute)),
        1);
    EXPECT_EQ(survive(solving(factored([](Session& s) { return new_packed(s, definite(8), SM_FORMAT_ROWS); }, in_place),
                              substitute)),
              1);
    EXPECT_EQ(survive(solving(factored(
                                  [](Session& s) {
                                    return new_diagonal(s, {1.0, 4.0});
                                  },
                                  in_place),
                              substitute)),
              0);
  }
}

TEST_P(AllocationTest, inverse_products) {
  EXPECT_GE(survive(solving([](Session& s) { return new_sparse(s, definite(8)); }, multiply)), 3);
  for (const std::int32_t format : kFormats)
    EXPECT_GE(survive(solving([=](Session& s) { return new_packed(s, definite(8), format); }, multiply)), 2);
  EXPECT_EQ(survive(solving([](Session& s) { return new_diagonal(s, {1.0, 4.0}); }, multiply)), 1);
}

TEST_P(AllocationTest, direct_solves) {
  EXPECT_GE(survive(solving([](Session& s) { return new_sparse(s, definite(8), false); }, solve_directly)), 6);
  EXPECT_GE(survive(solving([](Session& s) { return new_sparse(s, definite(8)); }, solve_directly)), 3);
  EXPECT_EQ(survive(solving([](Session& s) { return new_diagonal(s, {1.0, 4.0}); }, solve_directly)), 0);
  for (const std::int32_t format : kFormats) {
    survive(solving([=](Session& s) { return new_packed(s, definite(8), format); }, solve_directly));
    for (const std::int32_t in_place : {0, 1})
      survive(solving(
          [=](Session& s) {
            SmMatrix* m = new_packed(s, definite(8), format);
            EXPECT_EQ(s.fn().qxsmfact(m, in_place), SM_OK);
            return m;
          },
          solve_directly));
  }
}

}  // namespace
}  // namespace sm::test
