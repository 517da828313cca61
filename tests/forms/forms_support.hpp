// What the suites of products and forms share: known matrices in every shape and state, and a fault loop that counts
// what matrices may hold.
#pragma once

#include <functional>
#include <string>
#include <utility>
#include <vector>

#include "cholesky/cholesky_support.hpp"
#include "support/known.hpp"
#include "support/output.hpp"

namespace sm::test {

// A shape and the state that the matrix is brought to. A dense or diagonal one is factored or inverted beside its
// values.
struct Operand {
  Shape shape;
  std::int32_t state = SM_STATE_CLOSED;
};
std::string name_of(Operand operand);

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

SmMatrix* build(Session& session, Operand operand, const Known& known);
inline SmMatrix* build(Session& session, Shape shape, const Known& known) {
  return build(session, Operand{shape}, known);
}
// Factored or inverted in place of its values.
SmMatrix* build_in_place(Session& session, Operand operand, const Known& known);
class FormsTest : public ModuleTest {
 protected:
  SmMatrix* build(Operand operand, const Known& known) { return sm::test::build(session(), operand, known); }
  SmMatrix* build(Shape shape, const Known& known) { return sm::test::build(session(), Operand{shape}, known); }
  SmMatrix* typed(Shape shape) { return new_typed(session(), shape); }
  SmMatrix* sized(Shape shape, std::int64_t rows, std::int64_t cols) { return new_sized(session(), shape, rows, cols); }
  SmMatrix* sized(Shape shape, std::int64_t n) { return new_sized(session(), shape, n, n); }
  void destroy(SmMatrix* m) { EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK); }
  SmMatrix* of(Operand operand, std::int64_t rows = 4, std::int64_t cols = 4) {
    Random random(1);
    return build(operand, random_known(random, operand.shape, rows, cols));
  }
  // A symmetric matrix of order 2 that is to become a result, and whether it is as it was.
  SmMatrix* result(Shape shape = kSymmetricRows) { return build(shape, kBefore); }
  static bool as_before(SmMatrix* r) { return r->rows == 2 && same(read(r), kBefore); }
  static inline const Known kBefore = Known::full({{5.0, 6.0}, {6.0, 8.0}});
  // The status of the call while every request is refused; expects that it makes none.
  template <class Call>
  SmStatus without_memory(Call call) {
    host().fail_request(0, true);
    const SmStatus status = call();
    EXPECT_EQ(host().stop_failing(), 0);
    return status;
  }
};

// Blocks that the matrix may hold, those of its trees included.
std::int64_t blocks_of(const SmMatrix* matrix);

// A call of an operation on matrices that are made afresh for each refusal.
struct FaultCase {
  std::function<std::vector<SmMatrix*>(Session&)> prepare;
  std::function<SmStatus(Session&, const std::vector<SmMatrix*>&)> run;
  std::function<std::vector<double>(const std::vector<SmMatrix*>&)> answer;
};
// Every request refused in turn, once and for ever: 101, nothing held but what the matrices hold, and the same answer
// as an untroubled call when it is made again. Answers how many requests there were to refuse.
std::int64_t survive(HostKind kind, const FaultCase& c);

}  // namespace sm::test
