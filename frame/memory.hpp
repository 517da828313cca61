// Memory from the host's pools: guarded sizes, blocks on loan, and pools that come and go.
#pragma once

#include <span>
#include <type_traits>

#include "frame/core.hpp"

namespace sm {

enum class Fill { none, zero };

// Bytes of `count` elements of `each` bytes. 105 when there would be more than 2^53 elements or 2^64 bytes.
[[nodiscard]] inline SmStatus byte_count(i64 count, std::uint64_t each, std::uint64_t& bytes) {
  if (count < 0 || count > SM_MAX_ELEMENTS) return SM_TOO_LARGE;
  return __builtin_mul_overflow(static_cast<std::uint64_t>(count), each, &bytes) ? SM_TOO_LARGE : SM_OK;
}

// `count` elements for keeps; null in `out` when the answer is not 0. A count of 0 asks for nothing.
template <class T>
[[nodiscard]] SmStatus allocate(MemoryPool* pool, i64 count, Fill fill, T*& out) {
  static_assert(std::is_trivially_copyable_v<T>, "raw host memory: nothing is constructed");
  out = nullptr;
  std::uint64_t bytes = 0;
  SM_TRY(byte_count(count, sizeof(T), bytes));
  if (count == 0) return SM_OK;
  if (!pool) return SM_NO_MEMORY;
  out = static_cast<T*>(pool->allocate(pool, bytes, fill == Fill::zero ? SM_POOL_ZERO : 0U));
  return out ? SM_OK : SM_NO_MEMORY;
}

// Gives a block back and forgets it.
template <class T>
void give_back(MemoryPool* pool, T*& block) {
  if (block && pool) pool->free(pool, block);
  block = nullptr;
}

// Work memory: goes back by itself unless it is released to a longer life.
template <class T>
class Scratch {
 public:
  Scratch() = default;
  ~Scratch() { sm::give_back(pool_, block_); }
  Scratch(const Scratch&) = delete;
  Scratch& operator=(const Scratch&) = delete;

  [[nodiscard]] SmStatus take(MemoryPool* pool, i64 count, Fill fill = Fill::none) {
    sm::give_back(pool_, block_);
    pool_ = pool;
    SM_TRY(allocate(pool, count, fill, block_));
    count_ = count;
    return SM_OK;
  }
  T* data() { return block_; }
  const T* data() const { return block_; }
  std::span<T> span() { return {block_, static_cast<std::size_t>(count_)}; }
  T* release() {
    T* block = block_;
    block_ = nullptr;
    return block;
  }

 private:
  MemoryPool* pool_ = nullptr;
  T* block_ = nullptr;
  i64 count_ = 0;
};

// A pool from the host, or null.
inline MemoryPool* create_pool(std::uint64_t flag, void* owner, const char* name) {
  HostServices* host = Exported_QXHandle;
  const PoolParms parms = {flag, {0, 0}};
  return host ? host->create_pool(host, &parms, owner, name) : nullptr;
}

// Destroys a pool, with every block in it, and forgets it.
inline void destroy_pool(MemoryPool*& pool) {
  if (pool) pool->destroy(pool);
  pool = nullptr;
}

// A record that was reset and then tied has no pool until an operation needs one.
[[nodiscard]] inline SmStatus need_pool(SmMatrix& m) {
  if (!m.pool) m.pool = create_pool(SM_POOL_MATRIX, nullptr, nullptr);
  return m.pool ? SM_OK : SM_NO_MEMORY;
}

}  // namespace sm
