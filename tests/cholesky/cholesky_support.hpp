// Problems as matrices of the module, and the module's factors as dense matrices.
#pragma once

#include <string>
#include <vector>

#include "support/matrices.hpp"
#include "support/random_matrices.hpp"

namespace sm::test {

// Symmetric sparse, assembled; closed with nothing dropped unless asked otherwise.
SmMatrix* new_sparse(Session& session, const Problem& problem, bool close = true);
// Symmetric, packed in format 22 or 23.
SmMatrix* new_packed(Session& session, const Problem& problem, std::int32_t format);
SmMatrix* new_diagonal(Session& session, const std::vector<double>& d, std::int32_t format = SM_FORMAT_ROWS);
// A general dense matrix of the size, closed.
SmMatrix* new_general(Session& session, std::int64_t rows, std::int64_t cols);

// A symmetric sparse problem from a dense matrix: the diagonal and everything that is not 0.
Problem problem_of(const std::vector<std::vector<double>>& rows);

std::vector<double> packed(const Problem& problem, std::int32_t format);
Dense dense_of_packed(const double* values, std::int64_t n, std::int32_t format);  // both triangles
Dense triangle_of_packed(const double* values, std::int64_t n, std::int32_t format);

// The stored rows of a closed symmetric sparse matrix, values by their bits.
struct StoredRows {
  Indices row_start;
  Indices col_index;
  std::vector<std::uint64_t> value_bits;
  bool operator==(const StoredRows&) const = default;
};
StoredRows rows_of(const SmMatrix* matrix);
Dense dense_of_rows(const SmMatrix* matrix);  // whatever order the rows are in

// The four steps as far as the state; answers the first status that is not 0.
SmStatus bring_to(SmMatrix* matrix, std::int32_t state);
// Takes the place of the computed ordering (state 2).
void impose_order(SmMatrix* matrix, const Indices& perm);
Indices natural_order(std::int64_t n);
// A block of exactly `capacity` words in place of the workspace.
void replace_work(SmMatrix* matrix, std::int64_t capacity);

// For tests of what comes after the ordering.
class OrderedTest : public ModuleTest {
 protected:
  SmMatrix* ordered(const Problem& problem) {
    SmMatrix* m = new_sparse(session(), problem);
    EXPECT_EQ(qxsmmd(m), SM_OK);
    return m;
  }
  void destroy(SmMatrix* m) { EXPECT_EQ(fn().qxsmDestroyMatrix(instance(), &m), SM_OK); }
};

// The rows of an ordered matrix as reordering is to leave them: every entry in the row of the index that comes first, the
// diagonal in front, the rest as it was met.
StoredRows reordered_rows(const SmMatrix* matrix);

// U as the record holds it: columns of each row, from the compressed subscripts.
std::vector<Indices> stored_structure(const SmMatrix* matrix);
// What the workspace must hold at least: integers, two vectors of n, and the values of U.
std::int64_t words_needed(const SmMatrix* matrix);
Dense stored_u(const SmMatrix* matrix);
std::vector<double> stored_reciprocals(const SmMatrix* matrix);

// Has the values of the compressed rows in the middle of a larger array for as long as it lives, with as many elements
// before and behind them: what neighbouring blocks of a host look like.
class OwnValuesInRoom {
 public:
  explicit OwnValuesInRoom(SmMatrix* matrix);
  ~OwnValuesInRoom();
  OwnValuesInRoom(const OwnValuesInRoom&) = delete;
  OwnValuesInRoom& operator=(const OwnValuesInRoom&) = delete;

  double* at(std::size_t first) { return room_.data() + first; }  // the own values begin at nnz
  const std::vector<double>& room() const { return room_; }

 private:
  SmMatrix* matrix_;
  double* block_;
  std::vector<double> room_;
};

// The columns of A^- from solves with the unit vectors.
Dense solved_identity(SmMatrix* matrix);

// Blocks that hang on the record: what may be live beyond what was there before an operation.
std::int64_t owned_blocks(const SmMatrix* matrix);

}  // namespace sm::test
