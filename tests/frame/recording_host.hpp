// A host in front of another host: it passes every call on, writes down what the module asked for, and hands out memory
// that was not asked to be clear with a pattern in it. The words that the module has no business with are poisoned.
#pragma once

#include <qxesm/qxesm.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace sm::test {

struct PoolRequest {
  PoolParms parms;
  const void* owner;
  bool named;
  std::string name;
};

struct BlockRequest {
  std::uint64_t bytes;
  std::uint32_t flags;
};

struct TreeRequest {
  TreeParms parms;
  const void* zero;
  std::string label;
};

struct ExtensionRequest {
  std::wstring name;
  std::int64_t length;
  const void* zero;
};

class RecordingHost {
 public:
  explicit RecordingHost(HostServices* inner);
  ~RecordingHost();
  RecordingHost(const RecordingHost&) = delete;
  RecordingHost& operator=(const RecordingHost&) = delete;

  HostServices* services();
  void give_trees_an_inner_object(bool yes) { inner_objects_ = yes; }

  std::vector<PoolRequest> pools;
  std::vector<BlockRequest> blocks;
  std::vector<TreeRequest> trees;
  std::vector<ExtensionRequest> extensions;
  // What was done to tree managers and to the extension, in that order; "word cleared" says that word 4 was null then.
  std::vector<std::string> events;

  std::int64_t live_pools() const;
  std::int64_t live_trees() const;
  std::int64_t live_extensions() const;
  // Uses of a dead proxy, and proxies that were written to.
  std::int64_t offences() const;

 private:
  struct Services;
  struct Pool;
  struct Extension;
  struct Inner;
  struct Tree;

  bool inner_objects_ = false;
  std::int64_t offences_ = 0;
  std::unique_ptr<Services> services_;
  std::vector<std::unique_ptr<Pool>> pool_proxies_;
  std::vector<std::unique_ptr<Extension>> extension_proxies_;
  std::vector<std::unique_ptr<Tree>> tree_proxies_;
};

}  // namespace sm::test
