#include "avl/manager.hpp"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "avl/hub.hpp"
#include "avl/tree.hpp"

namespace sm::avl {
namespace {

struct Manager;

struct Extension {
  TreeExtension table;
  MemoryPool* pool;
  HostServices* services;
  Manager* managers;  // those alive, in a chain
};

constexpr std::int64_t kHubs = 8;
constexpr Word kNoSample = SM_LINK_TAGS;  // no root word reads that

struct Manager {
  NonzeroTree table;
  Extension* extension;
  Manager* previous;
  Manager* next;
  Hints hints;
  std::int64_t hub_count;
  std::int64_t patience;  // samples to pass over before the next one is looked at
  Hub hubs[kHubs];
};

// Callers hold the table; the object around it is found by its address.
static_assert(std::is_standard_layout_v<Extension> && offsetof(Extension, table) == 0);
static_assert(std::is_standard_layout_v<Manager> && offsetof(Manager, table) == 0);
// Host memory is used as it comes, filled with zeros: nothing is constructed or destructed.
static_assert(std::is_trivial_v<Extension> && std::is_trivial_v<Manager>);

Manager& manager_of(NonzeroTree* tree) { return *reinterpret_cast<Manager*>(tree); }

void drop_hub(Manager& m, Hub& hub) {
  close_hub(hub);
  hub = m.hubs[--m.hub_count];
  m.hubs[m.hub_count] = {};
}

Hub* hub_at(Manager& m, Word word) {
  for (std::int64_t i = 0; i < m.hub_count; ++i) {
    if (m.hubs[i].word == word) return &m.hubs[i];
  }
  return nullptr;
}

// A root word reads `word` that did not before. A node is the root of one tree only, so a hub of that word has lost its
// tree: the caller dropped it, and its nodes serve again.
void forget_hub_at(Manager& m, Word word) {
  if (Hub* hub = hub_at(m, word)) drop_hub(m, *hub);
}

// The tree at `root` becomes one of heights again, because something is asked that a hub does not answer. It will be a
// hub again only after insertions enough to pay for what this costs.
void end_hub(Manager& m, Word& root) {
  Hub* hub = hub_at(m, root);
  if (!hub) return;
  const Word before = root;
  settle(*hub, root);
  m.patience = static_cast<std::int64_t>(hub->count / (4 * kSampled));
  hub->word = before;
  drop_hub(m, *hub);
  if (root != before) forget_hub_at(m, root);
  forget(m.hints, root);
}

// The tree at `root` was taken as a sample. Where insertions go to a few large trees the samples do too.
void look_for_hub(Manager& m, Word root) {
  m.hints.sample = kNoSample;
  if (m.patience-- > 0 || m.hub_count == kHubs || hub_at(m, root)) return;
  m.patience = 0;
  std::uint64_t visited = 0;
  if (open_hub(m.hubs[m.hub_count], *m.extension->services, root, visited)) {
    ++m.hub_count;
  } else {
    m.patience = static_cast<std::int64_t>(visited / kSampled);
  }
}

[[gnu::noinline]] NonzeroNode* insert_with_hubs(Manager& m, Word& root, Node& node) {
  if (root == m.hints.sample) look_for_hub(m, root);
  if (Hub* hub = hub_at(m, root)) {
    if (Node* result = insert(*hub, *m.extension->services, node)) return result;
    end_hub(m, root);
  }
  const Word before = root;
  Node* result = insert(root, node, m.hints);
  if (root != before) forget_hub_at(m, root);
  return result;
}

void destroy_manager(NonzeroTree* tree) {
  if (!tree) return;
  Manager& m = manager_of(tree);
  while (m.hub_count > 0) drop_hub(m, m.hubs[0]);
  if (m.next) m.next->previous = m.previous;
  (m.previous ? m.previous->next : m.extension->managers) = m.next;
  MemoryPool* pool = m.extension->pool;
  pool->free(pool, tree);
}

NonzeroNode* insert_node(NonzeroTree* tree, std::uint64_t* root, NonzeroNode* node) {
  Manager& m = manager_of(tree);
  if (m.hub_count != 0 || *root == m.hints.sample) return insert_with_hubs(m, *root, *node);
  return insert(*root, *node, m.hints);
}

NonzeroNode* find_node(NonzeroTree* tree, std::uint64_t* root, const std::int64_t* key) {
  const Hub* hub = hub_at(manager_of(tree), *root);
  return hub ? find(*hub, *key) : find(*root, *key);
}

std::int64_t remove_node(NonzeroTree* tree, std::uint64_t* root, const std::int64_t* key) {
  Manager& m = manager_of(tree);
  end_hub(m, *root);
  const Word before = *root;
  const bool removed = remove(*root, *key, m.hints);
  if (*root != before) forget_hub_at(m, *root);
  return removed ? 1 : 0;
}

NonzeroNode* first_node(NonzeroTree* tree, std::uint64_t* root) {
  end_hub(manager_of(tree), *root);
  return first(*root);
}

NonzeroTree* create_manager(TreeExtension* extension, const TreeParms* parms, void*, const char*) {
  // Nodes have one layout here: a caller that keeps its keys elsewhere must not be served in silence.
  if (!parms || parms->key_offset != offsetof(NonzeroNode, key)) return nullptr;
  auto* owner = reinterpret_cast<Extension*>(extension);
  auto* manager = static_cast<Manager*>(owner->pool->allocate(owner->pool, sizeof(Manager), SM_POOL_ZERO));
  if (!manager) return nullptr;
  manager->extension = owner;
  manager->next = owner->managers;
  if (owner->managers) owner->managers->previous = manager;
  owner->managers = manager;
  manager->hints.sample = kNoSample;
  manager->table.destroy = destroy_manager;
  manager->table.insert = insert_node;
  manager->table.find = find_node;
  manager->table.remove = remove_node;
  manager->table.first = first_node;
  return &manager->table;
}

void destroy_extension(TreeExtension* extension) {
  if (!extension) return;
  auto* self = reinterpret_cast<Extension*>(extension);
  while (self->managers) destroy_manager(&self->managers->table);
  self->pool->destroy(self->pool);
}

}  // namespace

TreeExtension* create_extension(HostServices& services, void* owner) {
  const PoolParms parms = {SM_POOL_EXTENSION, {0, 0}};
  MemoryPool* pool = services.create_pool(&services, &parms, owner, nullptr);
  if (!pool) return nullptr;
  auto* extension = static_cast<Extension*>(pool->allocate(pool, sizeof(Extension), SM_POOL_ZERO));
  if (!extension) {
    pool->destroy(pool);
    return nullptr;
  }
  extension->pool = pool;
  extension->services = &services;
  extension->table.destroy = destroy_extension;
  extension->table.create_tree_manager = create_manager;
  return &extension->table;
}

}  // namespace sm::avl
