// What the suites of matrix products share.
#pragma once

#include "forms/forms_support.hpp"

namespace sm::test {

// Pairs that the product serves.
inline bool multiplies(Shape a, Shape b) {
  if (a.kind == SM_KIND_GENERAL) return b.kind != SM_KIND_SYMMETRIC;
  if (a == kSymmetricColumns) return b.kind != SM_KIND_GENERAL;
  return true;
}

// What a result of that kind takes of a product.
inline Known taken(Shape c, const Known& product) {
  if (c.kind == SM_KIND_SYMMETRIC) return upper_part(product);
  if (c.kind == SM_KIND_DIAGONAL) return diagonal_part(product);
  return product;
}

// Sized and entered, but not closed.
inline SmMatrix* entered_open(Session& session, Shape shape, const Known& known) {
  SmMatrix* m = new_sized(session, shape, known.rows(), known.cols());
  for (std::int64_t r = 0; r < known.rows(); ++r)
    for (std::int64_t c = 0; c < known.cols(); ++c) {
      if (!known.has(r, c) || (shape.kind == SM_KIND_SYMMETRIC && c < r)) continue;
      EXPECT_EQ(session.fn().qxsmassign(m, r, c, 0, known(r, c)), SM_OK);
    }
  return m;
}

}  // namespace sm::test
