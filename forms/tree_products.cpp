// Rows that were entered in order stand in their slab as they are walked: what comes is fetched from further along. Any
// other walk waits for memory at every node, because only the node itself says where the next one is: then several rows
// are walked in turns, one link of each at a time, and what a walk needs next has been asked for when its turn comes.
//
// Vectors go through the trees in groups, so that a group pays for one walk.
#include "forms/tree_products.hpp"

#include <algorithm>

#include "forms/lines.hpp"

namespace sm {

namespace {

constexpr int kWalks = 16;       // rows that are walked in turns
constexpr i64 kNodesAhead = 64;  // of a walk that finds its nodes in order
constexpr int kGroup = 8;        // vectors that are served by one walk

// What a walk serves. For each row in progress there is a State, which begin() fills unless it refuses the row; then
// come visit() for the entries and end().
//
// Rows of A against the vectors: a sum for each vector.
template <int kVectors>
struct Sums {
  struct State {
    double sum[kVectors];
  };
  const double* x;
  double* y;
  Range rows, cols;

  bool begin(State& s, i64) const {
    for (int v = 0; v < kVectors; ++v) s.sum[v] = 0.0;
    return true;
  }
  void visit(State& s, i64 key, double value) const {
    const double* from = x + (key - cols.first);
    for (int v = 0; v < kVectors; ++v) s.sum[v] += value * from[v * cols.size()];
  }
  void end(const State& s, i64 row) const {
    double* to = y + (row - rows.first);
    for (int v = 0; v < kVectors; ++v) to[v * rows.size()] += s.sum[v];
  }
};

// Multiples of rows of A, for the vectors that have no zero there.
template <int kVectors>
struct Multiples {
  struct State {
    int count;
    double scale[kVectors];
    i64 place[kVectors];
  };
  const double* x;
  double* y;
  Range rows, cols;

  bool begin(State& s, i64 row) const {
    s.count = 0;
    for (int v = 0; v < kVectors; ++v) {
      const double t = x[v * rows.size() + row];
      if (t == 0.0) continue;
      s.scale[s.count] = t;
      s.place[s.count++] = v * cols.size();
    }
    return s.count > 0;
  }
  void visit(const State& s, i64 key, double value) const {
    for (int v = 0; v < s.count; ++v) y[s.place[v] + key] += s.scale[v] * value;
  }
  void end(const State&, i64) const {}
};

// The first entry of a row in the work's columns, or null.
template <class Work>
NonzeroNode* first_of(const TreeRows& a, i64 row, const Work& work) {
  NonzeroNode* node = first_node(a.m, row);
  if (work.cols.first > 0) node = first_from(node, work.cols.first);
  return node && node->key <= work.cols.last ? node : nullptr;
}

template <class Work>
void walk_one_by_one(const TreeRows& a, const Work& work) {
  for (i64 row = work.rows.first; row <= work.rows.last; ++row) {
    const NonzeroNode* node = first_of(a, row, work);
    typename Work::State state;
    if (!node || !work.begin(state, row)) continue;
    for (; node && node->key <= work.cols.last; node = sm_node_next(node)) {
      __builtin_prefetch(node + kNodesAhead);
      work.visit(state, node->key, node->value);
    }
    work.end(state, row);
  }
}

template <class Work>
class Turns {
 public:
  Turns(const TreeRows& a, const Work& work) : a_(a), work_(work), next_(work.rows.first) {}

  void run() {
    int busy = 0;
    for (Walk& walk : walks_) busy += start(walk);
    while (busy > 0) {
      for (Walk& walk : walks_) {
        if (!walk.node || advance(walk)) continue;
        work_.end(walk.state, walk.row);
        busy -= !start(walk);
      }
    }
  }

 private:
  // The node has been asked for, and nothing of it read.
  struct Walk {
    NonzeroNode* node;  // null: none
    bool from_above;    // reached through a child link: what hangs on its left side comes first
    i64 row;
    typename Work::State state;
  };

  // The next row that has something to give.
  bool start(Walk& walk) {
    for (; next_ <= work_.rows.last; ++next_) {
      // The word of a root is the tree's own business. Fetching from where it seems to point does no harm.
      if (next_ + kWalks <= work_.rows.last) __builtin_prefetch(node_of(a_.m.row_roots[next_ + kWalks]));
      walk.node = first_of(a_, next_, work_);
      if (!walk.node || !work_.begin(walk.state, next_)) continue;
      walk.from_above = false;
      walk.row = next_++;
      return true;
    }
    walk.node = nullptr;
    return false;
  }
  // One link further; false at the end of the row.
  bool advance(Walk& walk) {
    const NonzeroNode& node = *walk.node;
    if (walk.from_above && !(node.left & SM_LINK_THREAD)) {
      walk.node = node_of(node.left);
    } else {
      if (node.key > work_.cols.last) return false;
      work_.visit(walk.state, node.key, node.value);
      walk.node = node_of(node.right);
      walk.from_above = !(node.right & SM_LINK_THREAD);
    }
    __builtin_prefetch(walk.node);
    return walk.node != nullptr;
  }

  const TreeRows& a_;
  const Work& work_;
  i64 next_;
  Walk walks_[kWalks];
};

// Whether neighbours in a row are neighbours in memory, judged by the first two of a few rows.
bool stands_in_order(const TreeRows& a, Range rows) {
  constexpr i64 looks = 64;
  constexpr i64 near = 8 * sizeof(NonzeroNode);
  i64 pairs = 0, neighbours = 0;
  for (i64 row = rows.first; row <= rows.last; row += rows.size() / looks + 1) {
    const NonzeroNode* node = first_node(a.m, row);
    const NonzeroNode* next = node ? sm_node_next(node) : nullptr;
    if (!next) continue;
    ++pairs;
    neighbours += std::abs(reinterpret_cast<std::intptr_t>(next) - reinterpret_cast<std::intptr_t>(node)) <= near;
  }
  return 2 * neighbours >= pairs;
}

// Calls f(vectors, first) for groups of 8, 4, 2 and 1, with the size of the group as a constant.
template <int kVectors = kGroup, class F>
void for_groups(i64 count, i64 first, const F& f) {
  for (; count - first >= kVectors; first += kVectors) f(std::integral_constant<int, kVectors>{}, first);
  if constexpr (kVectors > 1) {
    if (first < count) for_groups<kVectors / 2>(count, first, f);
  }
}

template <template <int> class Work>
void walk_for(const TreeRows& a, const Block& block, Range rows, Range cols, i64 x_length, i64 y_length) {
  const bool in_order = stands_in_order(a, rows);
  for_groups(block.count, 0, [&](auto vectors, i64 first) {
    const Work<vectors> work{block.x + first * x_length, block.y + first * y_length, rows, cols};
    if (in_order) {
      walk_one_by_one(a, work);
    } else {
      Turns(a, work).run();
    }
  });
}

}  // namespace

void add_tree_product(const TreeRows& a, const Block& block, Range rows, Range cols) {
  walk_for<Sums>(a, block, rows, cols, cols.size(), rows.size());
}

void add_transposed_tree_product(const TreeRows& a, const Block& block) {
  walk_for<Multiples>(a, block, {0, a.rows - 1}, {0, a.cols - 1}, a.rows, a.cols);
}

}  // namespace sm
