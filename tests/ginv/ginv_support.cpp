#include "ginv/ginv_support.hpp"

namespace sm::test {

Snapshot snapshot(SmMatrix* m) {
  const auto word = [](auto v) { return static_cast<std::uint64_t>(v); };
  Snapshot s{{word(m->kind), word(m->format), word(m->state), word(m->rows), word(m->cols), word(m->nnz), word(m->rank),
              word(m->definite), bits(m->log_det), bits(m->value_count), word(m->solver_word)},
             {m->pool, m->assembly_pool, m->tree, m->values, m->row_start, m->nz_values, m->work, m->perm}};
  if (m->kind == SM_KIND_NONE) return s;
  if (is_sparse(shape_of(m))) {
    for (const auto& [place, value] : entries(m)) {
      s.words.insert(s.words.end(), {word(place.first), word(place.second), bits(value)});
    }
  } else if (m->values) {
    for (const double* array : {m->values, m->dense_factor})
      if (array) {
        const auto stored = bits(array, static_cast<std::int64_t>(m->value_count));
        s.words.insert(s.words.end(), stored.begin(), stored.end());
      }
  }
  return s;
}

Reference generalized_inverse(const Dense& a, const Indices& order, double tolerance) {
  const Indices perm = order.empty() ? natural_order(a.rows()) : order;
  const DenseFactor f = factor_with_drops(reordered(a, perm), tolerance);
  EXPECT_TRUE(f.definite);
  Reference r{Dense(a.rows(), a.rows()), std::vector<bool>(at(a.rows())), f.rank, 0.0};
  for (std::int64_t k = 0; k < a.rows(); ++k) r.accepted[at(perm[at(k)])] = f.accepted[at(k)];
  const Dense block = principal(a, r.accepted);
  const Dense inv = inverse(block);
  r.log_det = static_cast<double>(log_determinant(block));
  for (std::int64_t i = 0, bi = 0; i < a.rows(); ++i) {
    if (!r.accepted[at(i)]) continue;
    for (std::int64_t j = 0, bj = 0; j < a.rows(); ++j)
      if (r.accepted[at(j)]) r.inverse(i, j) = inv(bi, bj++);
    ++bi;
  }
  return r;
}

Reference generalized_inverse_of(const SmMatrix* matrix, const Dense& a) {
  if (!is_sparse(shape_of(matrix))) return generalized_inverse(a);
  return generalized_inverse(a, words(matrix->perm, matrix->rows));
}

std::vector<Named> semidefinite_problems() {
  Random random(31);
  return {{"definite", positive_definite(grid(4, 3), random).dense()},
          {"dense definite", positive_definite(clique(9), random).dense()},
          {"repeated and zero rows", cross_product(random, 7, 3, 2).problem.dense()},
          {"mostly repeated", cross_product(random, 3, 8, 0).problem.dense()},
          {"order 1", from_rows({{4.0}})},
          {"one zero", from_rows({{0.0}})}};
}

}  // namespace sm::test
