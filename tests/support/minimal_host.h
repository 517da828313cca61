/* A second host, as small as one can be: written from <qxesm/host.h> alone, to show that the module needs nothing else.
 *
 * Each block is a malloc of its own, chained to its pool. The tree extension is its own too: an unbalanced search tree
 * with threads, inside the same program. It differs from the embedded host wherever the contract leaves a choice:
 *   - a request for 0 bytes is answered with null;
 *   - memory that was not asked for zeros holds 0x5A bytes;
 *   - the balance bit of link words is set or clear at random;
 *   - a manager has an inner object, and checks what is done to it;
 *   - every table is bigger than the module needs, and the words that the module must leave alone hold garbage. */
#ifndef QXESM_TESTS_MINIMAL_HOST_H
#define QXESM_TESTS_MINIMAL_HOST_H

#include <qxesm/host.h>

#ifdef __cplusplus
extern "C" {
#endif

typedef struct MinimalHost MinimalHost;

typedef struct MinimalHostCounts {
  int64_t live_pools;
  int64_t live_blocks;
  int64_t live_trees;      /* tree managers */
  int64_t live_extensions; /* tree extensions loaded and not destroyed */
  int64_t requests;        /* blocks, pools, tree managers and extension loads asked for */
  int64_t workpools;       /* pools created under the name "WORKPOOL" and with an instance's flag */
  /* The road of a manager's inner object: reset(inner, 1, 1), cleared_word = 0, release(inner), destroy(manager). */
  int64_t inner_resets;
  int64_t inner_clears; /* cleared_word was 0 when release was called */
  int64_t inner_releases;
  int64_t inner_mistakes; /* another order, other arguments, or a step left out */
  /* Violations. */
  int64_t foreign_frees;
  int64_t double_frees;
  int64_t overruns;
  int64_t dead_calls; /* calls on a pool or tree extension that was destroyed */
  int64_t bad_calls;  /* wrong parameter block, label, name or flag */
} MinimalHostCounts;

/* A new host, or null. */
MinimalHost* minimal_host_create(void);
/* Frees the host and whatever is still alive in it. Null is harmless. */
void minimal_host_destroy(MinimalHost* host);
HostServices* minimal_host_services(MinimalHost* host);

/* Looks behind every live block first. */
MinimalHostCounts minimal_host_counts(MinimalHost* host);

/* Refuses the k-th request from now (0: the next one), once or from then on. */
void minimal_host_fail_request(MinimalHost* host, int64_t k, int for_ever);
/* Ends the fault and answers how many requests it refused. */
int64_t minimal_host_stop_failing(MinimalHost* host);

#ifdef __cplusplus
}
#endif

#endif
