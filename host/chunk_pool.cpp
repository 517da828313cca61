// The pool of normal operation. Three tiers, told apart by a tag in front of each block:
//   small   up to 4 KiB, from chunks, by size class; freed blocks wait in their class for the next request
//   medium  each from malloc
//   large   each on pages of its own: fresh ones are zero without being touched; freed ones wait in the host for a while
// Medium and large blocks are chained, so that destroying the pool finds them.
#include <bit>
#include <cstdlib>
#include <cstring>

#include "host/core.hpp"

namespace sm::host {
namespace {

constexpr std::uint64_t kSmall = 4096;
constexpr std::uint64_t kLarge = std::uint64_t{128} << 10;
constexpr std::uint64_t kFirstChunk = std::uint64_t{4} << 10;
constexpr std::uint64_t kLastChunk = std::uint64_t{256} << 10;

constexpr std::uint32_t kClasses = 32;  // 16-byte steps up to 256, then four to a doubling
constexpr std::uint32_t kMediumTier = kClasses;
constexpr std::uint32_t kLargeTier = kClasses + 1;

constexpr std::uint32_t class_of(std::uint64_t bytes) {
  if (bytes <= 256) return bytes == 0 ? 0 : static_cast<std::uint32_t>((bytes - 1) / 16);
  const std::uint64_t last = bytes - 1;
  const auto width = static_cast<std::uint32_t>(std::bit_width(last));
  return 16 + (width - 9) * 4 + static_cast<std::uint32_t>((last >> (width - 3)) & 3);
}

constexpr std::uint64_t class_bytes(std::uint32_t size_class) {
  if (size_class < 16) return (std::uint64_t{size_class} + 1) * 16;
  return std::uint64_t{5 + (size_class - 16) % 4} << (6 + (size_class - 16) / 4);
}

static_assert(class_of(1) == 0 && class_of(16) == 0 && class_of(17) == 1 && class_of(256) == 15);
static_assert(class_of(257) == 16 && class_bytes(16) == 320 && class_of(320) == 16 && class_of(321) == 17);
static_assert(class_of(kSmall) == kClasses - 1 && class_bytes(kClasses - 1) == kSmall);

// Directly in front of every block.
struct Tag {
  std::uint64_t bytes;  // as requested
  std::uint32_t tier;   // a size class, kMediumTier or kLargeTier
  std::uint32_t unused;
};

// In front of medium and large blocks; ends with the tag.
struct BigHead {
  BigHead* previous;
  BigHead* next;
  std::uint64_t span;  // bytes of the memory that begins here
  std::uint64_t unused[3];
  Tag tag;
};
static_assert(sizeof(Tag) == 16 && sizeof(BigHead) == 64, "blocks stay aligned");

struct Chunk {
  Chunk* next;
  std::uint64_t unused;
};
static_assert(sizeof(Chunk) == 16, "the first block of a chunk stays aligned");

struct FreeBlock {
  FreeBlock* next;
};

struct ChunkPool : PoolHead {
  Chunk* chunks;
  char* fresh;  // rest of the newest chunk
  std::uint64_t fresh_bytes;
  std::uint64_t chunk_bytes;  // of the next chunk
  BigHead* big;
  FreeBlock* free_blocks[kClasses];
};

ChunkPool& pool_of(MemoryPool* table) { return static_cast<ChunkPool&>(head_of(table)); }

Tag& tag_of(void* block) { return static_cast<Tag*>(block)[-1]; }
BigHead& big_head_of(void* block) { return static_cast<BigHead*>(block)[-1]; }

bool add_chunk(ChunkPool& pool) {
  auto* chunk = static_cast<Chunk*>(std::malloc(pool.chunk_bytes));
  if (!chunk) return false;
  chunk->next = pool.chunks;
  pool.chunks = chunk;
  pool.fresh = reinterpret_cast<char*>(chunk + 1);
  pool.fresh_bytes = pool.chunk_bytes - sizeof(Chunk);
  if (pool.chunk_bytes < kLastChunk) pool.chunk_bytes *= 2;
  return true;
}

void* take_small(ChunkPool& pool, std::uint64_t bytes, bool zero) {
  const std::uint32_t size_class = class_of(bytes);
  void* block = pool.free_blocks[size_class];
  if (block) {
    pool.free_blocks[size_class] = pool.free_blocks[size_class]->next;
  } else {
    const std::uint64_t need = sizeof(Tag) + class_bytes(size_class);
    while (pool.fresh_bytes < need) {
      if (!add_chunk(pool)) return nullptr;
    }
    block = pool.fresh + sizeof(Tag);
    pool.fresh += need;
    pool.fresh_bytes -= need;
  }
  tag_of(block) = {bytes, size_class, 0};
  if (zero) std::memset(block, 0, bytes);
  return block;
}

// A large block begins on its second page, the head ends the first.
constexpr std::uint64_t kLargeHead = KeptPages::kPage;

void* take_big(ChunkPool& pool, std::uint64_t bytes, bool zero) {
  Pages memory = {nullptr, sizeof(BigHead) + bytes};
  const bool large = bytes >= kLarge;
  if (large) {
    memory = pool.host->kept_pages.take(kLargeHead + bytes, zero);
  } else {
    memory.start = zero ? std::calloc(1, memory.span) : std::malloc(memory.span);
  }
  if (!memory.start) return nullptr;
  auto* block = static_cast<char*>(memory.start) + (large ? kLargeHead : sizeof(BigHead));
  BigHead& head = big_head_of(block);
  head = {nullptr, pool.big, memory.span, {}, {bytes, large ? kLargeTier : kMediumTier, 0}};
  if (pool.big) pool.big->previous = &head;
  pool.big = &head;
  return block;
}

void give_back(ChunkPool& pool, BigHead& head) {
  if (head.tag.tier == kLargeTier) {
    pool.host->kept_pages.give({reinterpret_cast<char*>(&head + 1) - kLargeHead, head.span});
  } else {
    std::free(&head);
  }
}

void* allocate(MemoryPool* table, std::uint64_t bytes, std::uint32_t flags) {
  if (!table) return nullptr;
  ChunkPool& pool = pool_of(table);
  if (!has_room(pool, bytes) || bytes > kLargestBlock) return nullptr;
  const bool zero = (flags & SM_POOL_ZERO) != 0;
  void* block = bytes <= kSmall ? take_small(pool, bytes, zero) : take_big(pool, bytes, zero);
  if (block) charge(pool, bytes);
  return block;
}

void free_block(MemoryPool* table, void* block) {
  if (!table || !block) return;
  ChunkPool& pool = pool_of(table);
  const Tag tag = tag_of(block);
  refund(pool, tag.bytes);
  if (tag.tier < kClasses) {
    auto* freed = static_cast<FreeBlock*>(block);
    freed->next = pool.free_blocks[tag.tier];
    pool.free_blocks[tag.tier] = freed;
    return;
  }
  BigHead& head = big_head_of(block);
  if (head.next) head.next->previous = head.previous;
  (head.previous ? head.previous->next : pool.big) = head.next;
  give_back(pool, head);
}

void destroy(MemoryPool* table) {
  if (!table) return;
  ChunkPool& pool = pool_of(table);
  retire(pool);
  while (BigHead* head = pool.big) {
    pool.big = head->next;
    give_back(pool, *head);
  }
  while (Chunk* chunk = pool.chunks) {
    pool.chunks = chunk->next;
    std::free(chunk);
  }
  std::free(&pool);
}

}  // namespace

MemoryPool* create_chunk_pool(QxHost& host) {
  auto* pool = static_cast<ChunkPool*>(std::calloc(1, sizeof(ChunkPool)));
  if (!pool) return nullptr;
  pool->table.destroy = destroy;
  pool->table.allocate = allocate;
  pool->table.free = free_block;
  pool->chunk_bytes = kFirstChunk;
  enlist(*pool, host);
  return &pool->table;
}

}  // namespace sm::host
