#include "forms/forms_support.hpp"

namespace sm::test {

std::string name_of(Operand operand) { return name_of(operand.shape) + " in state " + std::to_string(operand.state); }

std::vector<Operand> symmetric_and_diagonal() {
  std::vector<Operand> all(std::begin(kSymmetricOperands), std::end(kSymmetricOperands));
  all.insert(all.end(), std::begin(kDiagonalOperands), std::end(kDiagonalOperands));
  return all;
}

std::vector<Operand> all_operands() {
  std::vector<Operand> all = symmetric_and_diagonal();
  all.insert(all.end(), std::begin(kGeneralOperands), std::end(kGeneralOperands));
  return all;
}

namespace {

SmMatrix* closed(Session& session, Shape shape, const Known& known) {
  return new_closed(session, shape, known.rows(), known.cols(), known.elements(shape));
}

}  // namespace

SmMatrix* build(Session& session, Operand operand, const Known& known) {
  SmMatrix* m = closed(session, operand.shape, known);
  if (operand.shape == kSymmetricSparse) {
    EXPECT_EQ(bring_to(m, operand.state), SM_OK);
  } else {
    if (operand.state >= SM_STATE_FACTORED) {
      EXPECT_EQ(session.fn().qxsmfact(m, 0), SM_OK);
      EXPECT_NE(m->dense_factor, nullptr);
    }
    if (operand.state == SM_STATE_INVERTED) {
      EXPECT_EQ(session.fn().qxsminv(m, 0, kNan), SM_OK);
    }
  }
  EXPECT_EQ(m->state, operand.state) << name_of(operand);
  return m;
}

SmMatrix* build_in_place(Session& session, Operand operand, const Known& known) {
  SmMatrix* m = closed(session, operand.shape, known);
  EXPECT_EQ(session.fn().qxsmfact(m, 1), SM_OK);
  if (operand.state == SM_STATE_INVERTED) {
    EXPECT_EQ(session.fn().qxsminv(m, 1, kNan), SM_OK);
  }
  EXPECT_EQ(m->state, operand.state);
  EXPECT_EQ(m->dense_factor, nullptr);
  return m;
}

std::int64_t blocks_of(const SmMatrix* matrix) {
  const bool tree_of_general = shape_of(matrix) == kGeneralSparse && matrix->pool;
  const bool tree_of_symmetric = shape_of(matrix) == kSymmetricSparse && matrix->assembly_pool;
  std::int64_t blocks = shape_of(matrix) == kGeneralSparse ? 0 : owned_blocks(matrix);
  if (tree_of_general || tree_of_symmetric) {
    blocks += (tree_of_general ? matrix->row_roots : matrix->sym_roots) != nullptr;
    blocks += matrix->spare_node != nullptr;
    if (matrix->slab_nodes > 0) blocks += matrix->nnz / matrix->slab_nodes;
  }
  return blocks;
}

namespace {

std::int64_t loose_blocks(Session& session, const std::vector<SmMatrix*>& matrices) {
  std::int64_t blocks = session.host().live_blocks();
  for (const SmMatrix* m : matrices) blocks -= blocks_of(m);
  return blocks;
}

}  // namespace

std::int64_t survive(HostKind kind, const FaultCase& c) {
  std::vector<double> want;
  {
    Session calm(kind);
    const std::vector<SmMatrix*> matrices = c.prepare(calm);
    EXPECT_EQ(c.run(calm, matrices), SM_OK);
    want = c.answer(matrices);
  }
  std::int64_t loose = 0;
  std::int64_t records = 0;
  return refuse_each_request(
      kind,
      [&](Session& session) {
        const std::vector<SmMatrix*> matrices = c.prepare(session);
        loose = loose_blocks(session, matrices);
        records = session.instance()->matrix_count;
        return matrices;
      },
      c.run,
      [&](Session& session, const std::vector<SmMatrix*>& matrices, SmStatus status, std::int64_t) {
        EXPECT_EQ(status, SM_NO_MEMORY);
        EXPECT_EQ(loose_blocks(session, matrices), loose);
        EXPECT_EQ(c.run(session, matrices), SM_OK) << "again";
        EXPECT_TRUE(same(c.answer(matrices), want)) << "again";
        EXPECT_EQ(loose_blocks(session, matrices), loose) << "again";
        EXPECT_EQ(session.instance()->matrix_count, records);
      });
}

}  // namespace sm::test
