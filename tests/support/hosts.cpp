// Both hosts of the conformance tests behind one face.
#include <qxhost/qxhost.h>

#include "support/minimal_host.h"
#include "support/test_host.hpp"

namespace sm::test {
namespace {

class EmbeddedHost : public TestHost {
 public:
  EmbeddedHost() : host_(qxhost_create(&kChecking)) {}
  ~EmbeddedHost() override { qxhost_destroy(host_); }
  EmbeddedHost(const EmbeddedHost&) = delete;
  EmbeddedHost& operator=(const EmbeddedHost&) = delete;

  HostServices* services() override { return qxhost_services(host_); }
  std::int64_t live_pools() override { return qxhost_usage(host_).pools_live; }
  std::int64_t live_blocks() override { return qxhost_usage(host_).blocks_live; }
  std::int64_t violations() override {
    const QxHostViolations found = qxhost_violations(host_);
    return found.foreign_frees + found.double_frees + found.overruns + found.dead_pools;
  }
  void fail_request(std::int64_t k, bool for_ever) override {
    qxhost_fail_request(host_, QXHOST_FAIL_ALL, k, for_ever ? 1 : 0);
  }
  std::int64_t stop_failing() override { return qxhost_stop_failing(host_); }

 private:
  static constexpr QxHostOptions kChecking = {0, 1};
  QxHost* host_;
};

class MinimalHostInC : public TestHost {
 public:
  MinimalHostInC() : host_(minimal_host_create()) {}
  ~MinimalHostInC() override { minimal_host_destroy(host_); }
  MinimalHostInC(const MinimalHostInC&) = delete;
  MinimalHostInC& operator=(const MinimalHostInC&) = delete;

  HostServices* services() override { return minimal_host_services(host_); }
  std::int64_t live_pools() override { return minimal_host_counts(host_).live_pools; }
  // Managers and extensions are blocks of the host too; the embedded host's come from pools.
  std::int64_t live_blocks() override {
    const MinimalHostCounts counts = minimal_host_counts(host_);
    return counts.live_blocks + counts.live_trees + counts.live_extensions;
  }
  std::int64_t violations() override {
    const MinimalHostCounts counts = minimal_host_counts(host_);
    return counts.foreign_frees + counts.double_frees + counts.overruns + counts.dead_calls + counts.bad_calls +
           counts.inner_mistakes;
  }
  void fail_request(std::int64_t k, bool for_ever) override { minimal_host_fail_request(host_, k, for_ever ? 1 : 0); }
  std::int64_t stop_failing() override { return minimal_host_stop_failing(host_); }

 private:
  MinimalHost* host_;
};

}  // namespace

std::unique_ptr<TestHost> make_host(HostKind kind) {
  if (kind == HostKind::embedded) return std::make_unique<EmbeddedHost>();
  return std::make_unique<MinimalHostInC>();
}

}  // namespace sm::test
