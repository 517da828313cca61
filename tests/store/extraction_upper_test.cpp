// The stored part of a symmetric matrix: qxsmUpperRow and qxsmUpperSub.
#include <gtest/gtest.h>

#include "cholesky/cholesky_support.hpp"
#include "store/filled.hpp"

namespace sm::test {
namespace {

struct Block {
  std::int64_t r0, r1, c0, c1;
  std::int64_t size() const { return (r1 - r0 + 1) * (c1 - c0 + 1); }
};

class UpperExtraction : public ModuleTest {
 protected:
  static SmStatus block(SmMatrix* m, double* out, const Block& b) {
    return qxsmUpperSub(m, out, b.r0, b.r1, b.c0, b.c1);
  }

  // Every stored element (i, j) of the block at its place; one with i >= c0 and j > i also where a row j - c0 and a
  // column i - r0 lead to, when that is inside.
  static std::vector<double> expected_block(const Filled& a, const Block& b) {
    const std::int64_t w = b.c1 - b.c0 + 1;
    std::vector<double> out(at(b.size()), 0.0);
    for (const auto& [place, value] : a.stored) {  // by row, then by column
      const auto [i, j] = place;
      if (i < b.r0 || i > b.r1 || j < b.c0 || j > b.c1) continue;
      out[at((i - b.r0) * w + (j - b.c0))] = value;
      const std::int64_t mirror = (j - b.c0) * w + (i - b.r0);
      if (i >= b.c0 && j > i && mirror < b.size()) out[at(mirror)] = value;
    }
    return out;
  }
  void expect_every_block(const Filled& a) {
    const std::int64_t n = a.dense.rows();
    for (Block b{}; b.r0 < n; ++b.r0)
      for (b.r1 = b.r0; b.r1 < n; ++b.r1)
        for (b.c0 = b.r0; b.c0 < n; ++b.c0)
          for (b.c1 = b.c0; b.c1 < n; ++b.c1) {
            Output out(b.size());
            EXPECT_EQ(block(a.matrix, out.data(), b), SM_OK);
            EXPECT_EQ(out.values(), expected_block(a, b)) << b.r0 << ".." << b.r1 << ", " << b.c0 << ".." << b.c1;
          }
  }
};

TEST_P(UpperExtraction, a_row_holds_what_is_stored_of_it_at_its_own_places) {
  Random random(1);
  for (const Shape shape : {kSymmetricSparse, kSymmetricRows}) {
    for (const std::int64_t n : {1, 2, 5, 21}) {
      const Filled a = filled(session(), shape, n, n, random);
      for (std::int64_t r = 0; r < n; ++r) {
        std::vector<double> expected(at(n), 0.0);
        for (std::int64_t c = r; c < n; ++c) expected[at(c)] = static_cast<double>(a.dense(r, c));
        Output out(n);
        EXPECT_EQ(qxsmUpperRow(a.matrix, r, out.data()), SM_OK);
        EXPECT_EQ(out.values(), expected) << name_of(shape) << ", row " << r << " of " << n;
      }
    }
  }
}

TEST_P(UpperExtraction, rows_and_blocks_of_an_ordered_matrix_are_in_the_callers_order) {
  Random random(2);
  const Filled a = filled_definite(session(), kSymmetricSparse, 5, random);
  ASSERT_EQ(bring_to(a.matrix, SM_STATE_ORDERED), SM_OK);
  Output out(5);
  EXPECT_EQ(qxsmUpperRow(a.matrix, 1, out.data()), SM_OK);
  for (std::int64_t c = 1; c < 5; ++c) EXPECT_EQ(out.values()[at(c)], static_cast<double>(a.dense(1, c)));
  EXPECT_EQ(out.values()[0], 0.0);
  expect_every_block(a);
}

TEST_P(UpperExtraction, a_row_of_a_matrix_that_is_not_readable_leaves_the_output) {
  Output out(3);
  EXPECT_EQ(qxsmUpperRow(new_sized(session(), kGeneralSparse, 3, 3), 9, out.data()), SM_OK) << "empty";
  EXPECT_EQ(qxsmUpperRow(new_sized(session(), kSymmetricSparse, 0, 0), 9, out.data()), SM_OK) << "empty";
  EXPECT_EQ(qxsmUpperRow(new_untyped(session()), 0, out.data()), SM_OK) << "of kind none it is empty too";
  EXPECT_EQ(qxsmUpperRow(new_untyped_with_an_entry(session()), 9, out.data()), SM_UNTYPED);
  for (const Shape shape : kShapes) {
    const Unclosed open = unclosed(session(), shape);
    EXPECT_EQ(qxsmUpperRow(open.matrix, 9, out.data()), SM_NOT_CLOSED) << name_of(shape);
  }
  EXPECT_EQ(qxsmUpperRow(new_without_rows(session(), 3), 0, out.data()), SM_NOT_CLOSED);
  EXPECT_TRUE(out.untouched());
}

TEST_P(UpperExtraction, a_row_is_cleared_before_kind_format_order_and_index_are_looked_at) {
  Random random(3);
  for (const Shape shape : {kGeneralColumns, kGeneralRows, kDiagonalColumns, kDiagonalRows, kSymmetricColumns}) {
    SmMatrix* m = filled(session(), shape, 4, 4, random).matrix;
    for (const std::int64_t r : {0, 3, -1, 4}) {
      Output out(4);
      EXPECT_EQ(qxsmUpperRow(m, r, out.data()), SM_UNAVAILABLE) << name_of(shape) << ", row " << r;
      EXPECT_TRUE(out.cleared()) << name_of(shape);
    }
  }
  SmMatrix* wide = filled_with(session(), kGeneralSparse, 2, 4, {{{1, 3}, 7.0}}).matrix;
  Output row(4);
  EXPECT_EQ(qxsmUpperRow(wide, 1, row.data()), SM_UNAVAILABLE);
  EXPECT_TRUE(row.cleared());
}

TEST_P(UpperExtraction, a_row_outside_answers_117_in_both_formats_and_behind_the_order) {
  Random random(4);
  for (const Shape shape : {kSymmetricSparse, kSymmetricRows}) {
    SmMatrix* m = filled_definite(session(), shape, 4, random).matrix;
    for (const std::int64_t bad : {std::int64_t{-1}, std::int64_t{4}, kHuge, -kHuge - 1}) {
      Output out(4);
      EXPECT_EQ(qxsmUpperRow(m, bad, out.data()), SM_OUTSIDE) << name_of(shape) << ", row " << bad;
      EXPECT_TRUE(out.cleared());
    }
    if (!is_sparse(shape)) continue;
    for (const std::int32_t state : {SM_STATE_REORDERED, SM_STATE_SYMBOLIC, SM_STATE_FACTORED}) {
      ASSERT_EQ(bring_to(m, state), SM_OK);
      for (const std::int64_t r : {1, 4}) {
        Output out(4);
        EXPECT_EQ(qxsmUpperRow(m, r, out.data()), SM_REORDERED);
        EXPECT_TRUE(out.cleared());
      }
    }
  }
}

TEST_P(UpperExtraction, every_block_holds_its_stored_elements_and_their_mirrors) {
  Random random(5);
  for (const std::int64_t n : {1, 2, 4, 7}) {
    expect_every_block(filled(session(), kSymmetricSparse, n, n, random));
    expect_every_block(filled_definite(session(), kSymmetricSparse, n, random));
  }
  Nonzeros full;
  for (std::int64_t i = 0; i < 7; ++i)
    for (std::int64_t j = i; j < 7; ++j) full[{i, j}] = static_cast<double>(10 * i + j + 1);
  expect_every_block(filled_with(session(), kSymmetricSparse, 7, 7, full));
}

TEST_P(UpperExtraction, a_block_on_the_diagonal_is_a_full_symmetric_one) {
  Random random(6);
  const Filled a = filled(session(), kSymmetricSparse, 9, 9, random);
  for (std::int64_t first = 0; first < 9; ++first)
    for (std::int64_t last = first; last < 9; ++last) {
      std::vector<double> expected;
      for (std::int64_t i = first; i <= last; ++i)
        for (std::int64_t j = first; j <= last; ++j) expected.push_back(static_cast<double>(a.dense(i, j)));
      Output out(static_cast<std::int64_t>(expected.size()));
      EXPECT_EQ(qxsmUpperSub(a.matrix, out.data(), first, last, first, last), SM_OK);
      EXPECT_EQ(out.values(), expected) << first << ".." << last;
    }
}

TEST_P(UpperExtraction, a_mirror_is_placed_by_counting_from_the_beginning_and_left_out_behind_the_end) {
  // Rows 0 .. 2 and columns 1 .. 3 of {1, 2, 3, 4; 5, 6, 7; 8, 9; 10}: the mirror of (1, 2) comes to row 1, column 1,
  // where (1, 2) itself is; that of (1, 3) to row 2, column 1, and gives way to (2, 2); that of (2, 3) to row 2, column
  // 2, where (2, 3) is.
  Nonzeros full;
  for (std::int64_t i = 0, k = 1; i < 4; ++i)
    for (std::int64_t j = i; j < 4; ++j) full[{i, j}] = static_cast<double>(k++);
  SmMatrix* m = filled_with(session(), kSymmetricSparse, 4, 4, full).matrix;
  Output out(9);
  EXPECT_EQ(qxsmUpperSub(m, out.data(), 0, 2, 1, 3), SM_OK);
  EXPECT_EQ(out.values(), (std::vector<double>{2.0, 3.0, 4.0, 5.0, 6.0, 7.0, 0.0, 8.0, 9.0}));
  // One row of two: the mirror of (2, 3) would be the place 1 * 2 + 0, behind the end.
  Output row(2);
  EXPECT_EQ(qxsmUpperSub(m, row.data(), 2, 2, 2, 3), SM_OK);
  EXPECT_EQ(row.values(), (std::vector<double>{8.0, 9.0}));
  Output column(4);
  EXPECT_EQ(qxsmUpperSub(m, column.data(), 0, 3, 3, 3), SM_OK);
  EXPECT_EQ(column.values(), (std::vector<double>{4.0, 7.0, 9.0, 10.0}));
}

TEST_P(UpperExtraction, a_block_is_cleared_before_every_check) {
  const Block b{0, 1, 1, 3};
  const auto expect_cleared = [&](SmMatrix* m, const Block& wanted, SmStatus status) {
    Output out(wanted.size());
    EXPECT_EQ(block(m, out.data(), wanted), status);
    EXPECT_TRUE(out.cleared());
  };
  expect_cleared(new_untyped(session()), b, SM_OK);
  expect_cleared(new_sized(session(), kSymmetricSparse, 0, 0), b, SM_OK);
  expect_cleared(new_sized(session(), kGeneralSparse, 2, 2), b, SM_OK);
  expect_cleared(new_untyped_with_an_entry(session()), b, SM_UNTYPED);
  for (const Shape shape : kShapes) {
    const Unclosed open = unclosed(session(), shape);
    expect_cleared(open.matrix, {0, 8, 0, 8}, SM_NOT_CLOSED);
  }
  expect_cleared(new_without_rows(session(), 3), b, SM_NOT_CLOSED);
  Random random(7);
  for (const Shape shape : kShapes) {
    if (shape.kind == SM_KIND_SYMMETRIC && is_sparse(shape)) continue;
    SmMatrix* m = filled(session(), shape, 4, 4, random).matrix;
    ASSERT_GT(m->nnz, 0);
    expect_cleared(m, b, SM_UNAVAILABLE);
    expect_cleared(m, {0, 8, 0, 8}, SM_UNAVAILABLE);
  }
  for (const std::int32_t state : {SM_STATE_REORDERED, SM_STATE_SYMBOLIC, SM_STATE_FACTORED}) {
    SmMatrix* m = filled_definite(session(), kSymmetricSparse, 4, random).matrix;
    ASSERT_EQ(bring_to(m, state), SM_OK);
    expect_cleared(m, b, SM_REORDERED);
    expect_cleared(m, {0, 8, 0, 8}, SM_REORDERED);
  }
}

TEST_P(UpperExtraction, a_block_outside_or_turned_around_or_below_the_diagonal_answers_117) {
  Random random(8);
  SmMatrix* m = filled_definite(session(), kSymmetricSparse, 4, random).matrix;
  for (const Block& b : {Block{-1, 1, 1, 2}, Block{0, 4, 1, 2}, Block{0, 1, 1, 4}, Block{4, 4, 4, 4},
                         Block{-1, -1, 0, 3}, Block{2, 3, 1, 3}, Block{3, 3, 0, 0}, Block{kHuge, kHuge, 0, 0},
                         Block{0, 0, kHuge, kHuge}, Block{-kHuge - 1, -kHuge - 1, 0, 1}}) {
    Output out(b.size());
    EXPECT_EQ(block(m, out.data(), b), SM_OUTSIDE) << b.r0 << ".." << b.r1 << ", " << b.c0 << ".." << b.c1;
    EXPECT_TRUE(out.cleared());
  }
}

TEST_P(UpperExtraction, an_empty_block_has_nothing_to_clear) {
  Random random(9);
  SmMatrix* m = filled_definite(session(), kSymmetricSparse, 4, random).matrix;
  Output out(16);
  for (const Block& b : {Block{2, 1, 2, 3}, Block{0, 1, 3, 2}, Block{3, 1, 3, 1}, Block{3, 0, 3, 0}, Block{0, -5, 0, 2},
                         Block{kHuge, -kHuge, kHuge, -kHuge}}) {
    EXPECT_EQ(block(m, out.data(), b), SM_OUTSIDE) << b.r0 << ".." << b.r1 << ", " << b.c0 << ".." << b.c1;
    EXPECT_EQ(block(new_untyped(session()), out.data(), b), SM_OK);
  }
  EXPECT_TRUE(out.untouched());
}

INSTANTIATE_BOTH_HOSTS(UpperExtraction);

}  // namespace
}  // namespace sm::test
