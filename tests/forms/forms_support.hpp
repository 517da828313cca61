// What the suites of products and forms share: matrices known element by element, built in every shape and state and
// read back without the module, outputs between guard words, and a fault loop that counts what matrices may hold.
#pragma once

#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "cholesky/cholesky_support.hpp"
#include "store/store_test.hpp"

namespace sm::test {

constexpr double kUntouched = -777.0;
constexpr std::int64_t kLeast = std::numeric_limits<std::int64_t>::min();

// A shape and the state that the matrix is brought to. A dense or diagonal one is factored or inverted beside its values.
struct Operand {
  Shape shape;
  std::int32_t state = SM_STATE_CLOSED;
};
std::string name_of(Operand operand);
bool operator==(Shape a, Shape b);

inline constexpr Operand kSymmetricOperands[] = {
    {kSymmetricSparse, SM_STATE_CLOSED},    {kSymmetricSparse, SM_STATE_ORDERED},
    {kSymmetricSparse, SM_STATE_REORDERED}, {kSymmetricSparse, SM_STATE_SYMBOLIC},
    {kSymmetricSparse, SM_STATE_FACTORED},  {kSymmetricColumns, SM_STATE_CLOSED},
    {kSymmetricColumns, SM_STATE_FACTORED}, {kSymmetricColumns, SM_STATE_INVERTED},
    {kSymmetricRows, SM_STATE_CLOSED},      {kSymmetricRows, SM_STATE_FACTORED},
    {kSymmetricRows, SM_STATE_INVERTED}};
inline constexpr Operand kDiagonalOperands[] = {
    {kDiagonalColumns, SM_STATE_CLOSED}, {kDiagonalColumns, SM_STATE_FACTORED}, {kDiagonalColumns, SM_STATE_INVERTED},
    {kDiagonalRows, SM_STATE_CLOSED},    {kDiagonalRows, SM_STATE_FACTORED},    {kDiagonalRows, SM_STATE_INVERTED}};
inline constexpr Operand kGeneralOperands[] = {{kGeneralSparse}, {kGeneralColumns}, {kGeneralRows}};
std::vector<Operand> all_operands();
std::vector<Operand> symmetric_and_diagonal();
// A packed inverse in format 22 cannot be solved with.
inline bool solvable(Operand operand) {
  return !(operand.shape.kind == SM_KIND_SYMMETRIC && operand.shape.format == SM_FORMAT_COLUMNS &&
           operand.state == SM_STATE_INVERTED);
}
inline constexpr Shape kGeneralShapes[] = {kGeneralSparse, kGeneralColumns, kGeneralRows};
inline constexpr Shape kSymmetricShapes[] = {kSymmetricSparse, kSymmetricColumns, kSymmetricRows};
inline constexpr Shape kInvertible[] = {kSymmetricSparse, kSymmetricColumns, kSymmetricRows, kDiagonalColumns,
                                        kDiagonalRows};

// A matrix element by element: what is stored, both triangles of a symmetric one, and with which value.
class Known {
 public:
  Known() = default;
  Known(std::int64_t rows, std::int64_t cols)
      : rows_(rows), cols_(cols), v_(at(rows * cols)), stored_(at(rows * cols)) {}
  // Everything stored.
  static Known full(const std::vector<std::vector<double>>& rows);

  std::int64_t rows() const { return rows_; }
  std::int64_t cols() const { return cols_; }
  void set(std::int64_t r, std::int64_t c, double value) {
    v_[at(r * cols_ + c)] = value;
    stored_[at(r * cols_ + c)] = true;
  }
  void set_both(std::int64_t r, std::int64_t c, double value) {
    set(r, c, value);
    set(c, r, value);
  }
  bool has(std::int64_t r, std::int64_t c) const { return stored_[at(r * cols_ + c)]; }
  double operator()(std::int64_t r, std::int64_t c) const { return v_[at(r * cols_ + c)]; }  // 0 when not stored
  std::vector<double> row(std::int64_t r) const;
  std::vector<double> by_rows() const { return v_; }
  Dense dense() const;
  std::int64_t count() const;  // stored elements

 private:
  std::int64_t rows_ = 0;
  std::int64_t cols_ = 0;
  std::vector<double> v_;
  std::vector<bool> stored_;
};

// Multiples of 1/64. Symmetric and diagonal ones are positive definite, sparse ones have gaps and stored zeros, and a
// general sparse one of more than two rows has an empty row.
Known random_known(Random& random, Shape shape, std::int64_t rows, std::int64_t cols);
// Elements of a and b, where either has one.
Known sum(const Known& a, const Known& b);
// Over stored elements, in the order of the inner index: infinities and NaNs as the storage has them.
Known product(const Known& a, const Known& b);
// Sum of x[i] a(i, j) y[j] over stored elements.
double form(const Known& a, const double* x, const double* y);
Known upper_part(const Known& a);  // the elements on and above the diagonal, mirrored
Known diagonal_part(const Known& a);

SmMatrix* build(Session& session, Operand operand, const Known& known);
inline SmMatrix* build(Session& session, Shape shape, const Known& known) {
  return build(session, Operand{shape}, known);
}
// A typed record without a size, and one of that size.
SmMatrix* new_typed(Session& session, Shape shape);
SmMatrix* new_sized(Session& session, Shape shape, std::int64_t rows, std::int64_t cols);
// Factored or inverted in place of its values.
SmMatrix* build_in_place(Session& session, Operand operand, const Known& known);
// What the matrix stores, open or closed, in any state: without the module's readers.
Known read(SmMatrix* matrix);

// To the bit but for the sign of a zero and the bits of a NaN.
bool same(double got, double want);
::testing::AssertionResult same(const std::vector<double>& got, const std::vector<double>& want);
::testing::AssertionResult same(const Known& got, const Known& want);          // values; what is not stored is 0
::testing::AssertionResult same_entries(const Known& got, const Known& want);  // and stored in the same places

// n doubles between guard words.
class Output {
 public:
  explicit Output(std::int64_t n, double fill = kUntouched);
  explicit Output(const std::vector<double>& start);
  double* data() { return v_.data() + kGuard; }
  std::vector<double> values() const;  // fails the test when a guard word has changed
  bool untouched() const;              // nothing differs from what it was made with

 private:
  static constexpr std::int64_t kGuard = 9;
  std::vector<double> v_;
  std::vector<double> start_;
};

class FormsTest : public ModuleTest {
 protected:
  SmMatrix* build(Operand operand, const Known& known) { return sm::test::build(session(), operand, known); }
  SmMatrix* build(Shape shape, const Known& known) { return sm::test::build(session(), Operand{shape}, known); }
  SmMatrix* typed(Shape shape) { return new_typed(session(), shape); }
  SmMatrix* sized(Shape shape, std::int64_t rows, std::int64_t cols) { return new_sized(session(), shape, rows, cols); }
  SmMatrix* sized(Shape shape, std::int64_t n) { return new_sized(session(), shape, n, n); }
  // The same random elements in every call.
  SmMatrix* of(Operand operand, std::int64_t rows = 4, std::int64_t cols = 4) {
    Random random(1);
    return build(operand, random_known(random, operand.shape, rows, cols));
  }
  // A matrix for results, and whether it is as it was made.
  SmMatrix* result(Shape shape = kSymmetricRows) { return build(shape, result_before()); }
  static bool as_before(SmMatrix* r) { return r->rows == 2 && same(read(r), result_before()); }
  static Known result_before() { return Known::full({{5.0, 6.0}, {6.0, 8.0}}); }
  void destroy(SmMatrix* m) { EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK); }
  // The status of the call while every request is refused; expects that it makes none.
  template <class Call>
  SmStatus without_memory(Call call) {
    host().fail_request(0, true);
    const SmStatus status = call();
    EXPECT_EQ(host().stop_failing(), 0);
    return status;
  }
};

// A record of kind none that says it holds an entry: no call makes one, but the tests of kind stand on it. Give it back
// with harmless() before its instance goes.
SmMatrix* new_untyped_with_an_entry(Session& session, std::int32_t state);
void harmless(SmMatrix* untyped);
// Blocks that the matrix may hold, those of its trees included.
std::int64_t blocks_of(const SmMatrix* matrix);

// A call of an operation on matrices that are made afresh for each refusal.
struct FaultCase {
  std::function<std::vector<SmMatrix*>(Session&)> prepare;
  std::function<SmStatus(Session&, const std::vector<SmMatrix*>&)> run;
  std::function<std::vector<double>(const std::vector<SmMatrix*>&)> answer;
};
// Every request refused in turn, once and for ever: 101, nothing held but what the matrices hold, and the same answer as
// an untroubled call when it is made again. Answers how many requests there were to refuse.
std::int64_t survive(HostKind kind, const FaultCase& c);

}  // namespace sm::test
