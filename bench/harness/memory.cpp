#include "bench/harness/memory.hpp"

#include <malloc.h>

#include <fstream>
#include <string>

namespace sm::bench {

void keep_freed_memory() {
  mallopt(M_MMAP_MAX, 0);
  mallopt(M_TRIM_THRESHOLD, -1);  // never
}

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

}  // namespace sm::bench
