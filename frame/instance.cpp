// Creation and destruction of instances, and the registry through which destruction finds every matrix.
#include "frame/instance.hpp"

#include <algorithm>
#include <bit>
#include <cstring>

#include "frame/memory.hpp"

namespace sm {

namespace {

constexpr i64 kRegistryStep = 10;
constexpr std::uint64_t kBlockSlack = 16;

template <class T>
SmStatus take_block(MemoryPool* pool, T*& block) {
  void* raw = block;
  const SmStatus status = zeroed_block(pool, &raw, sizeof(T));
  block = static_cast<T*>(raw);
  return status;
}

SmStatus build_blocks(SmInstance& instance) {
  SM_TRY(take_block(instance.pool, instance.functions));
  SM_TRY(take_block(instance.pool, instance.spare_word));
  void* settings = nullptr;
  SM_TRY(zeroed_block(instance.pool, &settings, 4 * sizeof(double)));
  instance.tolerances = static_cast<double*>(settings);
  return SM_OK;
}

}  // namespace

SmStatus zeroed_block(MemoryPool* pool, void** block, std::uint64_t bytes) {
  const std::uint64_t size = bytes / 8 * 8 + kBlockSlack;
  if (*block) {
    std::memset(*block, 0, size);
    return SM_OK;
  }
  *block = pool->allocate(pool, size, SM_POOL_ZERO);
  return *block ? SM_OK : SM_NO_MEMORY;
}

SmStatus register_matrix(SmInstance& instance, SmMatrix* matrix) {
  if (instance.matrix_count == instance.matrix_capacity) {
    const i64 capacity = instance.matrix_capacity + kRegistryStep;
    SmMatrix** grown = nullptr;
    SM_TRY(allocate(instance.pool, capacity, Fill::zero, grown));
    std::copy_n(instance.registry, instance.matrix_count, grown);
    give_back(instance.pool, instance.registry);
    instance.registry = grown;
    instance.matrix_capacity = capacity;
  }
  matrix->registry_index = ++instance.matrix_count;
  instance.registry[matrix->registry_index - 1] = matrix;
  return SM_OK;
}

}  // namespace sm

extern "C" SmStatus qxsmGetANewInstance(SmInstance** instance) {
  *instance = nullptr;
  MemoryPool* pool = sm::create_pool(SM_POOL_INSTANCE, nullptr, "WORKPOOL");
  if (!pool) return SM_NO_MEMORY;
  SmInstance* made = nullptr;
  if (sm::allocate(pool, 1, sm::Fill::zero, made) != SM_OK) {
    sm::destroy_pool(pool);
    return SM_NO_MEMORY;
  }
  made->pool = pool;
  *instance = made;
  if (sm::build_blocks(*made) != SM_OK) return SM_NOTHING_TO_REPORT;
  std::fill_n(made->tolerances, 3, std::bit_cast<double>(SM_TOLERANCE_BITS));
  made->tolerances[3] = std::bit_cast<double>(SM_DROP_TOLERANCE_BITS);
  sm::fill_table(*made->functions);
  *made->spare_word = 0;
  return SM_OK;
}

extern "C" SmStatus qxsmDestroyInstance(SmInstance** instance) {
  if (!instance || !*instance) return SM_OK;
  SmInstance& gone = **instance;
  for (sm::i64 k = 0; k < gone.matrix_count; ++k) {
    if (gone.registry[k]) qxsmdelete(gone.registry[k]);
  }
  MemoryPool* pool = gone.pool;  // the instance lives in it
  sm::destroy_pool(pool);
  *instance = nullptr;
  return SM_OK;
}
