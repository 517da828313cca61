/* The tree of the minimal host: an unbalanced search tree with threads, to the contract of <qxesm/host.h>. Keys in
 * ascending order make it a list, so an insertion then costs as many steps as there are nodes; it is for tests only. */
#ifndef QXESM_TESTS_MINIMAL_TREE_H
#define QXESM_TESTS_MINIMAL_TREE_H

#include <qxesm/host.h>

/* What a removed node's links hold: whoever follows them, falls. */
#define MINIMAL_TREE_FALL UINT64_C(0x7B7B7B7B7B7B7B78)

/* What the operations below expect behind a manager's address. */
typedef struct MinimalTree {
  NonzeroTree table;
  uint64_t noise; /* any seed */
} MinimalTree;

static NonzeroNode* address(uint64_t link) { return (NonzeroNode*)(uintptr_t)(link & ~SM_LINK_TAGS); }
static int is_thread(uint64_t link) { return (link & SM_LINK_THREAD) != 0; }

/* A link to a node, with a balance bit that means nothing. */
static uint64_t link_to(MinimalTree* self, NonzeroNode* node, uint64_t thread) {
  self->noise = self->noise * 6364136223846793005u + 1442695040888963407u;
  return (uint64_t)(uintptr_t)node | thread | ((self->noise >> 63) & SM_LINK_BALANCE);
}

static NonzeroNode* tree_insert(NonzeroTree* tree, uint64_t* root, NonzeroNode* node) {
  MinimalTree* self = (MinimalTree*)tree;
  NonzeroNode* at = address(*root);
  if (!at) {
    node->left = node->right = SM_LINK_THREAD;
    *root = (uint64_t)(uintptr_t)node;
    return node;
  }
  for (;;) {
    if (node->key == at->key) return at;
    uint64_t* down = node->key < at->key ? &at->left : &at->right;
    if (is_thread(*down)) {
      node->left = node->key < at->key ? *down : link_to(self, at, SM_LINK_THREAD);
      node->right = node->key < at->key ? link_to(self, at, SM_LINK_THREAD) : *down;
      *down = link_to(self, node, 0);
      return node;
    }
    at = address(*down);
  }
}

static NonzeroNode* tree_find(NonzeroTree* tree, uint64_t* root, const int64_t* key) {
  (void)tree;
  NonzeroNode* at = address(*root);
  while (at && at->key != *key) {
    const uint64_t down = *key < at->key ? at->left : at->right;
    at = is_thread(down) ? NULL : address(down);
  }
  return at;
}

static NonzeroNode* leftmost(NonzeroNode* at) {
  while (at && !is_thread(at->left)) at = address(at->left);
  return at;
}

static NonzeroNode* rightmost(NonzeroNode* at) {
  while (!is_thread(at->right)) at = address(at->right);
  return at;
}

static NonzeroNode* tree_first(NonzeroTree* tree, uint64_t* root) {
  (void)tree;
  return leftmost(address(*root));
}

/* Puts the successor of a node with two children into the node's place. */
static NonzeroNode* lift_successor(MinimalTree* self, NonzeroNode* gone) {
  NonzeroNode* parent = gone;
  NonzeroNode* next = address(gone->right);
  while (!is_thread(next->left)) {
    parent = next;
    next = address(next->left);
  }
  if (parent != gone) {
    parent->left =
        is_thread(next->right) ? link_to(self, next, SM_LINK_THREAD) : link_to(self, address(next->right), 0);
    next->right = link_to(self, address(gone->right), 0);
  }
  rightmost(address(gone->left))->right = link_to(self, next, SM_LINK_THREAD);
  next->left = link_to(self, address(gone->left), 0);
  return next;
}

/* What takes the place of a node below its parent, threads mended; null when nothing does. */
static NonzeroNode* replacement_of(MinimalTree* self, NonzeroNode* gone) {
  if (!is_thread(gone->left) && !is_thread(gone->right)) return lift_successor(self, gone);
  if (!is_thread(gone->left)) {
    rightmost(address(gone->left))->right = gone->right;
    return address(gone->left);
  }
  if (!is_thread(gone->right)) {
    leftmost(address(gone->right))->left = gone->left;
    return address(gone->right);
  }
  return NULL;
}

static int64_t tree_remove(NonzeroTree* tree, uint64_t* root, const int64_t* key) {
  MinimalTree* self = (MinimalTree*)tree;
  NonzeroNode* parent = NULL;
  NonzeroNode* gone = address(*root);
  while (gone && gone->key != *key) {
    const uint64_t down = *key < gone->key ? gone->left : gone->right;
    parent = gone;
    gone = is_thread(down) ? NULL : address(down);
  }
  if (!gone) return 0;
  const int was_left = parent && !is_thread(parent->left) && address(parent->left) == gone;
  NonzeroNode* other = replacement_of(self, gone);
  if (!parent) {
    *root = (uint64_t)(uintptr_t)other;
  } else if (was_left) {
    parent->left = other ? link_to(self, other, 0) : gone->left;
  } else {
    parent->right = other ? link_to(self, other, 0) : gone->right;
  }
  gone->left = gone->right = MINIMAL_TREE_FALL; /* whoever follows these, falls */
  return 1;
}

#endif
