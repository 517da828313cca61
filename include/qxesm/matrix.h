/* The matrix record. Callers read it freely and change it only through the operations. */
#ifndef QXESM_MATRIX_H
#define QXESM_MATRIX_H

#include <qxesm/host.h>
#include <qxesm/status.h>
#include <qxesm/types.h>

typedef struct SmInstance SmInstance;
typedef struct SmMatrix SmMatrix;

/* One matrix. Owned by its instance; its storage is owned by its pools, except values attached by qxsmtie. */
struct SmMatrix {
  SmInstance* instance;      /* the instance that created it */
  MemoryPool* pool;          /* value and compressed arrays, factor; nodes and roots of a general sparse matrix */
  MemoryPool* assembly_pool; /* symmetric sparse while open: nodes and roots */
  NonzeroTree* tree;         /* tree manager of a sparse matrix */
  NonzeroNode* spare_node;   /* the node that the next insertion offers; null when a slab could not be had */
  NonzeroNode* next_node;    /* the slab position behind spare_node */
  int64_t rows;
  int64_t cols;
  int64_t nnz;            /* stored entries: nodes, compressed entries, or value slots; of a large open symmetric sparse
                           * matrix without the up to 64 entries that wait to be linked in */
  int64_t rank;           /* accepted pivots; -1 on creation, 0 after a change of entries */
  int64_t row_capacity;   /* words of the root array */
  int64_t registry_index; /* 1-based place in the instance's registry */
  int64_t node_size;      /* 32 */
  int64_t slab_nodes;     /* nodes a slab */
  int64_t slab_bytes;     /* node_size * slab_nodes */
  int64_t slab_used;      /* bytes of the current slab handed out */
  int32_t kind;
  int32_t format;
  int16_t definite; /* -1 unknown, 1 yes, 0 no */
  int32_t state;
  double log_det;      /* the missing value until known */
  double value_count;  /* value slots: rows*cols, n(n+1)/2, or n */
  int64_t solver_word; /* the iterative solver's user word */
  union {
    double* values;        /* dense and diagonal: the value array */
    uint64_t* row_roots;   /* general sparse: the root array, row_capacity words */
    int64_t work_capacity; /* symmetric sparse: words in `work`, 0 while none has been sized */
  };
  union {
    int64_t* row_start;   /* symmetric sparse, closed: n + 1 offsets */
    double* dense_factor; /* dense and diagonal: the separate factor or inverse array, or null */
  };
  union {
    int64_t* col_index;  /* symmetric sparse, closed: column of each stored entry */
    uint8_t owns_values; /* dense and diagonal: 1 when `values` was allocated by the matrix, 0 when tied */
  };
  int64_t* perm;            /* n words: perm[k] is the row placed k-th */
  int64_t* inv_perm;        /* n words: inv_perm[i] is the place of row i */
  int64_t factor_block;     /* index words in a value word: 1 */
  double* nz_values;        /* symmetric sparse, closed: value of each stored entry */
  int64_t* work;            /* work_capacity 8-byte words: the factor workspace; the next six point into it */
  int64_t* factor_scratch;  /* n words, free for reuse once factored */
  double* factor_diag;      /* n reciprocal pivots, 0 for a dropped one */
  double* factor_values;    /* off-diagonal entries of U, row by row, negated */
  int64_t* factor_iju;      /* n words: where row k's subscripts start in factor_ju */
  int64_t* factor_iu;       /* n + 1 words: row k of U is at factor_iu[k] .. factor_iu[k+1] - 1 */
  int64_t* factor_ju;       /* compressed column subscripts of U, in the new order */
  int64_t* factor_reserved; /* null, or nnz words of its own: the place of each entry in closing order */
  uint64_t* sym_roots;      /* symmetric sparse while open: the root array, row_capacity words */
};

SM_STATIC_ASSERT(offsetof(SmMatrix, rows) == 48, "record layout");
SM_STATIC_ASSERT(offsetof(SmMatrix, kind) == 128, "record layout");
SM_STATIC_ASSERT(offsetof(SmMatrix, definite) == 136, "record layout");
SM_STATIC_ASSERT(offsetof(SmMatrix, state) == 140, "record layout");
SM_STATIC_ASSERT(offsetof(SmMatrix, log_det) == 144, "record layout");
SM_STATIC_ASSERT(offsetof(SmMatrix, values) == 168, "record layout");
SM_STATIC_ASSERT(offsetof(SmMatrix, work_capacity) == offsetof(SmMatrix, values), "shared slot");
SM_STATIC_ASSERT(offsetof(SmMatrix, dense_factor) == offsetof(SmMatrix, row_start), "shared slot");
SM_STATIC_ASSERT(offsetof(SmMatrix, owns_values) == offsetof(SmMatrix, col_index), "shared slot");
SM_STATIC_ASSERT(offsetof(SmMatrix, perm) == 192, "record layout");
SM_STATIC_ASSERT(offsetof(SmMatrix, work) == 224, "record layout");
SM_STATIC_ASSERT(offsetof(SmMatrix, sym_roots) == 288, "record layout");
SM_STATIC_ASSERT(sizeof(SmMatrix) == 296, "record layout");

#endif
