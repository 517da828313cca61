#include "store/store_test.hpp"

#include <cmath>
#include <cstring>

// The large sizes that are asked for here are refused by malloc; the sanitizer would end the program instead.
extern "C" __attribute__((visibility("default"))) const char* __asan_default_options();
extern "C" const char* __asan_default_options() { return "allocator_may_return_null=1"; }

namespace sm::test {

std::string name_of(Shape shape) {
  const char* kind = shape.kind == SM_KIND_GENERAL ? "general " : "symmetric ";
  if (shape.kind == SM_KIND_DIAGONAL) kind = "diagonal ";
  return kind + std::to_string(shape.format);
}

bool is_sparse(Shape shape) { return shape.format == SM_FORMAT_SPARSE; }

namespace {

// Calls visit(row, col) for every slot in storage order, until it answers true; the number of slots before that.
template <class Visit>
std::int64_t lay_out(Shape shape, std::int64_t rows, std::int64_t cols, Visit visit) {
  const bool by_cols = shape.format == SM_FORMAT_COLUMNS;
  std::int64_t slot = 0;
  for (std::int64_t outer = 0; outer < (by_cols ? cols : rows); ++outer) {
    for (std::int64_t inner = 0; inner < (by_cols ? rows : cols); ++inner) {
      const std::int64_t r = by_cols ? inner : outer;
      const std::int64_t c = by_cols ? outer : inner;
      if (shape.kind == SM_KIND_SYMMETRIC && r > c) continue;
      if (shape.kind == SM_KIND_DIAGONAL && r != c) continue;
      if (visit(r, c)) return slot;
      ++slot;
    }
  }
  return slot;
}

}  // namespace

std::int64_t slots(Shape shape, std::int64_t rows, std::int64_t cols) {
  return lay_out(shape, rows, cols, [](std::int64_t, std::int64_t) { return false; });
}

std::int64_t slot_of(Shape shape, std::int64_t rows, std::int64_t cols, std::int64_t row, std::int64_t col) {
  bool found = false;
  const std::int64_t slot =
      lay_out(shape, rows, cols, [&](std::int64_t r, std::int64_t c) { return found = r == row && c == col; });
  return found ? slot : -1;
}

Nonzeros walk(SmMatrix* matrix, std::uint64_t* roots) {
  Nonzeros out;
  for (std::int64_t row = 0; row < matrix->rows; ++row) {
    std::int64_t last = -1;
    for (const NonzeroNode* node = matrix->tree->first(matrix->tree, &roots[row]); node; node = sm_node_next(node)) {
      EXPECT_GT(node->key, last) << "row " << row;
      last = node->key;
      out[{row, node->key}] = node->value;
    }
  }
  EXPECT_EQ(static_cast<std::int64_t>(out.size()), matrix->nnz);
  return out;
}

Nonzeros compressed(const SmMatrix* matrix) {
  Nonzeros out;
  if (!matrix->row_start || !matrix->col_index || !matrix->nz_values) {
    ADD_FAILURE() << "no compressed rows";
    return out;
  }
  EXPECT_EQ(matrix->row_start[0], 0);
  for (std::int64_t row = 0; row < matrix->rows; ++row) {
    const std::int64_t begin = matrix->row_start[row];
    const std::int64_t end = matrix->row_start[row + 1];
    EXPECT_LT(begin, end) << "row " << row << " has no diagonal";
    if (begin >= end) return out;
    EXPECT_EQ(matrix->col_index[begin], row) << "the diagonal comes first";
    for (std::int64_t p = begin; p < end; ++p) {
      if (p > begin) {
        EXPECT_GT(matrix->col_index[p], matrix->col_index[p - 1]) << "row " << row;
      }
      out[{row, matrix->col_index[p]}] = matrix->nz_values[p];
    }
  }
  EXPECT_EQ(matrix->row_start[matrix->rows], matrix->nnz);
  EXPECT_EQ(static_cast<std::int64_t>(out.size()), matrix->nnz);
  return out;
}

std::uint64_t bits(double value) {
  std::uint64_t out = 0;
  std::memcpy(&out, &value, sizeof out);
  return out;
}

SmMatrix* StoreTest::typed(Shape shape) {
  SmMatrix* matrix = nullptr;
  EXPECT_EQ(fn().qxsmnew(instance(), &matrix, shape.kind, shape.format), SM_OK) << name_of(shape);
  return matrix;
}

SmMatrix* StoreTest::reset_record() {
  SmMatrix* matrix = typed(kGeneralRows);
  EXPECT_EQ(fn().qxsmdelete(matrix), SM_OK);
  return matrix;
}

SmMatrix* StoreTest::definite(Shape shape) {
  SmMatrix* m = square(shape, 3);
  const bool off_diagonal = shape.kind != SM_KIND_DIAGONAL;
  EXPECT_EQ(set(m, 0, 0, 4.0), SM_OK);
  EXPECT_EQ(set(m, 1, 1, 3.0), SM_OK);
  EXPECT_EQ(set(m, 2, 2, off_diagonal ? 1.25 : 1.0), SM_OK);
  if (off_diagonal) {
    EXPECT_EQ(set(m, 1, 2, std::sqrt(0.75)), SM_OK);
  }
  EXPECT_EQ(fn().qxsmclose(m, 0.0), SM_OK);
  return m;
}

double StoreTest::at(SmMatrix* m, std::int64_t row, std::int64_t col) {
  double value = -12345.0;
  EXPECT_EQ(fn().qxsmget(m, row, col, &value), SM_OK) << row << ' ' << col;
  return value;
}

SmStatus StoreTest::refused_at(SmMatrix* m, std::int64_t row, std::int64_t col) {
  double value = 0.0;
  const SmStatus status = fn().qxsmget(m, row, col, &value);
  EXPECT_TRUE(is_missing(value)) << row << ' ' << col;
  return status;
}

void expect_voided(const SmMatrix* m) {
  EXPECT_EQ(m->rank, 0);
  EXPECT_TRUE(is_missing(m->log_det));
}

}  // namespace sm::test
