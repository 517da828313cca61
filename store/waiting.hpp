// Entries that wait to be linked into the trees of an open symmetric sparse matrix.
//
// Entered in no order, each entry waits for its row's root word and for the nodes on the way down, whose addresses are
// in one another: a chain of misses for each call, where the memory could serve many at once. Entries may therefore
// wait until there are kMostWaiting of them. They are then looked for together, level by level (S. Chen, A. Ailamaki,
// P. B. Gibbons and T. C. Mowry, "Improving hash join performance through prefetching", ACM Transactions on Database
// Systems 32 (2007), article 17: group prefetching), and linked in one after the other in the order in which they came,
// so that trees and sums are those of entering them at once.
//
// Where the trees, or the parts of them that the entries come to, are in a cache, waiting costs more than it brings.
// Which of the two it is depends on the machine and on the order of the entries; so both ways are timed now and then.
#pragma once

#include "frame/core.hpp"

namespace sm {

constexpr i64 kMostWaiting = 64;

struct WaitingEntry {
  i64 row;
  i64 col;
  double value;
  bool add;
};

struct WaitingEntries {
  i64 until;     // so many entries are linked in at once before enter_or_wait() is asked
  i64 limit;     // entries that are linked in together; 0: they do not wait
  i64 count;     // entries that wait
  bool wait;     // the way that was found to be faster
  i64 entries;   // left to go that way before both are timed again
  i64 interval;  // entries between two comparisons: twice as many after each that changes nothing
  int round;     // of a comparison; 0: none goes on
  int won;       // rounds in which waiting was faster
  i64 started;   // nanoseconds
  i64 without;   // nanoseconds that kMostWaiting entries took at once in this round
  WaitingEntry entry[kMostWaiting];
};

// Links in what waits. Whatever walks the trees of an open symmetric sparse matrix, or lets it grow, asks for this
// first. It cannot fail: there are nodes for all that waits.
void link_waiting(SmMatrix& m);

// Entries of this matrix never wait.
void never_wait(WaitingEntries& waiting);

// Enters an entry into an open symmetric sparse matrix that covers it, has a spare node and room for kMostWaiting
// entries more; or lets it wait. 101 or 0.
[[nodiscard]] SmStatus enter_or_wait(SmMatrix& m, const WaitingEntry& entry);

}  // namespace sm
