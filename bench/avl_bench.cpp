// Insertion into the trees of nonzeros: ascending and random columns, rows of 5, 50 and 100,000 keys, new keys and held
// ones, beside std::map over an arena. Every case enters the same number of keys in all, row after row.
//
// The argument is the row length; items per second are insertions.
#include <benchmark/benchmark.h>
#include <qxesm/host.h>
#include <qxesm/types.h>

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <map>
#include <memory_resource>
#include <numeric>
#include <random>
#include <vector>

QXESM_API std::int32_t qxextent(HostServices* handle);
QXESM_API void* qxeavl(void* unused, void* owner);

namespace {

constexpr std::size_t kKeys = 100000;

// One manager from a host that serves each block by malloc; it lives as long as the program.
NonzeroTree* manager() {
  static MemoryPool pool = {{},
                            [](MemoryPool*) {},
                            [](MemoryPool*, std::uint64_t bytes, std::uint32_t) { return std::calloc(1, bytes); },
                            [](MemoryPool*, void* block) { std::free(block); }};
  static NonzeroTree* const tree = [] {
    static HostServices services = {};
    services.create_pool = [](HostServices*, const PoolParms*, void*, const char*) { return &pool; };
    qxextent(&services);
    auto* extension = static_cast<TreeExtension*>(qxeavl(nullptr, nullptr));
    const TreeParms parms = {1, 16, 10, 1};
    return extension->create_tree_manager(extension, &parms, nullptr, "Nonzero Tree");
  }();
  return tree;
}

enum class Order { ascending, descending, random };

// The columns of every row, in order of entry: even numbers, so that odd ones fall between held keys.
std::vector<std::int64_t> columns(std::size_t length, Order order) {
  std::vector<std::int64_t> keys(kKeys);
  std::mt19937_64 engine(17);
  for (auto row = keys.begin(); row != keys.end(); row += static_cast<std::ptrdiff_t>(length)) {
    const auto end = row + static_cast<std::ptrdiff_t>(length);
    for (auto key = row; key != end; ++key) *key = 2 * (key - row);
    if (order == Order::descending) std::reverse(row, end);
    if (order == Order::random) std::shuffle(row, end, engine);
  }
  return keys;
}

struct Rows {
  explicit Rows(std::size_t row_length) : length(row_length), roots(kKeys / row_length), nodes(kKeys) {}
  // Enters the keys and counts those that were new.
  std::size_t enter(const std::vector<std::int64_t>& keys) {
    NonzeroTree* tree = manager();
    std::size_t used = 0;
    for (std::size_t k = 0; k < kKeys; ++k) {
      NonzeroNode* spare = &nodes[used];
      spare->key = keys[k];
      if (tree->insert(tree, &roots[k / length], spare) == spare) ++used;
    }
    return used;
  }
  void clear() { std::fill(roots.begin(), roots.end(), 0); }
  std::size_t length;
  std::vector<std::uint64_t> roots;
  std::vector<NonzeroNode> nodes;
};

void count_items(benchmark::State& state) {
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(kKeys));
}

void tree_new_keys(benchmark::State& state, Order order) {
  Rows rows(static_cast<std::size_t>(state.range(0)));
  const std::vector<std::int64_t> keys = columns(rows.length, order);
  while (state.KeepRunning()) {
    rows.clear();
    benchmark::DoNotOptimize(rows.enter(keys));
  }
  count_items(state);
}

// The root word changes its address at every call, as if the caller's root array moved: no hint is ever good.
void tree_new_keys_unhinted(benchmark::State& state, Order order) {
  Rows rows(static_cast<std::size_t>(state.range(0)));
  const std::vector<std::int64_t> keys = columns(rows.length, order);
  NonzeroTree* tree = manager();
  while (state.KeepRunning()) {
    for (std::size_t k = 0; k < kKeys;) {
      std::uint64_t words[2] = {0, 0};
      for (std::size_t end = k + rows.length; k < end; ++k) {
        rows.nodes[k].key = keys[k];
        tree->insert(tree, &words[k % 2], &rows.nodes[k]);
        words[1 - k % 2] = words[k % 2];
      }
      benchmark::DoNotOptimize(words);
    }
  }
  count_items(state);
}

void tree_held_keys(benchmark::State& state, Order order) {
  Rows rows(static_cast<std::size_t>(state.range(0)));
  const std::vector<std::int64_t> keys = columns(rows.length, order);
  rows.enter(keys);
  NonzeroNode spare = {};
  NonzeroTree* tree = manager();
  while (state.KeepRunning()) {
    for (std::size_t k = 0; k < kKeys; ++k) {
      spare.key = keys[k];
      tree->insert(tree, &rows.roots[k / rows.length], &spare)->value += 1.0;
    }
  }
  benchmark::DoNotOptimize(rows.nodes.data());
  count_items(state);
}

using Map = std::pmr::map<std::int64_t, double>;

void map_new_keys(benchmark::State& state, Order order) {
  const auto length = static_cast<std::size_t>(state.range(0));
  const std::vector<std::int64_t> keys = columns(length, order);
  std::vector<std::byte> bytes(kKeys * 64);
  while (state.KeepRunning()) {
    std::pmr::monotonic_buffer_resource arena(bytes.data(), bytes.size());
    for (std::size_t k = 0; k < kKeys;) {
      // Built in the arena and left there: its nodes go in bulk, as those of the trees do.
      Map& row = *new (arena.allocate(sizeof(Map), alignof(Map))) Map(&arena);
      for (std::size_t end = k + length; k < end; ++k) {
        if (order == Order::random) {
          row.emplace(keys[k], 1.0);
        } else {
          row.emplace_hint(order == Order::ascending ? row.end() : row.begin(), keys[k], 1.0);
        }
      }
      benchmark::DoNotOptimize(row.size());
    }
  }
  count_items(state);
}

void map_held_keys(benchmark::State& state, Order order) {
  const auto length = static_cast<std::size_t>(state.range(0));
  const std::vector<std::int64_t> keys = columns(length, order);
  std::vector<Map> rows(kKeys / length);
  for (std::size_t k = 0; k < kKeys; ++k) rows[k / length].emplace(keys[k], 0.0);
  while (state.KeepRunning()) {
    for (std::size_t k = 0; k < kKeys; ++k) rows[k / length][keys[k]] += 1.0;
  }
  benchmark::DoNotOptimize(rows.data());
  count_items(state);
}

// A chain of blocks of `width` unknowns, each sharing half of them with the next: every block adds its upper triangle,
// row by row with ascending columns.
constexpr std::size_t kWidth = 12;
constexpr std::size_t kBlocks = 2000;

void tree_chain_of_blocks(benchmark::State& state) {
  constexpr std::size_t n = (kBlocks + 1) * (kWidth / 2);
  std::vector<std::uint64_t> roots(n);
  std::vector<NonzeroNode> nodes(n * kWidth + 1);
  NonzeroTree* tree = manager();
  std::int64_t entered = 0;
  while (state.KeepRunning()) {
    std::fill(roots.begin(), roots.end(), 0);
    NonzeroNode* spare = nodes.data();
    for (std::size_t block = 0; block < kBlocks; ++block) {
      const std::size_t from = block * (kWidth / 2);
      for (std::size_t i = from; i < from + kWidth; ++i) {
        for (std::size_t j = i; j < from + kWidth; ++j, ++entered) {
          spare->key = static_cast<std::int64_t>(j);
          NonzeroNode* node = tree->insert(tree, &roots[i], spare);
          if (node == spare) ++spare;
          node->value += 1.0;
        }
      }
    }
    benchmark::DoNotOptimize(nodes.data());
  }
  state.SetItemsProcessed(entered);
}

// The worst of climbs: a full tree of even nodes grows at its front, from the leaf up to the root, and shrinks again.
void tree_longest_climb(benchmark::State& state) {
  const std::int64_t n = (std::int64_t{1} << state.range(0)) - 1;
  std::vector<NonzeroNode> nodes(static_cast<std::size_t>(n) + 1);
  NonzeroTree* tree = manager();
  std::uint64_t root = 0;
  for (std::int64_t key = n; key > 0; --key) {
    nodes[static_cast<std::size_t>(key)].key = key;
    tree->insert(tree, &root, &nodes[static_cast<std::size_t>(key)]);
  }
  const std::int64_t front = 0;
  while (state.KeepRunning()) {
    tree->insert(tree, &root, nodes.data());
    tree->remove(tree, &root, &front);
  }
  state.SetItemsProcessed(state.iterations());
}

BENCHMARK_CAPTURE(tree_new_keys, ascending, Order::ascending)->Arg(5)->Arg(50)->Arg(100000);
BENCHMARK_CAPTURE(tree_new_keys, descending, Order::descending)->Arg(5)->Arg(50)->Arg(100000);
BENCHMARK_CAPTURE(tree_new_keys, random, Order::random)->Arg(5)->Arg(50)->Arg(100000);
BENCHMARK_CAPTURE(tree_new_keys_unhinted, ascending, Order::ascending)->Arg(5)->Arg(50)->Arg(100000);
BENCHMARK_CAPTURE(tree_new_keys_unhinted, random, Order::random)->Arg(5)->Arg(50)->Arg(100000);
BENCHMARK_CAPTURE(map_new_keys, ascending_with_hint, Order::ascending)->Arg(5)->Arg(50)->Arg(100000);
BENCHMARK_CAPTURE(map_new_keys, random, Order::random)->Arg(5)->Arg(50)->Arg(100000);
BENCHMARK_CAPTURE(tree_held_keys, ascending, Order::ascending)->Arg(5)->Arg(50)->Arg(100000);
BENCHMARK_CAPTURE(tree_held_keys, random, Order::random)->Arg(5)->Arg(50)->Arg(100000);
BENCHMARK_CAPTURE(map_held_keys, ascending, Order::ascending)->Arg(5)->Arg(50)->Arg(100000);
BENCHMARK_CAPTURE(map_held_keys, random, Order::random)->Arg(5)->Arg(50)->Arg(100000);
BENCHMARK(tree_chain_of_blocks);
BENCHMARK(tree_longest_climb)->Arg(5)->Arg(10)->Arg(20);

}  // namespace
