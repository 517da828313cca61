#include "bench/harness/module.hpp"

#include <dlfcn.h>
#include <fmt/format.h>
#include <unistd.h>

#include <stdexcept>

namespace sm::bench {

void expect_ok(SmStatus status, const char* doing) {
  if (status != SM_OK) throw std::runtime_error(fmt::format("{} ended with status {}", doing, status));
}

Module::Module() : extension_(host_), instance_(extension_) {
  keep_freed_memory(Kept::much);
  if (!instance_) throw std::runtime_error(fmt::format("the module cannot be loaded: {}", host_.last_error()));
  Dl_info info{};
  dladdr(reinterpret_cast<void*>(fn().qxsmfact), &info);
  file_ = info.dli_fname ? info.dli_fname : "";
  library_ = dlopen(file_.c_str(), RTLD_LAZY | RTLD_NOLOAD);
  if (!library_) throw std::runtime_error(file_ + " is not loaded");
  const auto find = [&](auto& function, const char* name, bool needed) {
    function = reinterpret_cast<std::remove_reference_t<decltype(function)>>(dlsym(library_, name));
    if (!function && needed) throw std::runtime_error(fmt::format("{} does not export {}", file_, name));
  };
  find(exports_.qxsmmd, "qxsmmd", true);
  find(exports_.qxsmreorder, "qxsmreorder", true);
  find(exports_.qxsmsymbfact, "qxsmsymbfact", true);
  find(exports_.qxsmnumfact, "qxsmnumfact", true);
  find(exports_.qxsmmultv, "qxsmmultv", true);
  find(exports_.qxsmcopyv, "qxsmcopyv", true);
  find(exports_.qxsmtraceinvAB, "qxsmtraceinvAB", true);
  find(exports_.qxsmorder, "qxsmorder", false);
  find(exports_.qxsmrefill, "qxsmrefill", false);
  find(exports_.qxsminvpattern, "qxsminvpattern", false);
}

void Module::keep_freed_memory(Kept kept) {
  const auto pages = static_cast<std::uint64_t>(sysconf(_SC_PHYS_PAGES));
  const auto page = static_cast<std::uint64_t>(sysconf(_SC_PAGESIZE));
  host_.set_kept_memory(kept == Kept::much ? pages * page / 2 : kUsual);
}

Module::~Module() {
  if (library_) dlclose(library_);
}

}  // namespace sm::bench
