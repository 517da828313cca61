#include "cli/module_session.hpp"

#include <dlfcn.h>
#include <fmt/core.h>

#include "cli/error.hpp"
#include "cli/format.hpp"

namespace sm::cli {
namespace {

constexpr const char* kReinstall = "reinstall qxesm, so that libqxesm.so and libqxeavl.so stand beside libqxhost.so";

[[noreturn]] void fail(std::string what, std::string advice) {
  throw CommandError({.code = ExitCode::no_memory, .what = std::move(what), .advice = std::move(advice)});
}

}  // namespace

ModuleSession::ModuleSession(std::uint64_t ceiling) : ceiling_(ceiling) {
  QxHostOptions options{};
  options.memory_ceiling = ceiling;
  host_ = qxhost_create(&options);
  if (!host_) fail("out of memory: the host could not be created", "end other programs");
  try {
    extension_ = static_cast<SmExtension*>(qxhost_load_extension(host_, L"qxesm", 5));
    if (!extension_) refuse_load();
    instance_ = extension_->CreateInstance(extension_);
    if (!instance_) expect_ok(SM_NO_MEMORY, "creating an instance of the module");
    find_steps();
  } catch (...) {
    release();
    throw;
  }
}

ModuleSession::~ModuleSession() { release(); }

void ModuleSession::release() {
  if (library_) dlclose(library_);
  if (instance_) instance_->functions->qxsmDestroyInstance(&instance_);
  if (extension_) extension_->qxsmDestroyExtension(extension_);
  qxhost_destroy(host_);
}

void ModuleSession::refuse_load() {
  if (qxhost_ceiling_was_met(host_)) expect_ok(SM_NO_MEMORY, "loading the module");
  fail(fmt::format("the module cannot be loaded ({})", qxhost_last_error(host_)), kReinstall);
}

// The library that an operation of the table lives in has the rest by name.
void ModuleSession::find_steps() {
  Dl_info info{};
  if (dladdr(reinterpret_cast<void*>(fn().qxsmfact), &info) == 0 || !info.dli_fname) {
    fail("the module's library cannot be found again", kReinstall);
  }
  library_ = dlopen(info.dli_fname, RTLD_LAZY | RTLD_NOLOAD);
  if (!library_) fail(fmt::format("{} is not loaded", info.dli_fname), kReinstall);
  const auto find = [&](auto& step, const char* name) {
    step = reinterpret_cast<std::remove_reference_t<decltype(step)>>(dlsym(library_, name));
    if (!step) fail(fmt::format("{} does not export {}", info.dli_fname, name), kReinstall);
  };
  find(steps_.qxsmmd, "qxsmmd");
  find(steps_.qxsmorder, "qxsmorder");
  find(steps_.qxsmreorder, "qxsmreorder");
  find(steps_.qxsmsymbfact, "qxsmsymbfact");
  find(steps_.qxsmnumfact, "qxsmnumfact");
  find(steps_.qxsmrefill, "qxsmrefill");
  find(steps_.qxsminvpattern, "qxsminvpattern");
  find(steps_.qxsminvmultv, "qxsminvmultv");
  find(steps_.qxsmtraceinvAB, "qxsmtraceinvAB");
  find(steps_.qxsmcopyv, "qxsmcopyv");
  find(steps_.qxsmsetprogress, "qxsmsetprogress");
}

void ModuleSession::expect_ok(SmStatus status, const std::string& doing) const {
  if (status == SM_OK) return;
  if (status == SM_NO_MEMORY && qxhost_ceiling_was_met(host_)) {
    fail(fmt::format("out of memory while {}: the ceiling of {} (--memory) was met", doing,
                     bytes_text(static_cast<double>(ceiling_))),
         "raise --memory, or use a machine with more memory");
  }
  if (status == SM_NO_MEMORY) fail("out of memory while " + doing, "end other programs, or use a larger machine");
  if (status == SM_TOO_LARGE) {
    fail(fmt::format("out of memory while {}: more than 2^53 elements would be needed", doing),
         "the matrix is too large to be factored");
  }
  fail(fmt::format("{} ended with the unexpected status {}", doing, status), "please report this, with the matrix");
}

mixed::Module mixed_module(ModuleSession& session) {
  mixed::Module module;
  static_cast<mixed::ExportedOperations&>(module) = session.steps();
  module.instance = session.instance();
  module.expect_ok = [&session](SmStatus status, const std::string& doing) { session.expect_ok(status, doing); };
  return module;
}

}  // namespace sm::cli
