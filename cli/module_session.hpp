// The embedded host with the module loaded into it at run time, as any host program does it.
#pragma once

#include <qxesm/qxesm.h>
#include <qxhost/qxhost.h>

#include <cstdint>
#include <string>

#include "mixed/module.hpp"

namespace sm::cli {

// Operations that the module exports beside its table.
struct ExportedSteps : mixed::ExportedOperations {
  SmStatus (*qxsminvmultv)(SmMatrix* matrix, const double* b, double* x, int64_t count) = nullptr;
  SmStatus (*qxsmtraceinvAB)(SmMatrix* a, SmMatrix* b, int64_t start, double* result) = nullptr;
  SmStatus (*qxsmcopyv)(const double* values, SmMatrix* matrix, int64_t rows, int64_t cols, int32_t kind,
                        int32_t format) = nullptr;
  SmStatus (*qxsmsetprogress)(SmInstance* instance, SmProgress callback, void* context) = nullptr;
};

class ModuleSession {
 public:
  // Throws CommandError when the module cannot be had. The pools hand out at most `ceiling` bytes.
  explicit ModuleSession(std::uint64_t ceiling);
  ~ModuleSession();
  ModuleSession(const ModuleSession&) = delete;
  ModuleSession& operator=(const ModuleSession&) = delete;

  SmInstance* instance() { return instance_; }
  const SmFunctionTable& fn() const { return *instance_->functions; }
  const ExportedSteps& steps() const { return steps_; }
  std::uint64_t peak_bytes() const { return qxhost_usage(host_).bytes_peak; }

  // Freed memory that waits for its next use goes back to the system.
  void trim() { qxhost_trim(host_); }

  // Throws CommandError for every status but 0; `doing` names the phase: "ordering".
  void expect_ok(SmStatus status, const std::string& doing) const;

 private:
  void release();
  [[noreturn]] void refuse_load();
  void find_steps();

  std::uint64_t ceiling_;
  QxHost* host_ = nullptr;
  SmExtension* extension_ = nullptr;
  SmInstance* instance_ = nullptr;
  void* library_ = nullptr;
  ExportedSteps steps_;
};

// The module of a session, which must outlive it, for the library of mixed models.
mixed::Module mixed_module(ModuleSession& session);

}  // namespace sm::cli
