#include "store/waiting.hpp"

#include <time.h>

#include <algorithm>

#include "store/nodes.hpp"

namespace sm {

namespace {

constexpr i64 kCached = 16384;        // nodes that some near cache holds: entries do not wait
constexpr int kLevels = 12;           // of a tree: deeper ones keep their tops in some cache
constexpr int kRounds = 3;            // of a comparison
constexpr i64 kLeastInterval = 4096;  // entries
constexpr i64 kMostInterval = i64{1} << 18;

// There is a node for each entry that waits and one more, so that none of them needs a slab.
i64 most_waiting(const SmMatrix& m) { return std::min(kMostWaiting, (m.slab_bytes - m.slab_used) / node_stride(m)); }

// Asks for the nodes on the ways down to all entries, one level after the other. Inlined, because a call of a function
// that only asks for memory counts as one without effect, and is left out.
[[gnu::always_inline]] inline void ask_for_ways(const SmMatrix& m, const WaitingEntries& waiting) {
  struct Way {
    const NonzeroNode* node;
    i64 key;
  };
  Way ways[kMostWaiting];
  i64 count = 0;
  for (i64 k = 0; k < waiting.count; ++k) {
    const WaitingEntry& entry = waiting.entry[k];
    const NonzeroNode* root = node_of(m.sym_roots[entry.row]);
    __builtin_prefetch(root);
    ways[count] = {root, entry.col};
    count += root != nullptr;
  }
  for (int level = 0; level < kLevels && count > 0; ++level) {
    i64 left = 0;
    for (i64 k = 0; k < count; ++k) {
      const Way way = ways[k];
      const uint64_t link = way.key < way.node->key ? way.node->left : way.node->right;
      const NonzeroNode* next = node_of(link);
      __builtin_prefetch(next);
      ways[left] = {next, way.key};
      left += way.key != way.node->key && !(link & SM_LINK_THREAD) && next;
    }
    count = left;
  }
}

i64 now() {
  timespec time{};
  clock_gettime(CLOCK_MONOTONIC, &time);
  return time.tv_sec * i64{1'000'000'000} + time.tv_nsec;
}

void go_at_once(WaitingEntries& waiting, i64 entries) {
  waiting.limit = 0;
  waiting.until = entries;
}

void let_wait(const SmMatrix& m, WaitingEntries& waiting) {
  waiting.limit = most_waiting(m);
  waiting.until = waiting.limit == 0;  // one entry, for which a slab is taken
}

void go_on(const SmMatrix& m, WaitingEntries& waiting) {
  if (!waiting.wait) return go_at_once(waiting, waiting.entries);
  let_wait(m, waiting);
}

void begin_round(WaitingEntries& waiting) {
  ++waiting.round;
  waiting.started = now();
  go_at_once(waiting, kMostWaiting);
}

// The way that won more rounds is gone from now on.
void settle(const SmMatrix& m, WaitingEntries& waiting) {
  const bool wait = 2 * waiting.won > kRounds;
  const i64 longer = std::clamp(2 * waiting.interval, kLeastInterval, kMostInterval);
  waiting.interval = wait == waiting.wait ? longer : kLeastInterval;
  waiting.wait = wait;
  waiting.entries = waiting.interval;
  waiting.round = waiting.won = 0;
  go_on(m, waiting);
}

// So many entries have been linked in, one way or the other.
void entered(SmMatrix& m, WaitingEntries& waiting, i64 count) {
  if (waiting.round > 0) {
    const i64 taken = now() - waiting.started;
    waiting.won += count == kMostWaiting && taken < waiting.without;
    if (waiting.round == kRounds) return settle(m, waiting);
    return begin_round(waiting);
  }
  waiting.entries -= count;
  if (waiting.entries > 0) return go_on(m, waiting);
  m.nnz < kCached ? go_at_once(waiting, kLeastInterval) : begin_round(waiting);
}

// So many entries have been linked in at once as were to be before the next look.
void look(SmMatrix& m, WaitingEntries& waiting) {
  if (waiting.round == 0) return entered(m, waiting, waiting.wait ? 1 : waiting.entries);
  const i64 time = now();
  waiting.without = time - waiting.started;
  waiting.started = time;
  let_wait(m, waiting);
}

}  // namespace

void never_wait(WaitingEntries& waiting) { go_at_once(waiting, INT64_MAX); }

void link_waiting(SmMatrix& m) {
  if (!m.sym_roots || open_rows(m).waiting.count == 0) return;
  WaitingEntries& waiting = open_rows(m).waiting;
  ask_for_ways(m, waiting);
  const i64 count = waiting.count;
  waiting.count = 0;
  for (i64 k = 0; k < count; ++k) {
    const WaitingEntry& entry = waiting.entry[k];
    (void)enter_covered(m, m.sym_roots + entry.row, entry.col, entry.add, entry.value);  // takes no slab
  }
  entered(m, waiting, count);
}

SmStatus enter_or_wait(SmMatrix& m, const WaitingEntry& entry) {
  WaitingEntries& waiting = open_rows(m).waiting;
  if (waiting.limit == 0) look(m, waiting);
  if (waiting.limit == 0) {
    --waiting.until;
    return enter_covered(m, m.sym_roots + entry.row, entry.col, entry.add, entry.value);
  }
  __builtin_prefetch(m.sym_roots + entry.row);
  waiting.entry[waiting.count++] = entry;
  if (waiting.count == waiting.limit) link_waiting(m);
  return SM_OK;
}

}  // namespace sm
