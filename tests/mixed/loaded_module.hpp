// The module loaded for a test, as the library meets it.
#pragma once

#include <cstdint>

#include "cli/module_session.hpp"

namespace sm::mixed::test {

class LoadedModule {
 public:
  LoadedModule() : session_(UINT64_C(8) << 30), module_(cli::mixed_module(session_)) {}
  LoadedModule(const LoadedModule&) = delete;
  LoadedModule& operator=(const LoadedModule&) = delete;

  Module& module() { return module_; }

 private:
  cli::ModuleSession session_;
  Module module_;
};

}  // namespace sm::mixed::test
