// The module as the library meets it: one instance, the operations that are exported beside its table, and somebody who
// turns a status into words.
#pragma once

#include <qxesm/qxesm.h>

#include <functional>
#include <string>

namespace sm::mixed {

// What the library needs of the operations beside the table.
struct ExportedOperations {
  SmStatus (*qxsmmd)(SmMatrix* matrix) = nullptr;
  SmStatus (*qxsmorder)(SmMatrix* matrix, const int64_t* perm) = nullptr;
  SmStatus (*qxsmreorder)(SmMatrix* matrix) = nullptr;
  SmStatus (*qxsmsymbfact)(SmMatrix* matrix) = nullptr;
  SmStatus (*qxsmnumfact)(SmMatrix* matrix) = nullptr;
  SmStatus (*qxsmrefill)(SmMatrix* matrix, const double* values) = nullptr;
  SmStatus (*qxsminvpattern)(SmMatrix* matrix, double* values) = nullptr;
};

struct Module : ExportedOperations {
  SmInstance* instance = nullptr;

  // Does not return for any status but 0; `doing` names the phase: "factoring the mixed-model equations".
  std::function<void(SmStatus status, const std::string& doing)> expect_ok;

  // Told before each long step, with the multiplications and additions it is expected to take; may be empty.
  std::function<void(const std::string& doing, double flops)> begin{};
  void tell(const std::string& doing, double flops) const {
    if (begin) begin(doing, flops);
  }

  const SmFunctionTable& fn() const { return *instance->functions; }
};

}  // namespace sm::mixed
