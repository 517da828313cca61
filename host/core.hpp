// The host object and what its parts share. Nothing here throws: memory comes from malloc and mmap, null is checked.
#pragma once

#include <qxhost/qxhost.h>

#include <climits>
#include <cstddef>
#include <cstdint>
#include <initializer_list>

#include "host/kept_pages.hpp"

namespace sm::host {

// Bytes handed out, counted as they were requested, against a ceiling (0: none).
struct Account {
  std::uint64_t in_use;
  std::uint64_t peak;
  std::uint64_t ceiling;

  bool has_room_for(std::uint64_t bytes) const {
    return ceiling == 0 || (bytes <= ceiling && in_use <= ceiling - bytes);  // in_use may be above a lowered ceiling
  }
  void add(std::uint64_t bytes) {
    in_use += bytes;
    if (in_use > peak) peak = in_use;
  }
  void subtract(std::uint64_t bytes) { in_use -= bytes; }
};

// What every pool begins with, whichever way it serves blocks.
struct PoolHead {
  MemoryPool table;  // first: the module knows the pool by this address
  QxHost* host;
  PoolHead* previous;  // live pools of the host
  PoolHead* next;
  Account account;
};

inline PoolHead& head_of(MemoryPool* pool) { return *reinterpret_cast<PoolHead*>(pool); }

// A request that a test planned to be refused.
struct FaultPlan {
  bool armed;
  bool for_ever;
  std::int32_t what;   // QXHOST_FAIL_...
  std::int64_t ahead;  // requests of these kinds that still pass
  std::int64_t refused;
};

struct Checker;
struct WatchedTrees;

struct SearchPath {
  SearchPath* next;
  char* directory;
};

struct LoadedLibrary {
  LoadedLibrary* next;
  void* handle;
};

// Extensions: where they are looked for, which are loaded, why the last load failed.
struct Loader {
  SearchPath* paths;  // first the folder of the host library
  LoadedLibrary* libraries;
  std::int64_t failures;
  char error[PATH_MAX + 1024];
};

}  // namespace sm::host

struct QxHost {
  HostServices services;  // first: it is what the module gets as its kernel
  sm::host::Account account;
  sm::host::PoolHead* pools;
  std::int64_t pools_live;
  bool ceiling_met;
  sm::host::KeptPages kept_pages;
  sm::host::Loader loader;
  sm::host::Checker* checker;  // null outside the checking mode
};

namespace sm::host {

// Sizes above this cannot be had from any allocator; refusing them first keeps size arithmetic from wrapping.
inline constexpr std::uint64_t kLargestBlock = std::uint64_t{1} << 47;

// Whether both ceilings leave room for `bytes`; records that a ceiling was met when not.
bool has_room(PoolHead& pool, std::uint64_t bytes);
void charge(PoolHead& pool, std::uint64_t bytes);
void refund(PoolHead& pool, std::uint64_t bytes);

// Enters a pool into the host's list, and takes it out again together with what it still had out.
void enlist(PoolHead& pool, QxHost& host);
void retire(PoolHead& pool);

// A pool that serves small blocks from chunks and large ones from pages of their own; null when memory is short.
MemoryPool* create_chunk_pool(QxHost& host);

// Adds a folder at the end of the search. False when memory is short or the folder is null or empty.
bool add_search_path(Loader& loader, const char* directory);
// The folder of the host library itself becomes the first one. False when it cannot be told.
bool begin_search_beside_host(Loader& loader);
// Loads an extension as qxhost_load_extension promises.
void* load_extension(QxHost& host, const wchar_t* name, std::int64_t length);
// Records why a load failed, as one line made of the parts; answers null for the caller to return.
std::nullptr_t load_failed(Loader& loader, std::initializer_list<const char*> parts);
// Closes every library and forgets every path.
void unload_all(Loader& loader);

}  // namespace sm::host
