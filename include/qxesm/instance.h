/* The extension object, the instance and its table of 43 operations, and the entry points that build them. */
#ifndef QXESM_INSTANCE_H
#define QXESM_INSTANCE_H

#include <qxesm/matrix.h>

typedef struct SmExtension SmExtension;
typedef struct SmFunctionTable SmFunctionTable;

/* The module's interface: slots are read by position and never move. Each member is documented where the exported
 * operation of the same name is declared (store.h, cholesky.h, forms.h, ginv.h, trace.h, iterative.h, and below).
 * Slots 9 and 10 hold the same operation. */
struct SmFunctionTable {
  SmStatus (*qxsmDestroyInstance)(SmInstance** instance);
  SmStatus (*qxsmnew)(SmInstance* instance, SmMatrix** matrix, int32_t kind, int32_t format);
  SmStatus (*qxsmDestroyMatrix)(SmInstance* instance, SmMatrix** matrix);
  SmStatus (*qxsmclose)(SmMatrix* matrix, double tolerance);
  SmStatus (*qxsmdelete)(SmMatrix* matrix);
  SmStatus (*qxsmresize)(SmMatrix* matrix, int64_t rows, int64_t cols);
  SmStatus (*qxsmzscp)(SmMatrix* matrix, const double* z, const int64_t* index, int64_t length, double weight);
  SmStatus (*qxsmsoldirect)(SmMatrix* matrix, const double* b, double* x, int32_t count);
  SmStatus (*qxsmsolioc)(SmMatrix* a, const double* b, double* x, int32_t nrhs, int64_t max_iterations,
                         int64_t* iterations, double* residual, double tolerance);
  SmStatus (*qxsmAddSS)(SmMatrix* a, SmMatrix* b, double s);
  SmStatus (*qxsmAddSS_10)(SmMatrix* a, SmMatrix* b, double s);
  SmStatus (*qxsmassign)(SmMatrix* matrix, int64_t row, int64_t col, int32_t add, double value);
  SmStatus (*qxsmget)(SmMatrix* matrix, int64_t row, int64_t col, double* value);
  SmStatus (*qxsminvdiag)(SmMatrix* matrix, double* x);
  SmStatus (*qxsminv)(SmMatrix* a, int16_t in_place, double tolerance);
  SmStatus (*qxsmUpdateGinv)(SmMatrix* g, SmMatrix* a, SmMatrix* b, int64_t r, int64_t c, double s);
  SmStatus (*qxsmsetee)(SmMatrix* matrix, double value);
  SmStatus (*qxsmpivot)(SmMatrix* matrix, char* pivots);
  SmStatus (*qxsmcke)(SmMatrix* matrix, const double* vectors, int32_t k, int64_t* failed_count, int32_t* flags,
                      char mode, double tolerance);
  SmStatus (*qxsminvquad)(SmMatrix* a, SmMatrix* x, SmMatrix* r);
  SmStatus (*qxsminvquadv)(SmMatrix* a, const double* x, double* r, int64_t p, int32_t format);
  SmStatus (*qxsmquad)(SmMatrix* a, SmMatrix* x, SmMatrix* r, int32_t keep);
  SmStatus (*qxsmquadv)(SmMatrix* a, const double* x, double* r, int64_t p, int64_t c0, int64_t c1);
  SmStatus (*qxsmsubst)(SmMatrix* matrix, const double* b, double* x, int32_t count);
  SmStatus (*qxsmhermite)(SmMatrix* a, SmMatrix* h);
  SmStatus (*qxsmdense)(SmMatrix* matrix, double* out, int16_t mode);
  SmStatus (*qxsmlogdet)(SmMatrix* matrix, double* out);
  SmStatus (*qxsmrank)(SmMatrix* matrix, int64_t* out);
  SmStatus (*qxsmtrace)(SmMatrix* a, double* result);
  SmStatus (*qxsmtraceAB)(SmMatrix* a, SmMatrix* b, double* result);
  SmStatus (*qxsmdiag)(SmMatrix* matrix, double* out, int64_t first, int64_t last);
  SmStatus (*qxsmmults)(SmMatrix* a, double s);
  SmStatus (*qxsmIsDiag)(SmMatrix* matrix, int16_t* flag, double tolerance);
  SmStatus (*qxsmDenseQuad)(SmMatrix* g, const double* s, SmMatrix* r, int32_t keep);
  SmStatus (*qxsmvaxpy)(SmMatrix* c, SmMatrix* a, SmMatrix* b, double scale, double tolerance);
  SmStatus (*qxsmbilin)(SmMatrix* a, const double* x, const double* y, double* r, int64_t p, int64_t q);
  SmStatus (*qxsmclone)(SmMatrix* source, SmMatrix* target, int32_t reassemble);
  SmStatus (*qxsmconvert)(SmMatrix* source, SmMatrix* target, int32_t flag);
  SmStatus (*qxsmfact)(SmMatrix* matrix, int32_t in_place);
  SmStatus (*qxsmnewss)(SmInstance* instance, SmMatrix** matrix, int64_t n);
  SmStatus (*qxsmnewds)(SmInstance* instance, SmMatrix** matrix, int64_t n);
  SmStatus (*qxsmnewsg)(SmInstance* instance, SmMatrix** matrix, int64_t rows, int64_t cols);
  SmStatus (*qxsmnewsd)(SmInstance* instance, SmMatrix** matrix, int64_t n);
};

/* An instance. Created by CreateInstance, destroyed by qxsmDestroyInstance; everything in it lives in its pool. */
struct SmInstance {
  int64_t matrix_count;    /* registry entries handed out so far; never decreases */
  int64_t matrix_capacity; /* length of the registry; grows by 10 */
  MemoryPool* pool;        /* "WORKPOOL": matrix records, the registry, the blocks below */
  TreeExtension* tree_extension;
  double* tolerances; /* four settings, written at creation:
                                [0] storage threshold of qxsmorth, [1] unused,
                                [2] singularity tolerance of factorization and inversion,
                                [3] drop tolerance of qxsmclose when it is given a negative one */
  SmFunctionTable* functions;
  int64_t* spare_word; /* one word, zero */
  SmMatrix** registry; /* entry k holds the matrix whose registry_index is k + 1, or null */
};

/* The extension object; the host reads it by position. */
struct SmExtension {
  void* reserved_1[3];
  int32_t (*qxsmGetReqVersion)(SmExtension* extension, int32_t* major, int32_t* minor, int32_t* release);
  int32_t (*qxsmGetVersion)(SmExtension* extension, int32_t* major, int32_t* minor, int32_t* release);
  void* reserved_6;
  int32_t (*qxsmDestroyExtension)(SmExtension* extension);
  void* reserved_8[2];
  MemoryPool* pool;
  TreeExtension* tree_extension;
  SmInstance* (*CreateInstance)(SmExtension* extension);
};

#define SM_SLOT(slot, name) \
  SM_STATIC_ASSERT(offsetof(SmFunctionTable, name) == (slot) * sizeof(void*), "slots never move")
SM_SLOT(0, qxsmDestroyInstance);
SM_SLOT(1, qxsmnew);
SM_SLOT(2, qxsmDestroyMatrix);
SM_SLOT(3, qxsmclose);
SM_SLOT(4, qxsmdelete);
SM_SLOT(5, qxsmresize);
SM_SLOT(6, qxsmzscp);
SM_SLOT(7, qxsmsoldirect);
SM_SLOT(8, qxsmsolioc);
SM_SLOT(9, qxsmAddSS);
SM_SLOT(10, qxsmAddSS_10);
SM_SLOT(11, qxsmassign);
SM_SLOT(12, qxsmget);
SM_SLOT(13, qxsminvdiag);
SM_SLOT(14, qxsminv);
SM_SLOT(15, qxsmUpdateGinv);
SM_SLOT(16, qxsmsetee);
SM_SLOT(17, qxsmpivot);
SM_SLOT(18, qxsmcke);
SM_SLOT(19, qxsminvquad);
SM_SLOT(20, qxsminvquadv);
SM_SLOT(21, qxsmquad);
SM_SLOT(22, qxsmquadv);
SM_SLOT(23, qxsmsubst);
SM_SLOT(24, qxsmhermite);
SM_SLOT(25, qxsmdense);
SM_SLOT(26, qxsmlogdet);
SM_SLOT(27, qxsmrank);
SM_SLOT(28, qxsmtrace);
SM_SLOT(29, qxsmtraceAB);
SM_SLOT(30, qxsmdiag);
SM_SLOT(31, qxsmmults);
SM_SLOT(32, qxsmIsDiag);
SM_SLOT(33, qxsmDenseQuad);
SM_SLOT(34, qxsmvaxpy);
SM_SLOT(35, qxsmbilin);
SM_SLOT(36, qxsmclone);
SM_SLOT(37, qxsmconvert);
SM_SLOT(38, qxsmfact);
SM_SLOT(39, qxsmnewss);
SM_SLOT(40, qxsmnewds);
SM_SLOT(41, qxsmnewsg);
SM_SLOT(42, qxsmnewsd);
#undef SM_SLOT
SM_STATIC_ASSERT(sizeof(SmFunctionTable) == 344, "43 slots");
SM_STATIC_ASSERT(sizeof(SmInstance) == 64, "instance layout");
SM_STATIC_ASSERT(offsetof(SmInstance, tolerances) == 32, "instance layout");
SM_STATIC_ASSERT(offsetof(SmInstance, functions) == 40, "instance layout");
SM_STATIC_ASSERT(sizeof(SmExtension) == 96, "twelve words");
SM_STATIC_ASSERT(offsetof(SmExtension, qxsmGetReqVersion) == 3 * sizeof(void*), "extension word 4");
SM_STATIC_ASSERT(offsetof(SmExtension, qxsmDestroyExtension) == 6 * sizeof(void*), "extension word 7");
SM_STATIC_ASSERT(offsetof(SmExtension, pool) == 9 * sizeof(void*), "extension word 10");
SM_STATIC_ASSERT(offsetof(SmExtension, tree_extension) == 10 * sizeof(void*), "extension word 11");
SM_STATIC_ASSERT(offsetof(SmExtension, CreateInstance) == 11 * sizeof(void*), "extension word 12");

/* The host's services. Set by qxextent; everything else in the module needs it. Read-only afterwards. */
QXESM_API HostServices* Exported_QXHandle;

/* Stores the handle in Exported_QXHandle. Answers 0. */
QXESM_API int32_t qxextent(HostServices* handle);

/* Stores the interface version that the module requires, 5 and 1, then does what qxextent does. */
QXESM_API int32_t qxextver(HostServices* handle, int32_t* major, int32_t* minor);

/* Builds the extension object: a pool (`owner` is handed to the host's create pool), the object in it, and the tree
 * extension `qxeavl`. `unused` is not read. Answers null, with nothing left behind, when any of them cannot be
 * had. Given back by qxsmDestroyExtension. */
QXESM_API SmExtension* qxesm(void* unused, void* owner);

/* Stores 5, 1, 1: the host interface version required. Answers 0. */
QXESM_API int32_t qxsmGetReqVersion(SmExtension* extension, int32_t* major, int32_t* minor, int32_t* release);

/* Stores 1, 0, 0: the module's own version. Answers 0. */
QXESM_API int32_t qxsmGetVersion(SmExtension* extension, int32_t* major, int32_t* minor, int32_t* release);

/* Gives back the tree extension and the pool, with the object in it. Null is harmless. Answers 0. Instances are
 * destroyed first. */
QXESM_API int32_t qxsmDestroyExtension(SmExtension* extension);

/* A new instance that uses the extension's trees, or null, with nothing left behind, when memory is short. */
QXESM_API SmInstance* CreateInstance(SmExtension* extension);

/* Copies the module's fixed 208-byte version record into `buffer`. */
QXESM_API void qxvercn1(char* buffer);

/* A new instance without a tree extension; CreateInstance is the way to a usable one.
 * Answers 101 with null stored (no pool, or no instance record), or 100 with the half-built instance stored (its table
 * or blocks could not be had; destroy it), or 0. */
QXESM_API SmStatus qxsmGetANewInstance(SmInstance** instance);

/* Resets every matrix that is still registered, destroys the instance's pool with everything in it, and stores null.
 * A null instance is harmless. Answers 0. */
QXESM_API SmStatus qxsmDestroyInstance(SmInstance** instance);

#endif
