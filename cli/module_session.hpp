// The embedded host with the module loaded into it at run time, as any host program does it.
#pragma once

#include <qxesm/qxesm.h>
#include <qxhost/qxhost.h>

#include <cstdint>
#include <string>

namespace sm::cli {

// Operations that the module exports beside its table.
struct ExportedSteps {
  SmStatus (*qxsmmd)(SmMatrix* matrix) = nullptr;
  SmStatus (*qxsmorder)(SmMatrix* matrix, const int64_t* perm) = nullptr;
  SmStatus (*qxsmreorder)(SmMatrix* matrix) = nullptr;
  SmStatus (*qxsmsymbfact)(SmMatrix* matrix) = nullptr;
  SmStatus (*qxsmnumfact)(SmMatrix* matrix) = nullptr;
  SmStatus (*qxsmrefill)(SmMatrix* matrix, const double* values) = nullptr;
  SmStatus (*qxsminvpattern)(SmMatrix* matrix, double* values) = nullptr;
  SmStatus (*qxsminvdiag)(SmMatrix* matrix, double* x) = nullptr;
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

}  // namespace sm::cli
