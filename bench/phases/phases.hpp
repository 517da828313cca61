// What is measured. A phase takes one system, lets the module and its peers do the same job, checks every result and
// writes a record for each of its names.
#pragma once

#include <span>
#include <string_view>
#include <vector>

#include "bench/harness/workbench.hpp"

namespace sm::bench {

struct Phase {
  std::vector<std::string_view> names;  // of the command line and of the records
  void (*run)(Workbench& bench);
};

// Every phase that works on one system, in the order in which they are run.
std::span<const Phase> phases();

// The dense factorization and inversion of order n.
void measure_dense(Module& module, Records& records, int n, int rounds);

// One function a file.
void measure_assembly(Workbench& bench);
void measure_ordering(Workbench& bench);
void measure_factorization(Workbench& bench);
void measure_total(Workbench& bench);
void measure_solves(Workbench& bench);
void measure_inverse(Workbench& bench);
void measure_refactoring(Workbench& bench);
void measure_products(Workbench& bench);
void measure_iterations(Workbench& bench);
void measure_memory(Workbench& bench);
void measure_rank(Workbench& bench);

}  // namespace sm::bench
