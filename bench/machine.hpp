// What the times were taken on.
#pragma once

#include <string>

#include "bench/harness/clock.hpp"
#include "bench/harness/records.hpp"

namespace sm::bench {

// Processor, libraries, compiler, load, the rates of dgemm and of copying and the latencies of memory, measured now.
Json describe_machine(const std::string& module_file, Clock clock);

}  // namespace sm::bench
