#include "bench/machine.hpp"

#include <cholmod.h>
#include <fmt/format.h>
#include <metis.h>
#include <sys/utsname.h>
#include <unistd.h>

#include <Eigen/Core>
#include <cstdlib>
#include <fstream>
#include <set>

#include "bench/harness/latency.hpp"
#include "bench/peers/lapack.hpp"

extern "C" char* openblas_get_config();

namespace sm::bench {
namespace {

std::string field_of(const char* file, const std::string& name) {
  std::ifstream in(file);
  for (std::string line; std::getline(in, line);) {
    const std::size_t colon = line.find(": ");
    if (line.rfind(name, 0) == 0 && colon != std::string::npos) return line.substr(colon + 2);
  }
  return "unknown";
}

// The files that the process has its BLAS and LAPACK from.
std::set<std::string> linear_algebra() {
  std::set<std::string> files;
  std::ifstream maps("/proc/self/maps");
  for (std::string line; std::getline(maps, line);) {
    const std::size_t slash = line.find('/');
    if (slash != std::string::npos && line.find("blas", slash) != std::string::npos) files.insert(line.substr(slash));
  }
  return files;
}

// By the bytes that are loaded from.
Json latencies() {
  Json list = Json::array();
  for (const std::size_t megabytes : {1, 4, 16, 256}) {
    const std::size_t bytes = megabytes << 20;
    list.push_back({{"bytes", bytes}, {"seconds", dependent_load(bytes)}});
  }
  return list;
}

Json scattered_additions() {
  Json list = Json::array();
  for (const std::size_t kilobytes : {256, 2048, 16384, 262144}) {
    const std::size_t bytes = kilobytes << 10;
    list.push_back({{"bytes", bytes}, {"seconds", scattered_addition(bytes)}});
  }
  return list;
}

}  // namespace

Json describe_machine(const std::string& module_file, Clock clock) {
  double load[1] = {-1.0};
  getloadavg(load, 1);
  utsname system{};
  uname(&system);
  const Rates rates = measure_rates();
  const double memory = static_cast<double>(sysconf(_SC_PHYS_PAGES)) * static_cast<double>(sysconf(_SC_PAGESIZE));
  return {{"machine",
           {{"processor", field_of("/proc/cpuinfo", "model name")},
            {"megahertz", field_of("/proc/cpuinfo", "cpu MHz")},
            {"cores", sysconf(_SC_NPROCESSORS_ONLN)},
            {"memory", memory},
            {"system", fmt::format("{} {}", system.sysname, system.release)},
            {"compiler", __VERSION__},
            {"module", module_file},
            {"commit", QXBENCH_COMMIT},
            {"cholmod", fmt::format("{}.{}.{}", CHOLMOD_MAIN_VERSION, CHOLMOD_SUB_VERSION, CHOLMOD_SUBSUB_VERSION)},
            {"metis", fmt::format("{}.{}.{}", METIS_VER_MAJOR, METIS_VER_MINOR, METIS_VER_SUBMINOR)},
            {"eigen", fmt::format("{}.{}.{}", EIGEN_WORLD_VERSION, EIGEN_MAJOR_VERSION, EIGEN_MINOR_VERSION)},
            {"openblas", openblas_get_config()},
            {"kernels", kernels()},
            {"blas_files", linear_algebra()},
            {"clock", clock == Clock::cpu ? "cpu" : "wall"},
            {"load", load[0]},
            {"dgemm", rates.gemm},
            {"copy", rates.copy},
            {"latency", latencies()},
            {"scattered", scattered_additions()},
            {"update", vector_update(std::size_t{1} << 20)}}}};
}

}  // namespace sm::bench
