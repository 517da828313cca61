#include "support/minimal_host.h"

#include <stdlib.h>
#include <string.h>
#include <wchar.h>

#include "support/minimal_tree.h"

enum { GUARD = 16, GUARD_BYTE = 0x6E, FRESH_BYTE = 0x5A, FREED_KEPT = 4096 };

/* What the words hold that the module must leave alone. */
#define UNTOUCHED ((void*)(uintptr_t)0x7B7B7B7B7B7B7B7B)

typedef struct Block {
  struct Block* next;
  unsigned char* data;
  uint64_t bytes;
  int overrun;
} Block;

typedef struct Pool {
  MemoryPool table;
  MinimalHost* host;
  struct Pool* next; /* every pool of the host, dead ones too */
  Block* blocks;
  int dead;
} Pool;

typedef struct Extension {
  TreeExtension table;
  MinimalHost* host;
  struct Extension* next;
  int dead;
} Extension;

typedef struct Manager {
  MinimalTree tree;
  MinimalHost* host;
  struct Manager* next;
  int step; /* of the inner object's road: 0 alive, 1 reset, 2 released */
} Manager;

typedef struct Inner {
  TreeInner table;
  Manager* manager;
} Inner;

struct MinimalHost {
  HostServices services;
  MinimalHostCounts counts;
  Pool* pools;
  Extension* extensions;
  Manager* managers;
  void* freed[FREED_KEPT]; /* a ring of addresses, for telling double frees */
  uint64_t freed_next;
  int fault_armed, fault_for_ever;
  int64_t fault_ahead, fault_refused;
};

static int refuses(MinimalHost* host) {
  ++host->counts.requests;
  if (!host->fault_armed) return 0;
  if (host->fault_ahead > 0) {
    --host->fault_ahead;
    return 0;
  }
  ++host->fault_refused;
  host->fault_armed = host->fault_for_ever;
  return 1;
}

static void expect(MinimalHost* host, int condition) {
  if (!condition) ++host->counts.bad_calls;
}

static void mark_untouched(void** words, size_t count) {
  for (size_t i = 0; i < count; ++i) words[i] = UNTOUCHED;
}

static void expect_untouched(MinimalHost* host, void* const* words, size_t count) {
  for (size_t i = 0; i < count; ++i) expect(host, words[i] == UNTOUCHED);
}

/* ---- managers and the tree extension ---- */

static void inner_reset(TreeInner* table, int64_t one, int64_t one_again) {
  Manager* manager = ((Inner*)table)->manager;
  MinimalHostCounts* counts = &manager->host->counts;
  ++counts->inner_resets;
  if (manager->step != 0 || one != 1 || one_again != 1 || !manager->tree.table.cleared_word) ++counts->inner_mistakes;
  manager->step = 1;
}

static void inner_release(TreeInner* table) {
  Manager* manager = ((Inner*)table)->manager;
  MinimalHostCounts* counts = &manager->host->counts;
  ++counts->inner_releases;
  if (!manager->tree.table.cleared_word) ++counts->inner_clears;
  if (manager->step != 1 || manager->tree.table.cleared_word) ++counts->inner_mistakes;
  expect_untouched(manager->host, table->reserved_1, 3);
  manager->step = 2;
  free(table);
}

static void manager_destroy(NonzeroTree* tree) {
  Manager* manager = (Manager*)tree;
  MinimalHost* host = manager->host;
  if (manager->step != 2) ++host->counts.inner_mistakes;
  if (manager->step < 2) free(manager->tree.table.inner);
  expect_untouched(host, tree->reserved_1, 2);
  expect_untouched(host, &tree->reserved_5, 1);
  expect_untouched(host, tree->reserved_7, 8);
  expect_untouched(host, &tree->reserved_17, 1);
  Manager** link = &host->managers;
  while (*link != manager) link = &(*link)->next;
  *link = manager->next;
  --host->counts.live_trees;
  free(manager);
}

static NonzeroTree* create_tree_manager(TreeExtension* table, const TreeParms* parms, void* zero, const char* label) {
  MinimalHost* host = ((Extension*)table)->host;
  if (((Extension*)table)->dead) {
    ++host->counts.dead_calls;
    return NULL;
  }
  expect(host, parms && parms->first == 1 && parms->key_offset == 16 && parms->third == 10 && parms->fourth == 1);
  expect(host, !zero && label && strcmp(label, "Nonzero Tree") == 0);
  if (refuses(host)) return NULL;
  Manager* manager = calloc(1, sizeof *manager);
  Inner* inner = calloc(1, sizeof *inner);
  if (!manager || !inner) {
    free(manager);
    free(inner);
    return NULL;
  }
  mark_untouched(inner->table.reserved_1, 3);
  inner->table.reset = inner_reset;
  inner->table.release = inner_release;
  inner->manager = manager;
  mark_untouched(manager->tree.table.reserved_1, 2);
  mark_untouched(&manager->tree.table.reserved_5, 1);
  mark_untouched(manager->tree.table.reserved_7, 8);
  mark_untouched(&manager->tree.table.reserved_17, 1);
  manager->tree.table.destroy = manager_destroy;
  manager->tree.table.cleared_word = manager; /* anything but null */
  manager->tree.table.inner = &inner->table;
  manager->tree.table.insert = tree_insert;
  manager->tree.table.find = tree_find;
  manager->tree.table.remove = tree_remove;
  manager->tree.table.first = tree_first;
  manager->host = host;
  manager->tree.noise = (uint64_t)host->counts.requests;
  manager->next = host->managers;
  host->managers = manager;
  ++host->counts.live_trees;
  return &manager->tree.table;
}

static void extension_destroy(TreeExtension* table) {
  Extension* extension = (Extension*)table;
  if (extension->dead) {
    ++extension->host->counts.dead_calls;
    return;
  }
  expect_untouched(extension->host, table->reserved_1, 2);
  expect_untouched(extension->host, table->reserved_4, 6);
  extension->dead = 1;
  --extension->host->counts.live_extensions;
}

static void* load_extension(HostServices* kernel, const wchar_t* name, int64_t length, void* zero) {
  MinimalHost* host = (MinimalHost*)kernel;
  expect(host, !zero);
  if (!name || length != 6 || wmemcmp(name, L"qxeavl", 6) != 0) {
    expect(host, 0);
    return NULL;
  }
  if (refuses(host)) return NULL;
  Extension* extension = calloc(1, sizeof *extension);
  if (!extension) return NULL;
  mark_untouched(extension->table.reserved_1, 2);
  mark_untouched(extension->table.reserved_4, 6);
  extension->table.destroy = extension_destroy;
  extension->table.create_tree_manager = create_tree_manager;
  extension->host = host;
  extension->next = host->extensions;
  host->extensions = extension;
  ++host->counts.live_extensions;
  return extension;
}

/* ---- pools ---- */

static void check_guard(MinimalHost* host, Block* block) {
  int whole = 1;
  for (int i = 0; i < GUARD; ++i) whole = whole && block->data[block->bytes + (uint64_t)i] == GUARD_BYTE;
  if (whole || block->overrun) return;
  block->overrun = 1;
  ++host->counts.overruns;
}

/* The link that holds the block with this address, or null. */
static Block** find_block(Pool* pool, const void* data) {
  for (Block** link = &pool->blocks; *link; link = &(*link)->next) {
    if ((*link)->data == data) return link;
  }
  return NULL;
}

static void end_block(MinimalHost* host, Block** link) {
  Block* block = *link;
  check_guard(host, block);
  *link = block->next;
  host->freed[host->freed_next++ % FREED_KEPT] = block->data;
  --host->counts.live_blocks;
  free(block->data);
  free(block);
}

static void* pool_allocate(MemoryPool* table, uint64_t bytes, uint32_t flags) {
  Pool* pool = (Pool*)table;
  MinimalHost* host = pool->host;
  if (pool->dead) {
    ++host->counts.dead_calls;
    return NULL;
  }
  expect(host, flags == 0 || flags == SM_POOL_ZERO);
  if (refuses(host) || bytes == 0 || bytes > (UINT64_MAX >> 1)) return NULL;
  Block* block = calloc(1, sizeof *block);
  unsigned char* data = flags & SM_POOL_ZERO ? calloc(1, bytes + GUARD) : malloc(bytes + GUARD);
  if (!block || !data) {
    free(block);
    free(data);
    return NULL;
  }
  if (!(flags & SM_POOL_ZERO)) memset(data, FRESH_BYTE, bytes);
  memset(data + bytes, GUARD_BYTE, GUARD);
  block->data = data;
  block->bytes = bytes;
  block->next = pool->blocks;
  pool->blocks = block;
  ++host->counts.live_blocks;
  return data;
}

static void pool_free(MemoryPool* table, void* data) {
  Pool* pool = (Pool*)table;
  MinimalHost* host = pool->host;
  if (pool->dead) {
    ++host->counts.dead_calls;
    return;
  }
  if (!data) return;
  Block** link = find_block(pool, data);
  if (link) {
    end_block(host, link);
    return;
  }
  int seen = 0;
  for (int i = 0; i < FREED_KEPT && !seen; ++i) seen = host->freed[i] == data;
  ++*(seen ? &host->counts.double_frees : &host->counts.foreign_frees);
}

static void pool_destroy(MemoryPool* table) {
  Pool* pool = (Pool*)table;
  if (pool->dead) {
    ++pool->host->counts.dead_calls;
    return;
  }
  expect_untouched(pool->host, table->reserved_1, 2);
  while (pool->blocks) end_block(pool->host, &pool->blocks);
  pool->dead = 1; /* the table stays, for calls that come too late */
  --pool->host->counts.live_pools;
}

static MemoryPool* create_pool(HostServices* kernel, const PoolParms* parms, void* owner, const char* name) {
  MinimalHost* host = (MinimalHost*)kernel;
  (void)owner;
  const int work = parms && parms->flag == SM_POOL_INSTANCE;
  expect(host, parms && (work || parms->flag == SM_POOL_EXTENSION || parms->flag == SM_POOL_MATRIX));
  expect(host, parms && parms->reserved[0] == 0 && parms->reserved[1] == 0);
  expect(host, work ? name && strcmp(name, "WORKPOOL") == 0 : !name);
  if (refuses(host)) return NULL;
  Pool* pool = calloc(1, sizeof *pool);
  if (!pool) return NULL;
  mark_untouched(pool->table.reserved_1, 2);
  pool->table.destroy = pool_destroy;
  pool->table.allocate = pool_allocate;
  pool->table.free = pool_free;
  pool->host = host;
  pool->next = host->pools;
  host->pools = pool;
  ++host->counts.live_pools;
  host->counts.workpools += work;
  return &pool->table;
}

/* ---- the host ---- */

MinimalHost* minimal_host_create(void) {
  MinimalHost* host = calloc(1, sizeof *host);
  if (!host) return NULL;
  mark_untouched(host->services.reserved_1, 6);
  mark_untouched(host->services.reserved_8, 2);
  host->services.create_pool = create_pool;
  host->services.load_extension = load_extension;
  return host;
}

void minimal_host_destroy(MinimalHost* host) {
  if (!host) return;
  while (host->managers) manager_destroy(&host->managers->tree.table);
  while (host->pools) {
    Pool* pool = host->pools;
    if (!pool->dead) pool_destroy(&pool->table);
    host->pools = pool->next;
    free(pool);
  }
  while (host->extensions) {
    Extension* extension = host->extensions;
    host->extensions = extension->next;
    free(extension);
  }
  free(host);
}

HostServices* minimal_host_services(MinimalHost* host) { return &host->services; }

MinimalHostCounts minimal_host_counts(MinimalHost* host) {
  for (Pool* pool = host->pools; pool; pool = pool->next) {
    for (Block* block = pool->blocks; block; block = block->next) check_guard(host, block);
  }
  expect_untouched(host, host->services.reserved_1, 6);
  expect_untouched(host, host->services.reserved_8, 2);
  return host->counts;
}

void minimal_host_fail_request(MinimalHost* host, int64_t k, int for_ever) {
  host->fault_armed = k >= 0;
  host->fault_for_ever = for_ever;
  host->fault_ahead = k;
  host->fault_refused = 0;
}

int64_t minimal_host_stop_failing(MinimalHost* host) {
  host->fault_armed = 0;
  return host->fault_refused;
}
