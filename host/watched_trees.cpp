// A table in front of the tree extension: the checking mode sees, counts and refuses requests for tree managers.
#include <cstdlib>

#include "host/checker.hpp"

namespace sm::host {
namespace {

WatchedTrees& watched(TreeExtension* table) { return *reinterpret_cast<WatchedTrees*>(table); }

bool is_dead(const WatchedTrees& trees) {
  if (trees.dead) ++trees.host->checker->found.dead_pools;
  return trees.dead;
}

NonzeroTree* create_tree_manager(TreeExtension* table, const TreeParms* parms, void* zero, const char* label) {
  if (!table) return nullptr;
  WatchedTrees& trees = watched(table);
  if (is_dead(trees) || refuses(*trees.host, QXHOST_FAIL_TREES)) return nullptr;
  return trees.real->create_tree_manager(trees.real, parms, zero, label);
}

void destroy(TreeExtension* table) {
  if (!table) return;
  WatchedTrees& trees = watched(table);
  if (is_dead(trees)) return;
  trees.dead = true;  // the table stays until the host goes, for calls that come too late
  trees.real->destroy(trees.real);
}

}  // namespace

TreeExtension* watch_trees(QxHost& host, TreeExtension* real) {
  auto* trees = static_cast<WatchedTrees*>(std::calloc(1, sizeof(WatchedTrees)));
  if (!trees) return nullptr;
  trees->table.destroy = destroy;
  trees->table.create_tree_manager = create_tree_manager;
  trees->real = real;
  trees->host = &host;
  trees->next = host.checker->trees;
  host.checker->trees = trees;
  return &trees->table;
}

}  // namespace sm::host
