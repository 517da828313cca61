/* The embedded host: everything the module needs of a kernel, for programs that have none.
 *
 *   QxHost* host = qxhost_create(NULL);
 *   SmExtension* extension = (SmExtension*)qxhost_load_extension(host, L"qxesm", 5);
 *   SmInstance* instance = extension->CreateInstance(extension);
 *   ...
 *   instance->functions->qxsmDestroyInstance(&instance);
 *   extension->qxsmDestroyExtension(extension);
 *   qxhost_destroy(host);
 *
 * A host is used by one thread at a time. Nothing here prints or aborts. An extension keeps the services that it was
 * handed last, so a process has one host alive at a time for each extension library.
 *
 * Pools. Blocks are aligned to 16 bytes. A request for 0 bytes is answered with a block of its own, not with null.
 * Small blocks come from chunks; from 128 KiB on a block has pages of its own, which cost nothing until they are first
 * touched. When such a block is freed its pages go back to the system at once if they are more than 32 MiB (if zeros
 * were asked for: 4 MiB); others wait for a request of about their size, at most 64 of them and 64 MiB, until younger
 * ones push them out, memory is short, or qxhost_trim or qxhost_destroy is called. qxhost_set_kept_memory lets more of
 * them wait, for programs that factor large systems again and again. Zeros up to 4 MiB are written into
 * such pages. A request that cannot be met, because of a ceiling, of the system, or of a size near 2^64, is answered
 * with null. free(pool, NULL) does nothing; a block that is freed twice or in another pool is not noticed outside the
 * checking mode.
 *
 * The checking mode serves each block by a malloc of its own, with a guard behind it, looks every freed block up before
 * it touches memory, and keeps destroyed pools, so that mistakes are counted instead of crashing. Memory that was not
 * asked for zeros holds 0xCB bytes. Leaks show as pools_live and blocks_live. */
#ifndef QXHOST_QXHOST_H
#define QXHOST_QXHOST_H

#include <qxesm/host.h>

#if defined(__cplusplus)
#define QXHOST_API extern "C" __attribute__((visibility("default")))
#else
#define QXHOST_API extern __attribute__((visibility("default")))
#endif

typedef struct QxHost QxHost;

/* How a host is made. Zero-initialise, then set what differs. */
typedef struct QxHostOptions {
  uint64_t memory_ceiling; /* bytes that all pools together may hand out; 0: no ceiling */
  int32_t checking;        /* non-zero: the checking mode below; slower, for tests */
} QxHostOptions;

/* What the pools of a host hold. Bytes are as requested, without the pools' own overhead. */
typedef struct QxHostUsage {
  uint64_t bytes_in_use;
  uint64_t bytes_peak;
  int64_t pools_live;
  int64_t blocks_live; /* counted in the checking mode only, else 0 */
  int64_t requests;    /* in the checking mode: those made so far that a fault could have met (blocks, pools, trees,
                          extensions), else 0 */
} QxHostUsage;

/* What the checking mode found since the host was made. */
typedef struct QxHostViolations {
  int64_t foreign_frees; /* free of a block that this pool did not hand out; the block stays as it is */
  int64_t double_frees;  /* told from foreign ones for the last million freed blocks */
  int64_t overruns;      /* a block was written within 64 bytes past its end; found when the block is freed or its pool
                            destroyed, or by qxhost_violations; counted once */
  int64_t dead_pools;    /* a call on a pool (one of the last 65536) or tree extension that was destroyed */
} QxHostViolations;

/* A new host, or null when memory is short. `options` may be null. */
QXHOST_API QxHost* qxhost_create(const QxHostOptions* options);

/* Destroys every pool that is left and the host. Null is harmless. */
QXHOST_API void qxhost_destroy(QxHost* host);

/* The table that the module takes as its service handle. Valid until qxhost_destroy. */
QXHOST_API HostServices* qxhost_services(QxHost* host);

/* Adds a folder in which extensions are looked for, after the folder of the host library and those added before.
 * Answers 0, or -1 when memory is short or directory is null or empty. */
QXHOST_API int32_t qxhost_add_search_path(QxHost* host, const char* directory);

/* Loads lib<name>.so, hands it the services through its qxextver, and calls its entry of the same name.
 *   name  in  `length` wide characters, 1 to 64 ASCII letters, digits and underscores
 * The first file of that name on the search path decides; no later folder is tried when it cannot be loaded. It must
 * define both functions itself: int32_t qxextver(HostServices*, int32_t* major, int32_t* minor), which stores 5 as
 * major and answers 0, and void* <name>(void* unused, void* owner), which is called with two nulls.
 * The answer is that entry's (for L"qxesm" an SmExtension*), a new one for each call, or null: qxhost_last_error says
 * why. The library stays loaded until the host is destroyed. It is what the services' load_extension does. */
QXHOST_API void* qxhost_load_extension(QxHost* host, const wchar_t* name, int64_t length);

/* Why the last failed load failed: one line that names the file and the cause, also the one of an extension that was
 * loaded within. Empty when none failed so far. Never null. Valid until the next load. */
QXHOST_API const char* qxhost_last_error(const QxHost* host);

/* Sets the host's ceiling (0: none), in bytes as they are requested. Blocks that are out already stay. */
QXHOST_API void qxhost_set_memory_ceiling(QxHost* host, uint64_t bytes);

/* Gives the pages of freed blocks that wait for their next use back to the system. Live blocks stay as they are. */
QXHOST_API void qxhost_trim(QxHost* host);

/* Sets how many bytes of freed blocks wait for their next use (at first 64 MiB); blocks of more than half of that do
 * not wait, nor those of more than 4 MiB that were asked for zeros. What waits beyond it goes back, the oldest first. */
QXHOST_API void qxhost_set_kept_memory(QxHost* host, uint64_t bytes);

/* Sets a ceiling for one pool of this host (0: none). Answers 0, or -1 when the pool is not this host's. */
QXHOST_API int32_t qxhost_set_pool_ceiling(QxHost* host, MemoryPool* pool, uint64_t bytes);

QXHOST_API QxHostUsage qxhost_usage(const QxHost* host);

/* Non-zero when a request was refused because of a ceiling since the host was made. */
QXHOST_API int32_t qxhost_ceiling_was_met(const QxHost* host);

/* What a planned fault refuses. */
enum {
  QXHOST_FAIL_BLOCKS = 1,     /* allocate */
  QXHOST_FAIL_POOLS = 2,      /* create pool */
  QXHOST_FAIL_TREES = 4,      /* create tree manager */
  QXHOST_FAIL_EXTENSIONS = 8, /* load extension */
  QXHOST_FAIL_ALL = 15
};

/* Checking mode: refuse the k-th request (k = 0: the next one; k < 0: none) of the kinds in `what`, once or from then
 * on. Only requests that come through the services are counted. A new plan takes the place of the last one. */
QXHOST_API void qxhost_fail_request(QxHost* host, int32_t what, int64_t k, int32_t for_ever);

/* Ends the planned fault and answers how many requests it refused. */
QXHOST_API int64_t qxhost_stop_failing(QxHost* host);

/* Checking mode: looks at every live block and answers what was found so far. All zero outside that mode. */
QXHOST_API QxHostViolations qxhost_violations(QxHost* host);

#endif
