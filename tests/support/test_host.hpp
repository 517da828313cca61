// The hosts that the conformance tests run under, behind one face.
#pragma once

#include <qxesm/qxesm.h>

#include <cstdint>
#include <memory>
#include <string>

namespace sm::test {

// A host in its checking mode. Counts and faults cover what passes through its services.
class TestHost {
 public:
  virtual ~TestHost() = default;
  virtual HostServices* services() = 0;
  virtual std::int64_t live_pools() = 0;
  virtual std::int64_t live_blocks() = 0;
  // Foreign and double frees, overruns, calls on dead pools.
  virtual std::int64_t violations() = 0;
  // Refuse the k-th request from now (0: the next) for a block, a pool, a tree manager or an extension.
  virtual void fail_request(std::int64_t k, bool for_ever) = 0;
  // Ends the fault; answers how many requests it refused.
  virtual std::int64_t stop_failing() = 0;
};

enum class HostKind { embedded, minimal };
std::string name_of(HostKind kind);

// The embedded host of this project, or the minimal one in C that is written from the public headers alone.
std::unique_ptr<TestHost> make_host(HostKind kind);

}  // namespace sm::test
