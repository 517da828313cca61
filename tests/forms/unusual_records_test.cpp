// Every operation on records that are not as an operation leaves them: without compressed rows, without a pool, in a
// format that the kind does not know, and with a caller's array.
#include "forms/forms_support.hpp"

namespace sm::test {
namespace {

class UnusualRecordsTest : public FormsTest {
 protected:
  SmMatrix* tied(std::vector<double>& data, std::int64_t rows, std::int64_t cols, Shape shape) {
    return new_tied(session(), shape, data, rows, cols);
  }
  static inline const Known kA = Known::full({{4.0, 1.0}, {1.0, 2.0}});
  static inline const Known kX = Known::full({{1.0, 0.0}, {1.0, 1.0}});
  std::vector<double> x_ = std::vector<double>(16, 1.0);
};
INSTANTIATE_BOTH_HOSTS(UnusualRecordsTest);

TEST_P(UnusualRecordsTest, a_sparse_matrix_that_says_closed_but_has_no_rows_answers_113) {
  SmMatrix* m = sized(kSymmetricSparse, 4);
  ASSERT_EQ(fn().qxsmresize(m, 4, 3), SM_NOT_SQUARE);
  ASSERT_EQ(m->state, SM_STATE_CLOSED);
  ASSERT_EQ(m->row_start, nullptr);
  ASSERT_GT(m->nnz, 0);
  Random random(1);
  SmMatrix* square = build(kSymmetricRows, random_known(random, kSymmetricRows, 4, 4));
  SmMatrix* r = build(kSymmetricRows, kA);
  Output y(16);
  EXPECT_EQ(qxsmmultv(m, x_.data(), y.data(), 0, 3, 0, 3, 1, 0), SM_NOT_CLOSED);
  EXPECT_EQ(qxsmvmult(x_.data(), m, y.data(), 1, 0), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmquadv(m, x_.data(), y.data(), 2, 0, 3), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmbilin(m, x_.data(), x_.data(), y.data(), 2, 2), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmquad(m, square, r, 0), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmquad(square, m, r, 0), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmDenseQuad(m, x_.data(), r, 0), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsminvquadv(m, x_.data(), y.data(), 2, 22), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsminvquad(m, square, r), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsminvquad(square, m, r), SM_NOT_CLOSED);
  EXPECT_EQ(qxsminvbilin(m, x_.data(), x_.data(), y.data(), 2, 2), SM_NOT_CLOSED);
  EXPECT_EQ(fn().qxsmmults(m, 2.0), SM_NOT_CLOSED);
  EXPECT_EQ(qxsmmultm(m, square, r, 0), SM_NOT_CLOSED);
  EXPECT_EQ(qxsmmultm(square, m, r, 0), SM_NOT_CLOSED);
  EXPECT_TRUE(y.untouched());
  EXPECT_TRUE(same(read(r), kA));
}

TEST_P(UnusualRecordsTest, a_tied_matrix_without_a_pool_gets_one_for_the_work) {
  for (const Shape shape : kPacked) {
    std::vector<double> a{4.0, 1.0, 2.0};  // of order 2 both layouts agree
    Output r(3);
    EXPECT_EQ(fn().qxsminvquadv(tied(a, 2, 2, shape), kX.by_rows().data(), r.data(), 2, 22), SM_OK);
    EXPECT_NEAR(r.values()[0], 2.0 / 7.0, 1e-15);
    Output t(4);
    EXPECT_EQ(qxsminvbilin(tied(a, 2, 2, shape), kX.by_rows().data(), kX.by_rows().data(), t.data(), 2, 2), SM_OK);
    EXPECT_NEAR(t.values()[0], 2.0 / 7.0, 1e-15);
    for (const Shape outer : kGeneralShapes) {
      SmMatrix* c = typed(kSymmetricRows);
      EXPECT_EQ(fn().qxsmquad(tied(a, 2, 2, shape), build(outer, kX), c, 0), SM_OK);
      EXPECT_TRUE(same(read(c), Known::full({{4.0, 5.0}, {5.0, 8.0}})));
      EXPECT_EQ(fn().qxsminvquad(tied(a, 2, 2, shape), build(outer, kX), c), SM_OK);
      EXPECT_NEAR(read(c)(0, 0), 2.0 / 7.0, 1e-15);
    }
    for (const Shape right : {kSymmetricSparse, kSymmetricRows, kDiagonalRows}) {
      SmMatrix* c = typed(kGeneralRows);
      Known b(2, 2);
      b.set(0, 0, 3.0);
      b.set(1, 1, 5.0);
      EXPECT_EQ(qxsmmultm(tied(a, 2, 2, shape), build(right, b), c, 0), SM_OK);
      EXPECT_TRUE(same(read(c), Known::full({{12.0, 5.0}, {3.0, 10.0}})));
    }
    EXPECT_TRUE(same(a, {4.0, 1.0, 2.0}));
  }
  std::vector<double> d{4.0, 16.0};
  Output r(3);
  EXPECT_EQ(fn().qxsminvquadv(tied(d, 2, 2, kDiagonalRows), kX.by_rows().data(), r.data(), 2, 22), SM_OK);
  EXPECT_TRUE(same(r.values(), {0.25, 0.25, 0.3125}));
}

TEST_P(UnusualRecordsTest, without_memory_for_a_pool_a_tied_matrix_answers_101) {
  std::vector<double> a{4.0, 1.0, 2.0};
  Output r(4);
  for (const std::int64_t k : {0, 1}) {
    SmMatrix* m = tied(a, 2, 2, kSymmetricRows);
    host().fail_request(k, true);
    EXPECT_EQ(fn().qxsminvquadv(m, x_.data(), r.data(), 2, 22), SM_NO_MEMORY);
    EXPECT_GT(host().stop_failing(), 0);
    EXPECT_TRUE(r.untouched());
    SmMatrix* b = tied(a, 2, 2, kSymmetricRows);
    SmMatrix* x = build(kGeneralSparse, kX);
    SmMatrix* c = sized(kSymmetricRows, 2);
    host().fail_request(k, true);
    EXPECT_EQ(fn().qxsmquad(b, x, c, 0), SM_NO_MEMORY);
    EXPECT_GT(host().stop_failing(), 0);
  }
}

TEST_P(UnusualRecordsTest, a_result_with_a_caller_s_array_is_written_there) {
  SmMatrix* a = build(kSymmetricRows, kA);
  SmMatrix* square = build(kGeneralRows, kX);
  const std::vector<double> form{4.0, 5.0, 8.0};
  for (const bool pool : {false, true})
    for (const Shape outer : kGeneralShapes)
      for (const Shape shape : kPacked)
        for (const std::int32_t keep : {0, 1}) {
          SCOPED_TRACE(name_of(outer) + " into " + name_of(shape));
          std::vector<double> data(3, 0.0);
          SmMatrix* r = pool ? sized(shape, 1) : tied(data, 2, 2, shape);
          if (pool) {
            ASSERT_EQ(qxsmtie(r, data.data(), 2, 2, shape.kind, shape.format), SM_OK);
          }
          ASSERT_EQ(fn().qxsmquad(a, build(outer, kX), r, keep), SM_OK);
          EXPECT_TRUE(same(data, form));
          ASSERT_EQ(fn().qxsminvquad(a, build(outer, kX), r), SM_OK);
          EXPECT_NEAR(data[0], 2.0 / 7.0, 1e-15);
          EXPECT_NEAR(data[2], 4.0 / 7.0, 1e-15);
        }
  std::vector<double> data(4, 100.0);
  ASSERT_EQ(qxsmmultm(square, square, tied(data, 2, 2, kGeneralRows), 1), SM_OK);
  EXPECT_TRUE(same(data, {101.0, 100.0, 102.0, 101.0}));
  ASSERT_EQ(qxsmmultm(square, square, tied(data, 2, 2, kGeneralColumns), 0), SM_OK);
  EXPECT_TRUE(same(data, {1.0, 2.0, 0.0, 1.0}));
}

TEST_P(UnusualRecordsTest, a_format_that_the_kind_does_not_know_adds_nothing) {
  for (const Shape shape : {kGeneralRows, kSymmetricRows}) {
    SmMatrix* m = build(shape, kA);
    m->format = 24;
    Output y(2);
    EXPECT_EQ(qxsmmultv(m, x_.data(), y.data(), 0, 1, 0, 1, 1, 0), SM_OK) << name_of(shape);
    EXPECT_TRUE(same(y.values(), {0.0, 0.0}));
    Output z(2);
    EXPECT_EQ(qxsmvmult(x_.data(), m, z.data(), 1, 0), SM_OK) << name_of(shape);
    EXPECT_TRUE(same(z.values(), {0.0, 0.0}));
    Output kept(2);
    EXPECT_EQ(qxsmmultv(m, x_.data(), kept.data(), 0, 1, 0, 1, 1, 1), SM_OK) << name_of(shape);
    EXPECT_TRUE(kept.untouched());
    Output r(3);
    EXPECT_EQ(fn().qxsmquadv(m, x_.data(), r.data(), 2, 0, 1), SM_OK) << name_of(shape);
    SmMatrix* c = typed(kGeneralRows);
    if (shape.kind == SM_KIND_GENERAL) {
      EXPECT_EQ(qxsmmultm(m, build(kGeneralRows, kX), c, 0), SM_UNAVAILABLE);
      EXPECT_EQ(fn().qxsmquad(build(kSymmetricRows, kA), m, typed(kSymmetricRows), 0), SM_UNAVAILABLE);
    } else {
      Output s(4);
      EXPECT_EQ(fn().qxsmbilin(m, x_.data(), x_.data(), s.data(), 2, 2), SM_OK);
      EXPECT_TRUE(same(s.values(), std::vector<double>(4, 0.0)));
    }
    m->format = shape.format;
  }
}

TEST_P(UnusualRecordsTest, a_diagonal_matrix_is_the_same_in_every_format) {
  Known d(2, 2);
  d.set(0, 0, 4.0);
  d.set(1, 1, 16.0);
  SmMatrix* m = build(kDiagonalRows, d);
  m->format = 21;
  Output y(2);
  EXPECT_EQ(qxsmmultv(m, x_.data(), y.data(), 0, 1, 0, 1, 1, 0), SM_OK);
  EXPECT_TRUE(same(y.values(), {4.0, 16.0}));
  EXPECT_EQ(qxsmvmult(x_.data(), m, y.data(), 1, 0), SM_OK);
  EXPECT_TRUE(same(y.values(), {4.0, 16.0}));
  EXPECT_EQ(fn().qxsmquadv(m, x_.data(), y.data(), 1, 0, 1), SM_OK);
  EXPECT_EQ(y.values()[0], 20.0);
  EXPECT_EQ(fn().qxsmbilin(m, x_.data(), x_.data(), y.data(), 1, 1), SM_OK);
  EXPECT_EQ(y.values()[0], 20.0);
  EXPECT_EQ(fn().qxsmmults(m, 0.5), SM_OK);
  EXPECT_TRUE(same(doubles(m->values, 2), {2.0, 8.0}));
  m->format = SM_FORMAT_ROWS;
}

}  // namespace
}  // namespace sm::test
