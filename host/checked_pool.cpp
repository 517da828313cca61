// The pool of the checking mode: each block by a malloc of its own with a guard behind it, each free looked up before
// memory is touched, each destroyed pool kept so that a late call is counted instead of crashing.
#include <sanitizer/asan_interface.h>

#include <cstdlib>
#include <cstring>

#include "host/checker.hpp"

namespace sm::host {
namespace {

constexpr std::uint64_t kGuard = 64;
constexpr int kGuardByte = 0xA7;
constexpr int kFreshByte = 0xCB;  // what a block holds that was not asked for zeros: no plausible number or pointer
constexpr int kFreedByte = 0xDB;
constexpr std::uint64_t kScrubbed = std::uint64_t{1} << 20;  // of a larger block only the beginning is scrubbed
constexpr std::int64_t kDeadKept = std::int64_t{1} << 16;

CheckedPool& pool_of(MemoryPool* table) { return static_cast<CheckedPool&>(head_of(table)); }
Checker& checker_of(const CheckedPool& pool) { return *pool.host->checker; }

void scrub(char* block, std::uint64_t bytes, int value) {
  std::memset(block, value, bytes < kScrubbed ? bytes : kScrubbed);
}

// Under AddressSanitizer the guard is also closed to the program, so that the report names the writer.
void set_guard(const BlockRecord& record) {
  std::memset(record.block + record.bytes, kGuardByte, kGuard);
  ASAN_POISON_MEMORY_REGION(record.block + record.bytes, kGuard);
}

void check_guard(Checker& checker, BlockRecord& record) {
  const char* guard = record.block + record.bytes;
  ASAN_UNPOISON_MEMORY_REGION(guard, kGuard);
  bool whole = true;
  for (std::uint64_t i = 0; i < kGuard; ++i) whole = whole && static_cast<unsigned char>(guard[i]) == kGuardByte;
  ASAN_POISON_MEMORY_REGION(guard, kGuard);
  if (whole || record.overrun) return;
  record.overrun = true;
  ++checker.found.overruns;
}

// Takes a block back from a live pool.
void end_block(CheckedPool& pool, BlockRecord& record) {
  Checker& checker = checker_of(pool);
  check_guard(checker, record);
  if (record.next) record.next->previous = record.previous;
  (record.previous ? record.previous->next : pool.blocks) = record.next;
  refund(pool, record.bytes);
  --checker.blocks_live;
  char* block = record.block;
  ASAN_UNPOISON_MEMORY_REGION(block + record.bytes, kGuard);
  scrub(block, record.bytes, kFreedByte);
  end_record(checker.records, record);
  std::free(block);
}

// Keeps the pool object for late calls; the oldest one goes when there are too many.
void bury(CheckedPool& pool) {
  Checker& checker = checker_of(pool);
  pool.dead = true;
  (checker.youngest_dead ? checker.youngest_dead->buried_after : checker.oldest_dead) = &pool;
  checker.youngest_dead = &pool;
  if (++checker.dead_count > kDeadKept) {
    CheckedPool* oldest = checker.oldest_dead;
    checker.oldest_dead = oldest->buried_after;
    --checker.dead_count;
    std::free(oldest);
  }
}

bool is_dead(const CheckedPool& pool) {
  if (pool.dead) ++checker_of(pool).found.dead_pools;
  return pool.dead;
}

void* allocate(MemoryPool* table, std::uint64_t bytes, std::uint32_t flags) {
  if (!table) return nullptr;
  CheckedPool& pool = pool_of(table);
  if (is_dead(pool) || refuses(*pool.host, QXHOST_FAIL_BLOCKS)) return nullptr;
  if (!has_room(pool, bytes) || bytes > kLargestBlock) return nullptr;
  const bool zero = (flags & SM_POOL_ZERO) != 0;
  auto* block = static_cast<char*>(zero ? std::calloc(1, bytes + kGuard) : std::malloc(bytes + kGuard));
  if (!block) return nullptr;
  Checker& checker = checker_of(pool);
  BlockRecord* record = begin_record(checker.records, block);
  if (!record) {
    std::free(block);
    return nullptr;
  }
  record->bytes = bytes;
  record->pool = &pool;
  record->previous = nullptr;
  record->next = pool.blocks;
  if (pool.blocks) pool.blocks->previous = record;
  pool.blocks = record;
  if (!zero) scrub(block, bytes, kFreshByte);
  set_guard(*record);
  charge(pool, bytes);
  ++checker.blocks_live;
  return block;
}

void free_block(MemoryPool* table, void* block) {
  if (!table || !block) return;
  CheckedPool& pool = pool_of(table);
  if (is_dead(pool)) return;
  Checker& checker = checker_of(pool);
  BlockRecord* record = find_record(checker.records, block);
  if (record && record->pool == &pool) {
    end_block(pool, *record);
  } else if (record && !record->pool) {
    ++checker.found.double_frees;
  } else {
    ++checker.found.foreign_frees;
  }
}

void destroy(MemoryPool* table) {
  if (!table) return;
  CheckedPool& pool = pool_of(table);
  if (is_dead(pool)) return;
  while (pool.blocks) end_block(pool, *pool.blocks);
  retire(pool);
  bury(pool);
}

}  // namespace

MemoryPool* create_checked_pool(QxHost& host) {
  auto* pool = static_cast<CheckedPool*>(std::calloc(1, sizeof(CheckedPool)));
  if (!pool) return nullptr;
  pool->table.destroy = destroy;
  pool->table.allocate = allocate;
  pool->table.free = free_block;
  enlist(*pool, host);
  return &pool->table;
}

void look_for_overruns(QxHost& host) {
  for (PoolHead* head = host.pools; head; head = head->next) {
    auto& pool = static_cast<CheckedPool&>(*head);
    for (BlockRecord* record = pool.blocks; record; record = record->next) check_guard(*host.checker, *record);
  }
}

void discard_checker(Checker* checker) {
  if (!checker) return;
  while (CheckedPool* pool = checker->oldest_dead) {
    checker->oldest_dead = pool->buried_after;
    std::free(pool);
  }
  while (WatchedTrees* trees = checker->trees) {
    checker->trees = trees->next;
    std::free(trees);
  }
  discard_records(checker->records);
  std::free(checker);
}

}  // namespace sm::host
