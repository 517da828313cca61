// What a refused call must leave, the generalized inverse that results are held against, and a loop of refused
// requests.
#pragma once

#include <cmath>
#include <string>
#include <vector>

#include "cholesky/cholesky_support.hpp"
#include "support/matrices.hpp"
#include "support/output.hpp"

namespace sm::test {

// The singularity tolerance that a new instance has.
constexpr double kSingular = 1.110223024625157e-12;

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
  return refuse_each_request(kind, prepare, run, [&](Session& session, auto& problem, SmStatus status, std::int64_t) {
    EXPECT_TRUE(refused(status)) << "status " << status;
    if (status == SM_OK) {
      EXPECT_EQ(answer(problem), want);
    }
    EXPECT_EQ(run(session, problem), SM_OK);
    EXPECT_EQ(answer(problem), want);
    EXPECT_GE(session.host().live_blocks(), blocks);
    EXPECT_LE(session.host().live_blocks(), blocks + spare);
  });
}

inline bool is_no_memory(SmStatus status) { return status == SM_NO_MEMORY; }

}  // namespace sm::test
