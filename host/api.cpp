// The C API of the embedded host and the services it hands to extensions.
#include <algorithm>
#include <cstdlib>

#include "host/checker.hpp"

namespace {

using sm::host::Checker;
using sm::host::FaultPlan;
using sm::host::PoolHead;

QxHost& host_of(HostServices* kernel) { return *reinterpret_cast<QxHost*>(kernel); }

MemoryPool* create_pool(HostServices* kernel, const PoolParms*, void*, const char*) {
  if (!kernel) return nullptr;
  QxHost& host = host_of(kernel);
  if (sm::host::refuses(host, QXHOST_FAIL_POOLS)) return nullptr;
  return host.checker ? sm::host::create_checked_pool(host) : sm::host::create_chunk_pool(host);
}

void* load_extension(HostServices* kernel, const wchar_t* name, std::int64_t length, void*) {
  if (!kernel) return nullptr;
  QxHost& host = host_of(kernel);
  if (sm::host::refuses(host, QXHOST_FAIL_EXTENSIONS)) {
    return sm::host::load_failed(host.loader, {"extension load: refused by the planned fault"});
  }
  return sm::host::load_extension(host, name, length);
}

}  // namespace

bool sm::host::refuses(QxHost& host, std::int32_t kind) {
  if (!host.checker) return false;
  ++host.checker->requests;
  FaultPlan& plan = host.checker->fault;
  if (!plan.armed || (plan.what & kind) == 0) return false;
  if (plan.ahead > 0) {
    --plan.ahead;
    return false;
  }
  ++plan.refused;
  plan.armed = plan.for_ever;
  return true;
}

extern "C" QxHost* qxhost_create(const QxHostOptions* options) {
  auto* host = static_cast<QxHost*>(std::calloc(1, sizeof(QxHost)));
  if (!host) return nullptr;
  host->services.create_pool = create_pool;
  host->services.load_extension = load_extension;
  host->kept_pages.set_limit(sm::host::KeptPages::kUsualLimit);
  bool complete = sm::host::begin_search_beside_host(host->loader);
  if (options) {
    host->account.ceiling = options->memory_ceiling;
    if (options->checking) {
      host->checker = static_cast<Checker*>(std::calloc(1, sizeof(Checker)));
      complete = complete && host->checker;
    }
  }
  if (complete) return host;
  qxhost_destroy(host);
  return nullptr;
}

extern "C" void qxhost_destroy(QxHost* host) {
  if (!host) return;
  while (PoolHead* pool = host->pools) pool->table.destroy(&pool->table);
  host->kept_pages.trim();
  sm::host::unload_all(host->loader);
  sm::host::discard_checker(host->checker);
  std::free(host);
}

extern "C" HostServices* qxhost_services(QxHost* host) { return &host->services; }

extern "C" int32_t qxhost_add_search_path(QxHost* host, const char* directory) {
  return sm::host::add_search_path(host->loader, directory) ? 0 : -1;
}

extern "C" void* qxhost_load_extension(QxHost* host, const wchar_t* name, int64_t length) {
  return sm::host::load_extension(*host, name, length);
}

extern "C" const char* qxhost_last_error(const QxHost* host) { return host->loader.error; }

extern "C" void qxhost_set_memory_ceiling(QxHost* host, uint64_t bytes) { host->account.ceiling = bytes; }

extern "C" void qxhost_trim(QxHost* host) { host->kept_pages.trim(); }

extern "C" void qxhost_set_kept_memory(QxHost* host, uint64_t bytes) {
  host->kept_pages.set_limit(std::min(bytes, sm::host::kLargestBlock));
}

extern "C" int32_t qxhost_set_pool_ceiling(QxHost* host, MemoryPool* pool, uint64_t bytes) {
  PoolHead* head = host->pools;
  while (head && &head->table != pool) head = head->next;
  if (!head) return -1;
  head->account.ceiling = bytes;
  return 0;
}

extern "C" QxHostUsage qxhost_usage(const QxHost* host) {
  const Checker* checker = host->checker;
  return {host->account.in_use, host->account.peak, host->pools_live, checker ? checker->blocks_live : 0,
          checker ? checker->requests : 0};
}

extern "C" int32_t qxhost_ceiling_was_met(const QxHost* host) { return host->ceiling_met ? 1 : 0; }

extern "C" void qxhost_fail_request(QxHost* host, int32_t what, int64_t k, int32_t for_ever) {
  if (!host->checker) return;
  host->checker->fault = {k >= 0, for_ever != 0, what, k, 0};
}

extern "C" int64_t qxhost_stop_failing(QxHost* host) {
  if (!host->checker) return 0;
  const std::int64_t refused = host->checker->fault.refused;
  host->checker->fault = {};
  return refused;
}

extern "C" QxHostViolations qxhost_violations(QxHost* host) {
  if (!host->checker) return {};
  sm::host::look_for_overruns(*host);
  return host->checker->found;
}
