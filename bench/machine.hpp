// What the times were taken on.
#pragma once

#include <string>

#include "bench/harness/clock.hpp"
#include "bench/harness/records.hpp"

namespace sm::bench {

// Processor, libraries, compiler, load, and the rates of dgemm and of copying, measured now.
Json describe_machine(const std::string& module_file, Clock clock);

// A virtual machine may be given its memory only when it is touched, at seconds a gigabyte, which must not fall on
// whoever comes first: touches half of what is free.
void touch_memory();

}  // namespace sm::bench
