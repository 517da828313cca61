#include "store/filled.hpp"

#include <algorithm>

namespace sm::test {

Filled filled_with(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, const Nonzeros& elements) {
  SmMatrix* m = new_closed(session, shape, rows, cols, elements);
  const Known known(shape, rows, cols, elements);
  Nonzeros stored = known.elements(shape);
  for (std::int64_t r = 0; r < rows; ++r)
    for (std::int64_t c = 0; c < cols; ++c)
      if (has_place(shape, r, c) && (!is_sparse(shape) || (shape.kind == SM_KIND_SYMMETRIC && r == c))) {
        stored.try_emplace({r, c}, 0.0);
      }
  EXPECT_EQ(m->nnz, static_cast<std::int64_t>(stored.size()));
  EXPECT_EQ(m->state, SM_STATE_CLOSED);
  return {shape, m, known.dense(), stored};
}

Filled filled(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, Random& random) {
  return filled_with(session, shape, rows, cols, random_known(random, shape, rows, cols).elements(shape));
}

Filled filled_definite(Session& session, Shape shape, std::int64_t n, Random& random) {
  return filled(session, shape, n, n, random);
}

std::vector<double> row_from(Shape shape, const Dense& a, std::int64_t row, std::int64_t start) {
  std::vector<double> out(at(a.cols()), 0.0);
  const std::int64_t s = std::max<std::int64_t>(start, 0);
  const auto element = [&](std::int64_t c) { return static_cast<double>(a(row, c)); };
  for (std::int64_t c = 0; c < a.cols(); ++c) {
    if (shape.kind == SM_KIND_DIAGONAL) {
      if (c == row) out[at(c)] = element(c);
    } else if (shape.kind == SM_KIND_GENERAL) {
      if (c >= s) out[at(shape.format == SM_FORMAT_ROWS ? c - s : c)] = element(c);
    } else if (shape.format == SM_FORMAT_COLUMNS) {
      if (c > row) out[at(c)] = element(c);
      if (c >= s && c <= row) out[at(c - s)] = element(c);
    } else if (c >= row || c >= s) {
      out[at(c)] = element(c);
    }
  }
  return out;
}

}  // namespace sm::test
