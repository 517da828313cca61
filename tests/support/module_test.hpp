// Fixture: a host, the module's extension and an instance; at the end everything must have been given back.
#pragma once

#include <gtest/gtest.h>

#include <string>

#include "support/test_host.hpp"

namespace sm::test {

// A host with the module loaded in it. Destroys instance and extension, if they are still there, and leaves leaks and
// violations to be asked for. Usable outside the fixture (the allocation failure loops make one for each k).
class Session {
 public:
  explicit Session(HostKind kind);
  ~Session();
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;

  TestHost& host() { return *host_; }
  SmExtension* extension() { return extension_; }
  SmInstance* instance() { return instance_; }
  const SmFunctionTable& fn() { return *instance_->functions; }
  void close();  // destroys instance and extension

 private:
  std::unique_ptr<TestHost> host_;
  SmExtension* extension_ = nullptr;
  SmInstance* instance_ = nullptr;
};

class ModuleTest : public ::testing::TestWithParam<HostKind> {
 protected:
  void SetUp() override;
  void TearDown() override;  // expects no live pool or block, and no violation

  Session& session() { return *session_; }
  TestHost& host() { return session_->host(); }
  SmInstance* instance() { return session_->instance(); }
  const SmFunctionTable& fn() { return session_->fn(); }
  // A new record of the instance (destroyed with it); fails the test when the status is not 0.
  SmMatrix* make(int32_t kind, int32_t format, int64_t rows, int64_t cols);

 private:
  std::unique_ptr<Session> session_;
};

// Runs a suite under both hosts: INSTANTIATE_BOTH_HOSTS(MySuite);
#define INSTANTIATE_BOTH_HOSTS(suite)                                                                        \
  INSTANTIATE_TEST_SUITE_P(Hosts, suite,                                                                     \
                           ::testing::Values(::sm::test::HostKind::embedded, ::sm::test::HostKind::minimal), \
                           [](const auto& i) { return ::sm::test::name_of(i.param); })

// Makes a call meet the refusal of each of its requests in turn, first once and then from there on, each time with a
// fresh problem in a session of its own, which must leave nothing behind. A call that meets none must answer 0. Answers
// how many requests there were.
//   prepare(Session&) -> problem                   builds it without faults
//   run(Session&, problem&) -> SmStatus
//   check(Session&, problem&, SmStatus, request)   looks at what a refusal left, and may make the call again
template <class Prepare, class Run, class Check>
std::int64_t refuse_each_request(HostKind kind, Prepare prepare, Run run, Check check) {
  constexpr std::int64_t kEnough = 1000;
  std::int64_t requests = kEnough;
  for (const bool for_ever : {false, true}) {
    bool met = true;
    for (std::int64_t k = 0; met && k < kEnough; ++k) {
      SCOPED_TRACE("request " + std::to_string(k) + (for_ever ? " and on" : ""));
      Session session(kind);
      EXPECT_NE(session.instance(), nullptr);
      auto problem = prepare(session);
      session.host().fail_request(k, for_ever);
      const SmStatus status = run(session, problem);
      met = session.host().stop_failing() > 0;
      if (met) {
        check(session, problem, status, k);
      } else {
        EXPECT_EQ(status, SM_OK);
        requests = k;
      }
      session.close();
      EXPECT_EQ(session.host().live_pools(), 0);
      EXPECT_EQ(session.host().live_blocks(), 0);
      EXPECT_EQ(session.host().violations(), 0);
    }
    EXPECT_FALSE(met) << "more requests than anybody expects";
  }
  return requests;
}

// Expects 101 of every refusal, no block left behind, and 0 when the same call is made again. Answers how many requests
// there were.
template <class Prepare, class Run>
std::int64_t survives_every_allocation_failure(HostKind kind, Prepare prepare, Run run) {
  std::int64_t blocks = 0;
  return refuse_each_request(
      kind,
      [&](Session& session) {
        auto problem = prepare(session);
        blocks = session.host().live_blocks();
        return problem;
      },
      run,
      [&](Session& session, auto& problem, SmStatus status, std::int64_t) {
        EXPECT_EQ(status, SM_NO_MEMORY);
        EXPECT_LE(session.host().live_blocks(), blocks);
        EXPECT_EQ(run(session, problem), SM_OK) << "again";
      });
}

bool is_missing(double value);  // the missing value, to the bit

}  // namespace sm::test
