// Matrices of every shape from given elements, records of every odd sort, and what a matrix stores, read without the
// module.
#pragma once

#include <map>
#include <utility>
#include <vector>

#include "support/dense_reference.hpp"
#include "support/module_test.hpp"
#include "support/shapes.hpp"

namespace sm::test {

using Indices = std::vector<std::int64_t>;
// (row, col) -> value of what a matrix stores; of a symmetric one the upper triangle.
using Nonzeros = std::map<std::pair<std::int64_t, std::int64_t>, double>;

// A typed record without a size, and one of that size.
SmMatrix* new_typed(Session& session, Shape shape);
SmMatrix* new_sized(Session& session, Shape shape, std::int64_t rows, std::int64_t cols);
// With those of the elements that the shape has a place for; as entering them left it, and closed with nothing dropped.
SmMatrix* new_entered(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, const Nonzeros& elements);
SmMatrix* new_closed(Session& session, Shape shape, std::int64_t rows, std::int64_t cols, const Nonzeros& elements);
// The same from every element of `a` that is not 0, or that an array holds anyway.
SmMatrix* build(Session& session, Shape shape, const Dense& a);
// Symmetric sparse, taking entries.
SmMatrix* build_open(Session& session, const Dense& a);

// An untyped record: created and reset.
SmMatrix* new_untyped(Session& session);
// One that says it holds an entry: no call makes it, but the tests of kind stand on it.
SmMatrix* new_untyped_with_an_entry(Session& session, std::int32_t state = SM_STATE_OPEN);
// A reset record with `data` tied to it, which has no pool until an operation needs one: in state 0, and closed.
SmMatrix* new_open_tied(Session& session, std::vector<double>& data, std::int64_t rows, std::int64_t cols,
                        std::int32_t kind, std::int32_t format);
SmMatrix* new_tied(Session& session, Shape shape, std::vector<double>& data, std::int64_t rows, std::int64_t cols);
// A value array that could not be had: rows and cols are n, values null.
SmMatrix* new_without_values(Session& session, Shape shape, std::int64_t n);
// Closed by its state, but without compressed rows: what a refused resize leaves of an open symmetric sparse matrix.
SmMatrix* new_without_rows(Session& session, std::int64_t n);
// A 3 x 3 matrix of the shape with entries that nobody has closed. A general sparse one comes to that by hand only.
struct Unclosed {
  SmMatrix* matrix = nullptr;
  std::vector<double> data;  // what a dense one is tied to
};
Unclosed unclosed(Session& session, Shape shape);

// The rows of a tree matrix, walked from their roots; fails the test when a row does not ascend.
Nonzeros walk(SmMatrix* matrix, std::uint64_t* roots);
// The compressed rows of a closed matrix; fails the test when they break their invariants.
Nonzeros compressed(const SmMatrix* matrix);
// What a matrix stores, in any state. An array may take the place of the values.
Nonzeros entries(SmMatrix* matrix, const double* values = nullptr);
// The same as a full matrix, both triangles.
Dense contents(SmMatrix* matrix, const double* values = nullptr);
// The values of the shape's layout.
std::vector<double> laid_out(Shape shape, const Dense& a);

// Expects that rank and log-determinant are those of a matrix whose entries have changed.
void expect_voided(const SmMatrix* m);
// No compressed values, no permutations and nothing of a factor.
void expect_no_factor(const SmMatrix* m);

Indices words(const std::int64_t* array, std::int64_t count);
std::vector<double> doubles(const double* array, std::int64_t count);
std::uint64_t bits(double value);
std::vector<std::uint64_t> bits(const double* array, std::int64_t count);
std::vector<std::uint64_t> bits(const std::vector<double>& v);

}  // namespace sm::test
