// Matrices of every shape from dense ones, read back without the module, and the generalized inverse that they are held
// against.
#pragma once

#include <cmath>
#include <string>
#include <vector>

#include "cholesky/cholesky_support.hpp"
#include "store/store_test.hpp"

namespace sm::test {

// What the settings of a new instance hold: the singularity tolerance, and the one below which nothing is stored.
constexpr double kSingular = 1.110223024625157e-12;
constexpr double kUntouched = -777.0;

Dense from_rows(const std::vector<std::vector<double>>& rows);
Dense from_diagonal(const std::vector<double>& d);
// Multiples of 1/64, about `percent` of them stored; symmetric ones have a full diagonal.
Dense random_dense(Random& random, std::int64_t rows, std::int64_t cols, std::int64_t percent = 100);
Dense random_symmetric(Random& random, std::int64_t n, std::int64_t percent = 100);
Problem problem_from(const Dense& symmetric);
// Row and column `from` and what follows.
Dense trailing(const Dense& a, std::int64_t from);
Dense scaled(const Dense& a, long double s);
Dense sum(const Dense& a, const Dense& b);

// A new matrix with the elements of `a` that the shape stores; closed. Zeros are not entered into a sparse one.
SmMatrix* build(Session& session, Shape shape, const Dense& a);
// Symmetric sparse, taking entries.
SmMatrix* build_open(Session& session, const Dense& a);
// A reset record with the array tied to it, closed: it has no pool until an operation needs one.
SmMatrix* build_tied(Session& session, Shape shape, std::vector<double>& data, std::int64_t n);
// The values of the shape's layout.
std::vector<double> laid_out(Shape shape, const Dense& a);
SmMatrix* sized(Session& session, Shape shape, std::int64_t rows, std::int64_t cols);
// A value array that could not be had: rows and cols are n, values null.
SmMatrix* build_without_values(Session& session, Shape shape, std::int64_t n);

Shape shape_of(const SmMatrix* matrix);
// What is stored, in whatever state; both triangles of a symmetric matrix. An array may take the place of the values.
Dense contents(SmMatrix* matrix, const double* values = nullptr);
// The stored entries of a sparse matrix, upper triangle first index first, whatever order the rows are in.
Nonzeros entries(SmMatrix* matrix);
// Numbers to the bit, kind and format, sizes, state, results and arrays: what a refused call must leave.
struct Snapshot {
  std::vector<std::uint64_t> words;
  std::vector<const void*> arrays;
  bool operator==(const Snapshot&) const = default;
};
Snapshot snapshot(SmMatrix* matrix);

// The generalized inverse without the pivots that are dropped in the order: the inverse of the accepted block, else 0.
struct Reference {
  Dense inverse;
  std::vector<bool> accepted;
  std::int64_t rank = 0;
  double log_det = 0.0;
};
Reference generalized_inverse(const Dense& a, const Indices& order = {}, double tolerance = kSingular);
// In the order in which the matrix was factored: its own for a sparse one, else the natural one.
Reference generalized_inverse_of(const SmMatrix* matrix, const Dense& a);

// Three problems of every temper: definite, with repeated and zero rows, and of order 1.
struct Named {
  std::string name;
  Dense a;
};
std::vector<Named> semidefinite_problems();

// A record of kind none that says it holds something, which no operation leaves: it shows where the kind is looked at.
class UntypedRecord {
 public:
  explicit UntypedRecord(Session& session) : matrix_(new_untyped(session)) { matrix_->nnz = 1; }
  ~UntypedRecord() { matrix_->nnz = 0; }
  UntypedRecord(const UntypedRecord&) = delete;
  UntypedRecord& operator=(const UntypedRecord&) = delete;
  SmMatrix* get() { return matrix_; }

 private:
  SmMatrix* matrix_;
};

// Refuses every request of run(session, problem) in turn, once and then from there on. After a refusal
// `refused(status)` must hold, and the answer be right when it is SM_OK all the same. The same call made again must
// succeed, answer the same and leave as many blocks as an untroubled one, `spare` aside. Answers how many requests
// there were.
template <class Prepare, class Run, class Answer, class Refused>
std::int64_t survives(HostKind kind, Prepare prepare, Run run, Answer answer, Refused refused, std::int64_t spare = 0) {
  Session calm(kind);
  auto untroubled = prepare(calm);
  EXPECT_EQ(run(calm, untroubled), SM_OK);
  const auto want = answer(untroubled);
  const std::int64_t blocks = calm.host().live_blocks();
  std::int64_t requests = 0;
  for (const bool for_ever : {false, true})
    for (std::int64_t k = 0; k < 1000; ++k) {
      SCOPED_TRACE("request " + std::to_string(k) + (for_ever ? " and on" : ""));
      Session session(kind);
      auto problem = prepare(session);
      session.host().fail_request(k, for_ever);
      const SmStatus status = run(session, problem);
      const bool met = session.host().stop_failing() > 0;
      requests = k;
      if (!met) {
        EXPECT_EQ(status, SM_OK);
        break;
      }
      EXPECT_TRUE(refused(status)) << "status " << status;
      if (status == SM_OK) {
        EXPECT_EQ(answer(problem), want);
      }
      EXPECT_EQ(run(session, problem), SM_OK);
      EXPECT_EQ(answer(problem), want);
      EXPECT_GE(session.host().live_blocks(), blocks);
      EXPECT_LE(session.host().live_blocks(), blocks + spare);
      session.close();
      EXPECT_EQ(session.host().live_pools(), 0);
      EXPECT_EQ(session.host().violations(), 0);
    }
  return requests;
}

inline bool is_no_memory(SmStatus status) { return status == SM_NO_MEMORY; }

}  // namespace sm::test
