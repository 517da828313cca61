// The module, loaded into the embedded host as any host program does it.
#pragma once

#include <qxesm/qxesm.h>

#include <cstdint>
#include <qxhost/qxhost.hpp>
#include <string>

namespace sm::bench {

// Operations that the module exports beside its table. The last four are null in a module that does not have them.
struct Exports {
  decltype(&::qxsmmd) qxsmmd = nullptr;
  decltype(&::qxsmreorder) qxsmreorder = nullptr;
  decltype(&::qxsmsymbfact) qxsmsymbfact = nullptr;
  decltype(&::qxsmnumfact) qxsmnumfact = nullptr;
  decltype(&::qxsmmultv) qxsmmultv = nullptr;
  decltype(&::qxsmcopyv) qxsmcopyv = nullptr;
  decltype(&::qxsmtraceinvAB) qxsmtraceinvAB = nullptr;
  SmStatus (*qxsmorder)(SmMatrix* matrix, const std::int64_t* perm) = nullptr;
  SmStatus (*qxsmrefill)(SmMatrix* matrix, const double* values) = nullptr;
  SmStatus (*qxsminvpattern)(SmMatrix* matrix, double* values) = nullptr;
};

class Module {
 public:
  // Throws std::runtime_error when the module cannot be had.
  Module();
  ~Module();
  Module(const Module&) = delete;
  Module& operator=(const Module&) = delete;

  qxhost::Instance& instance() { return instance_; }
  [[nodiscard]] const SmFunctionTable& fn() const { return instance_.fn(); }
  [[nodiscard]] const Exports& by_name() const { return exports_; }
  [[nodiscard]] std::uint64_t bytes_in_use() const { return host_.usage().bytes_in_use; }
  // What of the host's freed blocks waits for its next use: half as much as there is memory, as at first here, or what
  // a host keeps unless it is told otherwise.
  enum class Kept { much, usual };
  void keep_freed_memory(Kept kept);
  // Freed blocks that wait for their next use go back to the system.
  void trim() { host_.trim(); }
  // The file that it came from.
  [[nodiscard]] const std::string& file() const { return file_; }

 private:
  static constexpr std::uint64_t kUsual = std::uint64_t{64} << 20;

  qxhost::Host host_;
  qxhost::Extension extension_;
  qxhost::Instance instance_;
  std::string file_;
  void* library_ = nullptr;
  Exports exports_;
};

// Throws std::runtime_error unless the status is 0.
void expect_ok(SmStatus status, const char* doing);

}  // namespace sm::bench
