#include "avl/manager.hpp"

#include <cstddef>
#include <cstdint>
#include <type_traits>

#include "avl/tree.hpp"

namespace sm::avl {
namespace {

struct Extension {
  TreeExtension table;
  MemoryPool* pool;
};

struct Manager {
  NonzeroTree table;
  MemoryPool* pool;  // the extension's
  Hint hint;
};

// Callers hold the table; the object around it is found by its address.
static_assert(std::is_standard_layout_v<Extension> && offsetof(Extension, table) == 0);
static_assert(std::is_standard_layout_v<Manager> && offsetof(Manager, table) == 0);
// Host memory is used as it comes, filled with zeros: nothing is constructed or destructed.
static_assert(std::is_trivial_v<Extension> && std::is_trivial_v<Manager>);

Hint& hint_of(NonzeroTree* tree) { return reinterpret_cast<Manager*>(tree)->hint; }

void destroy_manager(NonzeroTree* tree) {
  if (!tree) return;
  MemoryPool* pool = reinterpret_cast<Manager*>(tree)->pool;
  pool->free(pool, tree);
}

NonzeroNode* insert_node(NonzeroTree* tree, std::uint64_t* root, NonzeroNode* node) {
  return insert(*root, *node, hint_of(tree));
}

NonzeroNode* find_node(NonzeroTree*, std::uint64_t* root, const std::int64_t* key) { return find(*root, *key); }

std::int64_t remove_node(NonzeroTree* tree, std::uint64_t* root, const std::int64_t* key) {
  return remove(*root, *key, hint_of(tree)) ? 1 : 0;
}

NonzeroNode* first_node(NonzeroTree*, std::uint64_t* root) { return first(*root); }

NonzeroTree* create_manager(TreeExtension* extension, const TreeParms* parms, void*, const char*) {
  // Nodes have one layout here: a caller that keeps its keys elsewhere must not be served in silence.
  if (!parms || parms->key_offset != offsetof(NonzeroNode, key)) return nullptr;
  MemoryPool* pool = reinterpret_cast<Extension*>(extension)->pool;
  auto* manager = static_cast<Manager*>(pool->allocate(pool, sizeof(Manager), SM_POOL_ZERO));
  if (!manager) return nullptr;
  manager->pool = pool;
  manager->table.destroy = destroy_manager;
  manager->table.insert = insert_node;
  manager->table.find = find_node;
  manager->table.remove = remove_node;
  manager->table.first = first_node;
  return &manager->table;
}

void destroy_extension(TreeExtension* extension) {
  if (!extension) return;
  MemoryPool* pool = reinterpret_cast<Extension*>(extension)->pool;
  pool->destroy(pool);
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
  extension->table.destroy = destroy_extension;
  extension->table.create_tree_manager = create_manager;
  return &extension->table;
}

}  // namespace sm::avl
