// Fixture: a host, the module's extension and an instance; at the end everything must have been given back.
#pragma once

#include <gtest/gtest.h>

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

// Runs `run` with every request refused in turn, first once and then from there on; see the comments at its body.
//   prepare(Session&) -> anything    builds the problem without faults
//   run(Session&, problem&) -> SmStatus
// Expects 101 whenever a fault was met, no block left behind, and 0 when the same call is made again afterwards.
template <class Prepare, class Run>
void survives_every_allocation_failure(HostKind kind, Prepare prepare, Run run) {
  for (const bool for_ever : {false, true}) {
    for (std::int64_t k = 0;; ++k) {
      Session session(kind);
      ASSERT_NE(session.instance(), nullptr);
      auto problem = prepare(session);
      const std::int64_t blocks = session.host().live_blocks();
      session.host().fail_request(k, for_ever);
      const SmStatus status = run(session, problem);
      if (session.host().stop_failing() == 0) {
        EXPECT_EQ(status, SM_OK);
        break;
      }
      EXPECT_EQ(status, SM_NO_MEMORY) << "request " << k << (for_ever ? " and on" : "");
      EXPECT_LE(session.host().live_blocks(), blocks) << "request " << k;
      EXPECT_EQ(run(session, problem), SM_OK) << "after request " << k;
      EXPECT_EQ(session.host().violations(), 0);
    }
  }
}

bool is_missing(double value);  // the missing value, to the bit

}  // namespace sm::test
