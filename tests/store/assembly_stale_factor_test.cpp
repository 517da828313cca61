// Values that change under a factor or an inverse: nothing stale stays in use.
#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <string>
#include <vector>

#include "store/store_test.hpp"

namespace sm::test {
namespace {

struct Change {
  const char* name;
  std::function<SmStatus(const SmFunctionTable&, SmMatrix*)> make;
  double log_det_packed;    // afterwards, of the matrix that definite() builds
  double log_det_diagonal;  // NaN: not asked
};

const double kOneEach[] = {1.0, 0.0, 0.0};

// definite() is (4), (3, sqrt .75; sqrt .75, 1.25) or diag(4, 3, 1): log-determinant log 12.
const std::vector<Change>& changes() {
  static const std::vector<Change> all = {
      {"replacing", [](const SmFunctionTable& fn, SmMatrix* m) { return fn.qxsmassign(m, 0, 0, 0, 8.0); },
       std::log(24.0), std::log(24.0)},
      {"adding", [](const SmFunctionTable& fn, SmMatrix* m) { return fn.qxsmassign(m, 0, 0, 1, 4.0); }, std::log(24.0),
       std::log(24.0)},
      {"adding nothing", [](const SmFunctionTable& fn, SmMatrix* m) { return fn.qxsmassign(m, 0, 0, 1, 0.0); },
       std::log(12.0), std::log(12.0)},
      {"setting all", [](const SmFunctionTable& fn, SmMatrix* m) { return fn.qxsmsetee(m, 2.0); }, std::log(2.0),
       std::log(8.0)},
      {"an outer product",
       [](const SmFunctionTable& fn, SmMatrix* m) { return fn.qxsmzscp(m, kOneEach, nullptr, 3, 4.0); }, std::log(24.0),
       kNan},
  };
  return all;
}

class StaleFactor : public StoreTest {
 protected:
  void expect_log_det(SmMatrix* m, double expected) {
    double out = 0.0;
    EXPECT_EQ(fn().qxsmlogdet(m, &out), SM_OK);
    EXPECT_NEAR(out, expected, 1e-13);
  }
  // Runs every change on every matrix with a factor in the packed and diagonal formats.
  template <class Check>
  void for_each_change(Check check) {
    for (const Shape shape : kSquareFactored) {
      for (const Change& change : changes()) {
        const double expected = shape.kind == SM_KIND_DIAGONAL ? change.log_det_diagonal : change.log_det_packed;
        if (std::isnan(expected)) continue;
        SCOPED_TRACE(name_of(shape) + ", " + change.name);
        check(shape, change, expected);
      }
    }
  }
  // The generalized inverse in place of the factor, or of the values.
  void invert(SmMatrix* m) {
    const double b[] = {1.0, 2.0, 3.0};
    double x[3] = {};
    ASSERT_EQ(fn().qxsmsoldirect(m, b, x, 1), SM_OK);
    ASSERT_EQ(m->state, SM_STATE_INVERTED);
  }
};

TEST_P(StaleFactor, a_separate_factor_goes_back_and_the_matrix_is_just_closed) {
  for_each_change([this](Shape shape, const Change& change, double expected) {
    SmMatrix* m = definite(shape);
    const std::int64_t blocks = host().live_blocks();
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    ASSERT_EQ(m->state, SM_STATE_FACTORED);
    expect_log_det(m, std::log(12.0));
    EXPECT_EQ(host().live_blocks(), blocks + 1);
    ASSERT_EQ(change.make(fn(), m), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(m->dense_factor, nullptr);
    EXPECT_EQ(host().live_blocks(), blocks);
    expect_voided(m);
    expect_log_det(m, expected);
    EXPECT_EQ(m->state, SM_STATE_FACTORED);
  });
}

TEST_P(StaleFactor, a_separate_inverse_goes_back_and_the_matrix_is_just_closed) {
  for_each_change([this](Shape shape, const Change& change, double expected) {
    if (shape.kind == SM_KIND_DIAGONAL) return;  // the one-call solve does not invert it
    SmMatrix* m = definite(shape);
    const std::int64_t blocks = host().live_blocks();
    ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
    invert(m);
    ASSERT_NE(m->dense_factor, nullptr);
    ASSERT_EQ(change.make(fn(), m), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_CLOSED);
    EXPECT_EQ(m->dense_factor, nullptr);
    EXPECT_EQ(host().live_blocks(), blocks);
    expect_voided(m);
    expect_log_det(m, expected);
  });
}

TEST_P(StaleFactor, a_matrix_factored_in_place_keeps_its_state_and_takes_the_change_as_it_is) {
  for_each_change([this](Shape shape, const Change& change, double) {
    SmMatrix* m = definite(shape);
    ASSERT_EQ(fn().qxsmfact(m, 1), SM_OK);
    ASSERT_EQ(m->dense_factor, nullptr);
    std::vector<double> expected(m->values, m->values + m->nnz);
    ASSERT_EQ(expected[0], 2.0);
    const std::string what = change.name;
    if (what == "replacing") expected[0] = 8.0;
    if (what == "adding" || what == "an outer product") expected[0] = 6.0;
    if (what == "setting all") expected.assign(expected.size(), 2.0);
    ASSERT_EQ(change.make(fn(), m), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_FACTORED);
    EXPECT_EQ(std::vector<double>(m->values, m->values + m->nnz), expected);
    expect_voided(m);
  });
}

TEST_P(StaleFactor, a_matrix_inverted_in_place_keeps_its_state) {
  for_each_change([this](Shape shape, const Change& change, double) {
    if (shape.kind == SM_KIND_DIAGONAL) return;
    SmMatrix* m = definite(shape);
    invert(m);
    ASSERT_EQ(m->dense_factor, nullptr);
    ASSERT_EQ(change.make(fn(), m), SM_OK);
    EXPECT_EQ(m->state, SM_STATE_INVERTED);
    expect_voided(m);
    EXPECT_EQ(fn().qxsmfact(m, 0), SM_INVERTED);
  });
}

TEST_P(StaleFactor, a_factored_sparse_matrix_set_to_one_value_is_factored_anew) {
  SmMatrix* m = definite(kSymmetricSparse);
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  expect_log_det(m, std::log(12.0));
  ASSERT_EQ(fn().qxsmsetee(m, 2.0), SM_OK);
  EXPECT_EQ(m->state, SM_STATE_SYMBOLIC);
  expect_voided(m);
  EXPECT_EQ(m->nnz, 4);
  for (std::int64_t k = 0; k < m->nnz; ++k) EXPECT_EQ(m->nz_values[k], 2.0);
  expect_log_det(m, std::log(4.0));  // (2) and (2, 2; 2, 2)
  EXPECT_EQ(m->state, SM_STATE_FACTORED);
  EXPECT_EQ(m->rank, 2);
}

TEST_P(StaleFactor, below_a_factor_setting_all_keeps_the_state) {
  SmMatrix* m = definite(kSymmetricSparse);
  const std::function<SmStatus(SmMatrix*)> steps[] = {qxsmmd, qxsmreorder, qxsmsymbfact};
  for (std::int32_t state = SM_STATE_CLOSED;; ++state) {
    ASSERT_EQ(m->state, state);
    m->rank = 3;
    m->log_det = 1.0;
    ASSERT_EQ(fn().qxsmsetee(m, 1.0 + state), SM_OK);
    EXPECT_EQ(m->state, state);
    expect_voided(m);
    for (std::int64_t k = 0; k < m->nnz; ++k) EXPECT_EQ(m->nz_values[k], 1.0 + state);
    if (state == SM_STATE_SYMBOLIC) break;
    ASSERT_EQ(steps[state - 1](m), SM_OK);
  }
  EXPECT_EQ(qxsmnumfact(m), SM_OK);
  EXPECT_EQ(m->rank, 2);
}

TEST_P(StaleFactor, a_factored_sparse_matrix_takes_no_entries) {
  SmMatrix* m = definite(kSymmetricSparse);
  ASSERT_EQ(fn().qxsmfact(m, 0), SM_OK);
  EXPECT_EQ(set(m, 0, 0, 9.0), SM_ALREADY_CLOSED);
  EXPECT_EQ(m->state, SM_STATE_FACTORED);
  EXPECT_EQ(m->rank, 3);
  expect_log_det(m, std::log(12.0));
}

INSTANTIATE_BOTH_HOSTS(StaleFactor);

}  // namespace
}  // namespace sm::test
