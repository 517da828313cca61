// Records of blocks in the checking mode: a chained hash table by address, and a queue of the freed ones.
#include <cstdlib>

#include "host/checker.hpp"

namespace sm::host {
namespace {

constexpr std::uint64_t kFirstBuckets = 1024;
constexpr std::uint64_t kFreedKept = std::uint64_t{1} << 20;

// Multiplicative hashing (Knuth, The Art of Computer Programming 3, 6.4); blocks are aligned, so low bits say nothing.
BlockRecord** bucket_of(const Records& records, const void* block) {
  const std::uint64_t mixed = (reinterpret_cast<std::uintptr_t>(block) >> 4) * UINT64_C(0x9E3779B97F4A7C15);
  return &records.buckets[(mixed >> 32) & (records.bucket_count - 1)];
}

bool grow(Records& records) {
  const std::uint64_t count = records.bucket_count ? records.bucket_count * 2 : kFirstBuckets;
  auto** buckets = static_cast<BlockRecord**>(std::calloc(count, sizeof(BlockRecord*)));
  if (!buckets) return records.bucket_count != 0;  // a crowded table still works
  const Records old = records;
  records.buckets = buckets;
  records.bucket_count = count;
  for (std::uint64_t b = 0; b < old.bucket_count; ++b) {
    while (BlockRecord* record = old.buckets[b]) {
      old.buckets[b] = record->same_bucket;
      BlockRecord** bucket = bucket_of(records, record->block);
      record->same_bucket = *bucket;
      *bucket = record;
    }
  }
  std::free(old.buckets);
  return true;
}

void leave_freed(Records& records, BlockRecord& record) {
  (record.previous ? record.previous->next : records.oldest_freed) = record.next;
  (record.next ? record.next->previous : records.youngest_freed) = record.previous;
  record.previous = record.next = nullptr;
  --records.freed_count;
}

void forget(Records& records, BlockRecord& record) {
  BlockRecord** link = bucket_of(records, record.block);
  while (*link != &record) link = &(*link)->same_bucket;
  *link = record.same_bucket;
  --records.count;
  std::free(&record);
}

}  // namespace

BlockRecord* find_record(const Records& records, const void* block) {
  if (records.bucket_count == 0) return nullptr;
  BlockRecord* record = *bucket_of(records, block);
  while (record && record->block != block) record = record->same_bucket;
  return record;
}

BlockRecord* begin_record(Records& records, char* block) {
  if (BlockRecord* record = find_record(records, block)) {
    leave_freed(records, *record);
    record->overrun = false;
    return record;
  }
  if (records.count >= records.bucket_count && !grow(records)) return nullptr;
  auto* record = static_cast<BlockRecord*>(std::calloc(1, sizeof(BlockRecord)));
  if (!record) return nullptr;
  record->block = block;
  BlockRecord** bucket = bucket_of(records, block);
  record->same_bucket = *bucket;
  *bucket = record;
  ++records.count;
  return record;
}

void end_record(Records& records, BlockRecord& record) {
  record.pool = nullptr;
  record.next = nullptr;
  record.previous = records.youngest_freed;
  (records.youngest_freed ? records.youngest_freed->next : records.oldest_freed) = &record;
  records.youngest_freed = &record;
  if (++records.freed_count > kFreedKept) {
    BlockRecord* oldest = records.oldest_freed;
    leave_freed(records, *oldest);
    forget(records, *oldest);
  }
}

void discard_records(Records& records) {
  for (std::uint64_t b = 0; b < records.bucket_count; ++b) {
    while (BlockRecord* record = records.buckets[b]) {
      records.buckets[b] = record->same_bucket;
      std::free(record);
    }
  }
  std::free(records.buckets);
  records = {};
}

}  // namespace sm::host
