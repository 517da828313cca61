// The checking mode: what it remembers of blocks, pools and tree extensions, and what it found.
#pragma once

#include "host/core.hpp"

namespace sm::host {

struct CheckedPool;

// One address that was handed out. The record outlives the block, so that a second free is told from a foreign one.
struct BlockRecord {
  BlockRecord* same_bucket;
  BlockRecord* previous;  // live: blocks of the same pool; freed: older one
  BlockRecord* next;      // live: blocks of the same pool; freed: younger one
  char* block;
  std::uint64_t bytes;
  CheckedPool* pool;  // null once freed
  bool overrun;       // found and counted
};

// Every record by address, and the freed ones by age.
struct Records {
  BlockRecord** buckets;
  std::uint64_t bucket_count;  // a power of two
  std::uint64_t count;
  std::uint64_t freed_count;
  BlockRecord* oldest_freed;
  BlockRecord* youngest_freed;
};

// Null when the address was never handed out, or so long ago that its record is gone.
BlockRecord* find_record(const Records& records, const void* block);
// The record of a block that malloc just answered: a new one, or the one its address had before. Null: no memory.
BlockRecord* begin_record(Records& records, char* block);
// The block goes back: its record joins the freed ones, and the oldest of them may be forgotten.
void end_record(Records& records, BlockRecord& record);
void discard_records(Records& records);

// A pool that serves every block from malloc by itself.
struct CheckedPool : PoolHead {
  BlockRecord* blocks;
  CheckedPool* buried_after;  // dead pools, oldest first
  bool dead;
};

// A tree extension that the host stands in front of, so that it sees requests for managers.
struct WatchedTrees {
  TreeExtension table;  // first: the module knows the extension by this address
  TreeExtension* real;
  QxHost* host;
  WatchedTrees* next;
  bool dead;
};

struct Checker {
  Records records;
  FaultPlan fault;
  QxHostViolations found;
  std::int64_t requests;
  std::int64_t blocks_live;
  CheckedPool* oldest_dead;
  CheckedPool* youngest_dead;
  std::int64_t dead_count;
  WatchedTrees* trees;
};

// Counts a request of this kind and answers whether the plan refuses it. Never, outside the checking mode.
bool refuses(QxHost& host, std::int32_t kind);

MemoryPool* create_checked_pool(QxHost& host);
// Looks behind every live block of the host.
void look_for_overruns(QxHost& host);
// Ends the memory of dead pools, freed blocks and watched extensions. The live pools are gone by then.
void discard_checker(Checker* checker);

// A table in front of the extension; null when memory is short.
TreeExtension* watch_trees(QxHost& host, TreeExtension* real);

}  // namespace sm::host
