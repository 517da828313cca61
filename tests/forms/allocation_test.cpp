// Every request of every operation that takes memory refused in turn, once and for ever; and what repeated calls leave.
#include <algorithm>
#include <memory>

#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

using Matrices = std::vector<SmMatrix*>;

class FormsAllocationTest : public ModuleTest {
 protected:
  // Answers how many requests there were to refuse.
  std::int64_t survive(const FaultCase& c) { return sm::test::survive(GetParam(), c); }
};
INSTANTIATE_BOTH_HOSTS(FormsAllocationTest);

Known known_of(Shape shape, std::int64_t rows, std::int64_t cols) {
  Random random(static_cast<std::uint64_t>(rows + 100 * cols));
  return random_known(random, shape, rows, cols);
}

std::vector<double> last_of(const Matrices& m) { return read(m.back()).by_rows(); }

// Factored where it can be, so that a refused request leaves it as it is.
Operand ready(Shape shape) { return {shape, shape.kind == SM_KIND_GENERAL ? SM_STATE_CLOSED : SM_STATE_FACTORED}; }

std::string name_of_three(Shape a, Shape x, Shape r) {
  return name_of(a) + " between " + name_of(x) + " into " + name_of(r);
}

TEST_P(FormsAllocationTest, forms_of_matrices) {
  for (const Shape middle : kShapes)
    for (const Shape outer : kShapes) {
      const bool dense = outer == kGeneralColumns || outer == kGeneralRows;
      if (!dense && middle.kind != SM_KIND_SYMMETRIC) continue;
      for (const Shape into : kSymmetricShapes)
        for (const bool fresh : {false, true})
          for (const std::int32_t keep : {0, 1}) {
            if (keep && (fresh || into == kSymmetricSparse)) continue;
            SCOPED_TRACE(name_of_three(middle, outer, into));
            const std::int64_t rows = outer.kind == SM_KIND_GENERAL ? 3 : 5;
            const std::int64_t requests = survive(
                {[=](Session& s) {
                   return Matrices{build(s, middle, known_of(middle, 5, 5)), build(s, outer, known_of(outer, rows, 5)),
                                   fresh ? new_typed(s, into) : new_sized(s, into, rows, rows)};
                 },
                 [=](Session& s, const Matrices& m) -> SmStatus {
                   if (keep && s.fn().qxsmresize(m[2], rows, rows) != SM_OK)
                     return SM_TOO_LARGE;  // zeroes what was entered
                   return s.fn().qxsmquad(m[0], m[1], m[2], keep);
                 },
                 last_of});
            EXPECT_GE(requests, (dense ? 1 : 2) + (fresh ? 1 : 0));
          }
    }
}

TEST_P(FormsAllocationTest, forms_of_more_rows_than_a_slab_has_nodes) {
  for (const Shape outer : {kGeneralColumns, kGeneralSparse}) {
    const std::int64_t requests =
        survive({[=](Session& s) {
                   const Known x = Known::full(std::vector<std::vector<double>>(45, {1.0, 2.0}));
                   return Matrices{build(s, kSymmetricRows, known_of(kSymmetricRows, 2, 2)), build(s, outer, x),
                                   new_sized(s, kSymmetricSparse, 45, 45)};
                 },
                 [](Session& s, const Matrices& m) { return s.fn().qxsmquad(m[0], m[1], m[2], 0); }, last_of});
    EXPECT_GE(requests, 8);  // sizing 3, work, a second slab, closing 3
  }
}

TEST_P(FormsAllocationTest, only_several_rows_by_columns_are_copied) {
  const auto requests_for = [&](Shape outer, std::int64_t rows) {
    return survive({[=](Session& s) {
                      return Matrices{build(s, kSymmetricRows, known_of(kSymmetricRows, 5, 5)),
                                      build(s, outer, known_of(outer, rows, 5)),
                                      new_sized(s, kSymmetricRows, rows, rows)};
                    },
                    [](Session& s, const Matrices& m) { return s.fn().qxsmquad(m[0], m[1], m[2], 0); }, last_of});
  };
  EXPECT_EQ(requests_for(kGeneralRows, 1), 1);
  EXPECT_EQ(requests_for(kGeneralRows, 2), 1);
  EXPECT_EQ(requests_for(kGeneralColumns, 1), 1);
  EXPECT_EQ(requests_for(kGeneralColumns, 2), 2);
}

TEST_P(FormsAllocationTest, forms_of_packed_arrays_between_sparse_rows) {
  Random random(3);
  const std::vector<double> s_of = random.vector(15);
  for (const bool fresh : {false, true}) {
    const std::int64_t requests = survive(
        {[=](Session& s) {
           return Matrices{build(s, kGeneralSparse, known_of(kGeneralSparse, 4, 5)),
                           fresh ? new_typed(s, kSymmetricSparse) : new_sized(s, kSymmetricSparse, 4, 4)};
         },
         [&](Session& s, const Matrices& m) { return s.fn().qxsmDenseQuad(m[0], s_of.data(), m[1], 0); }, last_of});
    EXPECT_EQ(requests, 7);  // sizing 3, work, closing 3
  }
}

TEST_P(FormsAllocationTest, forms_of_vectors_around_an_inverse) {
  Random random(4);
  const std::vector<double> x = random.vector(15);
  for (const Shape shape : kInvertible)
    for (const bool factored : {false, true})
      for (const std::int64_t p : {std::int64_t{3}, std::int64_t{0}}) {
        SCOPED_TRACE(name_of(shape));
        const auto prepare = [=](Session& s) {
          return Matrices{build(s, factored ? ready(shape) : Operand{shape}, known_of(shape, 5, 5))};
        };
        std::vector<double> r(9);
        const auto answer = [&](const Matrices&) { return r; };
        EXPECT_GE(survive({prepare,
                           [&](Session& s, const Matrices& m) {
                             return s.fn().qxsminvquadv(m[0], x.data(), r.data(), p, 23);
                           },
                           answer}),
                  factored ? 1 : 2);
        const bool work = shape.kind == SM_KIND_SYMMETRIC;
        EXPECT_GE(survive({prepare,
                           [&](Session&, const Matrices& m) {
                             return qxsminvbilin(m[0], x.data(), x.data(), r.data(), 3, p);
                           },
                           answer}),
                  (work ? 1 : 0) + (factored ? 0 : 1));
      }
}

TEST_P(FormsAllocationTest, forms_of_matrices_around_an_inverse) {
  for (const Shape middle : kInvertible)
    for (const Shape outer : kGeneralShapes)
      for (const Shape into : kSymmetricShapes)
        for (const bool factored : {false, true})
          for (const bool fresh : {false, true}) {
            SCOPED_TRACE(name_of_three(middle, outer, into));
            const std::int64_t requests =
                survive({[=](Session& s) {
                           return Matrices{build(s, factored ? ready(middle) : Operand{middle}, known_of(middle, 5, 5)),
                                           build(s, outer, known_of(outer, 3, 5)),
                                           fresh ? new_typed(s, into) : new_sized(s, into, 3, 3)};
                         },
                         [](Session& s, const Matrices& m) { return s.fn().qxsminvquad(m[0], m[1], m[2]); }, last_of});
            EXPECT_GE(requests, (factored ? 1 : 2) + (fresh ? 1 : 0));
          }
}

bool multiplies(Shape a, Shape b) {
  if (a.kind == SM_KIND_GENERAL) return b.kind != SM_KIND_SYMMETRIC;
  return a != kSymmetricColumns || b.kind != SM_KIND_GENERAL;
}

TEST_P(FormsAllocationTest, products_of_matrices) {
  for (const Shape left : kShapes)
    for (const Shape right : kShapes)
      for (const Shape into : kShapes) {
        const bool diagonal = left.kind == SM_KIND_DIAGONAL || right.kind == SM_KIND_DIAGONAL;
        if (!multiplies(left, right) || (into.kind == SM_KIND_DIAGONAL && !diagonal)) continue;
        SCOPED_TRACE(name_of_three(left, right, into));
        for (const bool fresh : {false, true}) {
          const std::int64_t requests =
              survive({[=](Session& s) {
                         return Matrices{build(s, left, known_of(left, 5, 5)), build(s, right, known_of(right, 5, 5)),
                                         fresh ? new_typed(s, into) : new_sized(s, into, 5, 5)};
                       },
                       [](Session&, const Matrices& m) { return qxsmmultm(m[0], m[1], m[2], 0); }, last_of});
          EXPECT_GE(requests, fresh || is_sparse(into) ? 1 : 0);
        }
      }
}

TEST_P(FormsAllocationTest, a_product_of_more_entries_than_a_slab_has_nodes) {
  for (const Shape shape : {kGeneralSparse, kGeneralRows}) {
    const std::int64_t requests =
        survive({[=](Session& s) {
                   const Known ones = Known::full(std::vector<std::vector<double>>(25, std::vector<double>(25, 1.0)));
                   return Matrices{build(s, shape, ones), build(s, shape, ones), new_sized(s, kGeneralSparse, 25, 25)};
                 },
                 [](Session&, const Matrices& m) { return qxsmmultm(m[0], m[1], m[2], 0); }, last_of});
    EXPECT_GE(requests, 4);  // sizing 3, and a second slab of 500 nodes
  }
}

// Calls again and again leave no record, block or pool behind.
TEST_P(FormsAllocationTest, repeated_calls_hold_what_one_call_holds) {
  std::vector<double> x(32, 1.0);
  std::vector<double> r(32);
  for (const Shape middle : kInvertible)
    for (const Shape outer : kGeneralShapes)
      for (const Shape into : kSymmetricShapes) {
        Session& s = session();
        SmMatrix* a = build(s, ready(middle), known_of(middle, 4, 4));
        SmMatrix* b = build(s, outer, known_of(outer, 4, 4));
        SmMatrix* c = new_typed(s, into);
        const std::int64_t records = instance()->matrix_count;
        std::int64_t blocks = 0;
        std::int64_t pools = 0;
        for (int call = 0; call < 4; ++call) {
          qxsmmultm(a, b, c, 0);
          fn().qxsmquad(a, b, c, 0);
          fn().qxsmDenseQuad(b, x.data(), c, 0);
          fn().qxsminvquadv(a, x.data(), r.data(), 2, 22);
          qxsminvbilin(a, x.data(), x.data(), r.data(), 2, 2);
          fn().qxsmmults(a, 1.0);
          EXPECT_EQ(fn().qxsminvquad(a, b, c), SM_OK);
          if (call == 0) {
            blocks = host().live_blocks();
            pools = host().live_pools();
          }
        }
        EXPECT_EQ(host().live_blocks(), blocks);
        EXPECT_EQ(host().live_pools(), pools);
        EXPECT_EQ(instance()->matrix_count, records);
        for (SmMatrix* m : {a, b, c}) EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK);
      }
}

}  // namespace
}  // namespace sm::test
