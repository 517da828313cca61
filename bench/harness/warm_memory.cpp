#include "bench/harness/warm_memory.hpp"

#include <sys/mman.h>

#include <algorithm>
#include <cstddef>
#include <fstream>
#include <string>

namespace sm::bench {
namespace {

constexpr double kLeast = 8e6;  // less is not given back to a host
constexpr double kMost = 8e9;

void touch(std::size_t bytes) {
  void* memory = mmap(nullptr, bytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
  if (memory == MAP_FAILED) return;
  madvise(memory, bytes, MADV_HUGEPAGE);
  auto* const first = static_cast<volatile char*>(memory);
  for (std::size_t k = 0; k < bytes; k += 4096) first[k] = 1;
  munmap(memory, bytes);
}

}  // namespace

double resident(const char* what) {
  std::ifstream status("/proc/self/status");
  const std::string name = std::string(what) + ":";
  for (std::string line; std::getline(status, line);) {
    if (line.rfind(name, 0) == 0) return 1024.0 * std::stod(line.substr(name.size()));
  }
  return 0.0;
}

bool forget_peak() {
  std::ofstream file("/proc/self/clear_refs");
  file << "5\n";
  return static_cast<bool>(file.flush());
}

void WarmMemory::before_run() {
  if (most_ > kLeast) touch(static_cast<std::size_t>(std::min(1.25 * most_, kMost)));
  forget_peak();
  begin_ = resident("VmRSS");
}

void WarmMemory::after_run() { most_ = std::max(most_, resident("VmHWM") - begin_); }

}  // namespace sm::bench
