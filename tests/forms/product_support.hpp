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

}  // namespace sm::test
