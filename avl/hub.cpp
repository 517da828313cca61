#include "avl/hub.hpp"

#include <algorithm>
#include <bit>

namespace sm::avl {
namespace {

using Bits = std::uint64_t;
constexpr std::uint64_t kNone = ~std::uint64_t{0};
constexpr std::uint64_t kMiddle = std::uint64_t{1} << 63;
constexpr std::uint64_t kUnit = 8;        // addresses of nodes are multiples of it
constexpr Word kReach = Word{1} << 34;    // half of what 32 bits of units span
constexpr std::uint64_t kLeastRoom = 64;  // for keys beyond those held, on either side, and a 16th of the span
constexpr std::uint64_t kShareOfRoom = 16;

std::uint64_t place_of(const Hub& hub, std::int64_t key) {
  return static_cast<std::uint64_t>(key) - static_cast<std::uint64_t>(hub.low);
}

std::uint64_t last_of(Bits word) { return 63U - static_cast<unsigned>(std::countl_zero(word)); }
std::uint64_t first_of(Bits word) { return static_cast<unsigned>(std::countr_zero(word)); }

// The largest key held below `place`, or kNone.
std::uint64_t key_below(const Hub& hub, std::uint64_t place) {
  for (int level = 0; level < hub.levels; ++level, place /= 64) {
    const Bits word = hub.keys[level][place / 64] & ((Bits{1} << place % 64) - 1);
    if (word == 0) continue;
    place = place / 64 * 64 + last_of(word);
    while (level > 0) place = place * 64 + last_of(hub.keys[--level][place]);
    return place;
  }
  return kNone;
}

// The smallest key held above `place`, or kNone.
std::uint64_t key_above(const Hub& hub, std::uint64_t place) {
  for (int level = 0; level < hub.levels; ++level, place /= 64) {
    const Bits word = hub.keys[level][place / 64] & (~Bits{1} << place % 64);
    if (word == 0) continue;
    place = place / 64 * 64 + first_of(word);
    while (level > 0) place = place * 64 + first_of(hub.keys[--level][place]);
    return place;
  }
  return kNone;
}

Node* node_in(const Hub& hub, std::uint32_t slot) { return node_at(hub.base + Word{slot} * kUnit); }
Node* node_for(const Hub& hub, std::uint64_t place) {
  return place == kNone ? nullptr : node_in(hub, hub.slots[place]);
}

void mark(Hub& hub, std::uint64_t place) {
  for (int level = 0; level < hub.levels; ++level, place /= 64) {
    Bits& word = hub.keys[level][place / 64];
    const bool known_above = word != 0;
    word |= Bits{1} << place % 64;
    if (known_above) return;
  }
}

// Notes the node under its key; false when its address is out of reach.
bool note(Hub& hub, std::uint64_t place, const Node* node) {
  const Word distance = address_of(node) - hub.base;
  if (distance % kUnit != 0 || distance == 0 || distance >= 2 * kReach) return false;
  hub.slots[place] = static_cast<std::uint32_t>(distance / kUnit);
  mark(hub, place);
  ++hub.count;
  return true;
}

// The levels of a tree, down its higher side.
unsigned height_of(Node* top) {
  unsigned height = 1;
  for (;; ++height) {
    const Side side = is_higher(*top, Side::left) ? Side::left : Side::right;
    if (!has_child(*top, side)) return height;
    top = target(*top, side);
  }
}

// A span of keys with room on either side, as far as there are keys.
void set_span(Hub& hub, std::int64_t least, std::int64_t most, std::uint64_t room_below, std::uint64_t room_above) {
  const std::uint64_t first = static_cast<std::uint64_t>(least) + kMiddle;  // from 0, in the order of the keys
  const std::uint64_t last = static_cast<std::uint64_t>(most) + kMiddle;
  const std::uint64_t down = std::min(first, room_below);
  hub.low = static_cast<std::int64_t>(first - down - kMiddle);
  hub.span = last - first + 1 + down + std::min(kNone - last, room_above);
}

// Everything in one block: the levels, and the slots behind them.
bool take_table(Hub& hub, HostServices& services) {
  std::uint64_t sizes[kHubLevels];
  std::uint64_t words = 0;
  hub.levels = 0;
  for (std::uint64_t size = hub.span; hub.levels < kHubLevels;) {
    size = size / 64 + 1;
    sizes[hub.levels++] = size;
    words += size;
    if (size == 1) break;
  }
  const PoolParms parms = {SM_POOL_EXTENSION, {0, 0}};
  hub.pool = services.create_pool(&services, &parms, nullptr, nullptr);
  if (!hub.pool) return false;
  auto* block = static_cast<Bits*>(
      hub.pool->allocate(hub.pool, words * sizeof(Bits) + hub.span * sizeof(std::uint32_t), SM_POOL_ZERO));
  if (!block) {
    close_hub(hub);
    return false;
  }
  for (int level = 0; level < hub.levels; ++level) {
    hub.keys[level] = block;
    block += sizes[level];
  }
  hub.slots = reinterpret_cast<std::uint32_t*>(block);
  return true;
}

bool is_dense(const Hub& hub, std::uint64_t count) { return hub.span != 0 && hub.span / kHubSparsest <= count; }

// A larger table, so that `key` is inside and others may follow on its side. False when the keys are too sparse for it
// or memory is short.
bool widen(Hub& hub, HostServices& services, std::int64_t key) {
  const auto most = static_cast<std::int64_t>(static_cast<std::uint64_t>(hub.low) + hub.span - 1);
  const std::uint64_t room = hub.span / 2;  // what is copied is paid for by the insertions in between
  Hub wide = hub;
  if (key < hub.low) {
    set_span(wide, key, most, room, 0);
  } else {
    set_span(wide, hub.low, key, 0, room);
  }
  if (!is_dense(wide, hub.count) || !take_table(wide, services)) return false;
  const std::uint64_t shift = static_cast<std::uint64_t>(hub.low) - static_cast<std::uint64_t>(wide.low);
  std::copy_n(hub.slots, hub.span, wide.slots + shift);
  for (std::uint64_t place = shift; place < shift + hub.span; ++place) {
    if (wide.slots[place] != 0) mark(wide, place);
  }
  close_hub(hub);
  hub = wide;
  return true;
}

// Builds a balanced tree from the nodes of a hub in key order: the left half of them goes below the left of the top.
class Balancer {
 public:
  explicit Balancer(const Hub& hub) : hub_(hub), next_(first_place()), ahead_(next_) {
    for (int i = 0; i < kAhead; ++i) look_ahead();
  }
  Node* build(std::uint64_t count) {
    if (count == 0) return nullptr;
    const std::uint64_t before = count / 2;
    const std::uint64_t after = count - 1 - before;
    Node* left = build(before);
    Node* top = take();
    top->left = left ? address_of(left) : address_of(last_) | SM_LINK_THREAD;
    if (std::bit_width(before) > std::bit_width(after)) top->left |= SM_LINK_BALANCE;
    last_ = top;
    open_end_ = after == 0 ? &top->right : nullptr;
    if (after > 0) top->right = address_of(build(after));
    return top;
  }
  void finish() { *open_end_ = SM_LINK_THREAD; }

 private:
  static constexpr int kAhead = 16;  // nodes, to hide the misses of a walk in key order

  std::uint64_t first_place() const { return hub_.slots[0] != 0 ? 0 : key_above(hub_, 0); }
  void look_ahead() {
    if (ahead_ == kNone) return;
    __builtin_prefetch(node_for(hub_, ahead_), 1);
    ahead_ = key_above(hub_, ahead_);
  }
  Node* take() {
    look_ahead();
    Node* node = node_for(hub_, next_);
    next_ = key_above(hub_, next_);
    if (open_end_) *open_end_ = address_of(node) | SM_LINK_THREAD;
    return node;
  }

  const Hub& hub_;
  std::uint64_t next_;
  std::uint64_t ahead_;
  Node* last_ = nullptr;
  Word* open_end_ = nullptr;  // the right link of the last node, while it has no child there
};

}  // namespace

bool open_hub(Hub& hub, HostServices& services, Word root, std::uint64_t& visited) {
  visited = 0;
  Node* top = node_at(root);
  const unsigned height = height_of(top);
  if (height < kHubLeastHeight) return false;
  Node* node = outermost(top, Side::left);
  const std::int64_t most = outermost(top, Side::right)->key;
  const std::uint64_t room =
      (static_cast<std::uint64_t>(most) - static_cast<std::uint64_t>(node->key)) / kShareOfRoom + kLeastRoom;
  set_span(hub, node->key, most, room, room);
  // A tree of that height holds half as many nodes as would fill it, give or take; the walk tells.
  if (!is_dense(hub, std::uint64_t{1} << (height - 1)) || !take_table(hub, services)) return false;
  hub.word = root;
  hub.count = 0;
  hub.base = address_of(top) - kReach;
  bool reached = true;
  for (; node && reached; node = sm_node_next(node)) {
    reached = note(hub, place_of(hub, node->key), node);
  }
  visited = hub.count;
  if (reached && is_dense(hub, hub.count)) return true;
  close_hub(hub);
  return false;
}

Node* insert(Hub& hub, HostServices& services, Node& node) {
  std::uint64_t place = place_of(hub, node.key);
  if (place >= hub.span) {
    if (!widen(hub, services, node.key)) return nullptr;
    place = place_of(hub, node.key);
  }
  if (const std::uint32_t slot = hub.slots[place]) return node_in(hub, slot);
  Node* before = node_for(hub, key_below(hub, place));
  Node* after = node_for(hub, key_above(hub, place));
  if (!note(hub, place, &node)) return nullptr;
  node.left = address_of(before) | SM_LINK_THREAD;
  node.right = address_of(after) | SM_LINK_THREAD;
  // Of two neighbours one lies below the other, and only that one has a thread across the gap.
  Word* link = before ? &before->right : &after->left;
  if (before && after) link = is_thread(before->right) ? &before->right : &after->left;
  *link = address_of(&node);
  return &node;
}

Node* find(const Hub& hub, std::int64_t key) {
  const std::uint64_t place = place_of(hub, key);
  return place < hub.span && hub.slots[place] != 0 ? node_in(hub, hub.slots[place]) : nullptr;
}

void settle(Hub& hub, Word& root) {
  Balancer balancer(hub);
  Node* top = balancer.build(hub.count);
  balancer.finish();
  root = hub.word = address_of(top);
}

void close_hub(Hub& hub) {
  if (hub.pool) hub.pool->destroy(hub.pool);
  hub = {};
}

}  // namespace sm::avl
