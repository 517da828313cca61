/* The host's side: what a program must offer so that the module can run inside it.
 *
 * All host objects are tables of operations, read by position: word k is the k-th 64-bit word of the object,
 * counted from 1, and every operation takes its object as first argument. Words that are not named here are the
 * host's own; the module neither reads nor writes them. A null answer is the only failure signal; the module turns
 * it into status 101 (or into a null handle where it answers with a handle). Host objects are used by one thread
 * at a time per instance, without locks. */
#ifndef QXESM_HOST_H
#define QXESM_HOST_H

#include <stddef.h>
#include <stdint.h>

/* Allocation flag: return the block filled with zeros. */
#define SM_POOL_ZERO UINT32_C(0x80000000)

/* Values of PoolParms.flag. */
#define SM_POOL_EXTENSION UINT64_C(0)         /* the extension's own pool */
#define SM_POOL_INSTANCE UINT64_C(0x80000000) /* an instance's pool, named "WORKPOOL" */
#define SM_POOL_MATRIX UINT64_C(1)            /* a matrix's pools, unnamed */

typedef struct HostServices HostServices;
typedef struct MemoryPool MemoryPool;
typedef struct TreeExtension TreeExtension;
typedef struct NonzeroTree NonzeroTree;
typedef struct NonzeroNode NonzeroNode;
typedef struct TreeInner TreeInner;

/* Parameter block of a pool: 24 bytes, zero but for the first word. Read during the call only. */
typedef struct PoolParms {
  uint64_t flag;
  uint64_t reserved[2];
} PoolParms;

/* A memory pool. */
struct MemoryPool {
  void* reserved_1[2];
  /* Word 3: frees every block allocated from the pool, and the pool itself. */
  void (*destroy)(MemoryPool* pool);
  /* Word 4: a block of at least `bytes` bytes, aligned for any scalar, or null. flags: 0 or SM_POOL_ZERO. */
  void* (*allocate)(MemoryPool* pool, uint64_t bytes, uint32_t flags);
  /* Word 5: returns one block to the pool. Null is tolerated. */
  void (*free)(MemoryPool* pool, void* block);
};

/* The object that Exported_QXHandle points to. */
struct HostServices {
  void* reserved_1[6];
  /* Word 7: a new pool, or null. `name` may be null; it is read during the call only. */
  MemoryPool* (*create_pool)(HostServices* kernel, const PoolParms* parms, void* owner, const char* name);
  void* reserved_8[2];
  /* Word 10: the extension of that name, ready for use, or null. `length` counts wide characters. */
  void* (*load_extension)(HostServices* kernel, const wchar_t* name, int64_t length, void* zero);
};

/* Parameter block of a tree manager: 1, byte offset of the key inside a node (16), 10, 1. */
typedef struct TreeParms {
  uint32_t first;
  uint32_t key_offset;
  uint32_t third;
  uint32_t fourth;
} TreeParms;

/* The tree extension `qxeavl`, as load_extension returns it. */
struct TreeExtension {
  void* reserved_1[2];
  /* Word 3: gives the extension back. Managers are destroyed before it. */
  void (*destroy)(TreeExtension* extension);
  void* reserved_4[6];
  /* Word 10: a new manager, or null. `zero` is null; `label` is read during the call only. */
  NonzeroTree* (*create_tree_manager)(TreeExtension* extension, const TreeParms* parms, void* zero, const char* label);
};

/* Link words of a node carry tags in their two low bits. */
#define SM_LINK_BALANCE UINT64_C(1) /* the tree's own; ignored by walks */
#define SM_LINK_THREAD UINT64_C(2)  /* not a child: the in-order neighbour, or address 0 past the end */
#define SM_LINK_TAGS UINT64_C(3)

/* A stored nonzero: 32 bytes, allocated by the module, linked by the tree. */
struct NonzeroNode {
  uint64_t left;
  uint64_t right;
  int64_t key; /* column, zero-based; trees ascend by it */
  double value;
};

/* What a manager may hold behind word 6: reset with (inner, 1, 1) and then released when a matrix is reset. */
struct TreeInner {
  void* reserved_1[3];
  void (*reset)(TreeInner* inner, int64_t one, int64_t one_again); /* word 4 */
  void (*release)(TreeInner* inner);                               /* word 5 */
};

/* A tree manager. It serves any number of trees; a tree is named by the address of its root word, which the module
 * keeps, and an empty tree is a root word of zero. Root words move when the module's root array grows, so nothing
 * about an address may be assumed between calls. A tree stays with the manager that it was begun with. Nodes stay where
 * they are; removal unlinks, it frees nothing and never moves a key from one node to another. */
struct NonzeroTree {
  void* reserved_1[2];
  /* Word 3: gives the manager back; nodes are not its business. */
  void (*destroy)(NonzeroTree* tree);
  /* Word 4: set to zero by the module before it destroys a manager that has an inner object. */
  void* cleared_word;
  void* reserved_5;
  /* Word 6: an inner object, or null. */
  TreeInner* inner;
  void* reserved_7[8];
  /* Word 15: links `node` in under its key and returns it, or returns the node that already holds the key and
   * leaves the given one untouched. */
  NonzeroNode* (*insert)(NonzeroTree* tree, uint64_t* root, NonzeroNode* node);
  /* Word 16: the node that holds *key, or null. */
  NonzeroNode* (*find)(NonzeroTree* tree, uint64_t* root, const int64_t* key);
  void* reserved_17;
  /* Word 18: non-zero when a node was unlinked, zero when the key was absent. */
  int64_t (*remove)(NonzeroTree* tree, uint64_t* root, const int64_t* key);
  /* Word 19: the node with the smallest key, or null for an empty tree. */
  NonzeroNode* (*first)(NonzeroTree* tree, uint64_t* root);
};

/* Successor of `node` in key order, or null: follow the right link; from a child go left as far as it goes. */
static inline NonzeroNode* sm_node_next(const NonzeroNode* node) {
  uint64_t link = node->right;
  NonzeroNode* next = (NonzeroNode*)(uintptr_t)(link & ~SM_LINK_TAGS);
  if (link & SM_LINK_THREAD) return next;
  while (next && !(next->left & SM_LINK_THREAD)) {
    next = (NonzeroNode*)(uintptr_t)(next->left & ~SM_LINK_TAGS);
  }
  return next;
}

#if defined(__cplusplus)
#define SM_STATIC_ASSERT static_assert
#else
#define SM_STATIC_ASSERT _Static_assert
#endif

/* Positions are the contract: word k is at byte 8(k - 1). */
SM_STATIC_ASSERT(sizeof(void*) == 8, "64-bit only");
SM_STATIC_ASSERT(sizeof(PoolParms) == 24, "pool parameter block");
SM_STATIC_ASSERT(sizeof(TreeParms) == 16, "tree parameter block");
SM_STATIC_ASSERT(offsetof(MemoryPool, destroy) == 2 * sizeof(void*), "pool word 3");
SM_STATIC_ASSERT(offsetof(MemoryPool, allocate) == 3 * sizeof(void*), "pool word 4");
SM_STATIC_ASSERT(offsetof(MemoryPool, free) == 4 * sizeof(void*), "pool word 5");
SM_STATIC_ASSERT(offsetof(HostServices, create_pool) == 6 * sizeof(void*), "host word 7");
SM_STATIC_ASSERT(offsetof(HostServices, load_extension) == 9 * sizeof(void*), "host word 10");
SM_STATIC_ASSERT(offsetof(TreeExtension, destroy) == 2 * sizeof(void*), "tree extension word 3");
SM_STATIC_ASSERT(offsetof(TreeExtension, create_tree_manager) == 9 * sizeof(void*), "tree extension word 10");
SM_STATIC_ASSERT(offsetof(TreeInner, reset) == 3 * sizeof(void*), "inner word 4");
SM_STATIC_ASSERT(offsetof(TreeInner, release) == 4 * sizeof(void*), "inner word 5");
SM_STATIC_ASSERT(offsetof(NonzeroTree, destroy) == 2 * sizeof(void*), "tree word 3");
SM_STATIC_ASSERT(offsetof(NonzeroTree, cleared_word) == 3 * sizeof(void*), "tree word 4");
SM_STATIC_ASSERT(offsetof(NonzeroTree, inner) == 5 * sizeof(void*), "tree word 6");
SM_STATIC_ASSERT(offsetof(NonzeroTree, insert) == 14 * sizeof(void*), "tree word 15");
SM_STATIC_ASSERT(offsetof(NonzeroTree, find) == 15 * sizeof(void*), "tree word 16");
SM_STATIC_ASSERT(offsetof(NonzeroTree, remove) == 17 * sizeof(void*), "tree word 18");
SM_STATIC_ASSERT(offsetof(NonzeroTree, first) == 18 * sizeof(void*), "tree word 19");
SM_STATIC_ASSERT(sizeof(NonzeroNode) == 32, "node");
SM_STATIC_ASSERT(offsetof(NonzeroNode, key) == 16, "node key");
SM_STATIC_ASSERT(offsetof(NonzeroNode, value) == 24, "node value");

#endif
