// The module loaded for a test, as the library meets it.
#pragma once

#include <dlfcn.h>

#include <cstdint>
#include <stdexcept>
#include <string>
#include <type_traits>

#include "cli/module_session.hpp"
#include "mixed/module.hpp"

namespace sm::mixed::test {

class LoadedModule {
 public:
  LoadedModule() : session_(UINT64_C(8) << 30) {
    Dl_info info{};
    dladdr(reinterpret_cast<void*>(session_.fn().qxsmfact), &info);
    library_ = dlopen(info.dli_fname, RTLD_LAZY | RTLD_NOLOAD);
    module_.instance = session_.instance();
    find(module_.qxsmmd, "qxsmmd");
    find(module_.qxsmorder, "qxsmorder");
    find(module_.qxsmreorder, "qxsmreorder");
    find(module_.qxsmsymbfact, "qxsmsymbfact");
    find(module_.qxsmnumfact, "qxsmnumfact");
    find(module_.qxsmrefill, "qxsmrefill");
    find(module_.qxsminvpattern, "qxsminvpattern");
    find(module_.qxsminvdiag, "qxsminvdiag");
    find(module_.qxsmsetprogress, "qxsmsetprogress");
    module_.expect_ok = [this](SmStatus status, const std::string& doing) { session_.expect_ok(status, doing); };
  }
  ~LoadedModule() {
    if (library_) dlclose(library_);
  }
  LoadedModule(const LoadedModule&) = delete;
  LoadedModule& operator=(const LoadedModule&) = delete;

  Module& module() { return module_; }
  std::uint64_t peak_bytes() const { return session_.peak_bytes(); }

 private:
  template <class Operation>
  void find(Operation& operation, const char* name) {
    operation = reinterpret_cast<Operation>(dlsym(library_, name));
    if (!operation) throw std::runtime_error(std::string("not exported: ") + name);
  }

  cli::ModuleSession session_;
  void* library_ = nullptr;
  Module module_;
};

}  // namespace sm::mixed::test
