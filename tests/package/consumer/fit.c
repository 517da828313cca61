/* Weighted least squares in small: X'X assembled, closed, factored, solved. Exits 0 when every number is right. */
#include <math.h>
#include <qxesm/qxesm.h>
#include <qxhost/qxhost.h>
#include <stdio.h>

static int expect(int holds, const char* what) {
  if (!holds) fprintf(stderr, "fit: %s\n", what);
  return holds ? 0 : 1;
}

static int near_to(double got, double want) { return fabs(got - want) <= 1e-13; }

/* A = [4 1 0; 1 3 1; 0 1 2]: determinant 18, and A (1, 2, 3)' = (6, 10, 8)'. */
static int fit(SmInstance* instance) {
  const SmFunctionTable* sm = instance->functions;
  const double diagonal[3] = {4, 3, 2};
  const double b[3] = {6, 10, 8};
  double x[3] = {0, 0, 0};
  double log_det = 0;
  int64_t rank = 0;
  SmMatrix* a = NULL;
  int failures = expect(sm->qxsmnewss(instance, &a, 3) == SM_OK, "no matrix");
  if (failures) return failures;
  for (int64_t i = 0; i < 3; ++i) {
    failures += expect(sm->qxsmassign(a, i, i, 1, diagonal[i]) == SM_OK, "assign");
    if (i < 2) failures += expect(sm->qxsmassign(a, i, i + 1, 1, 1.0) == SM_OK, "assign off the diagonal");
  }
  failures += expect(sm->qxsmclose(a, -1.0) == SM_OK, "close");
  failures += expect(sm->qxsmfact(a, 0) == SM_OK, "factor");
  failures += expect(sm->qxsmrank(a, &rank) == SM_OK && rank == 3, "rank is not 3");
  failures += expect(sm->qxsmlogdet(a, &log_det) == SM_OK && near_to(log_det, log(18.0)), "log det is not log 18");
  failures += expect(sm->qxsmsubst(a, b, x, 1) == SM_OK, "solve");
  for (int i = 0; i < 3; ++i) failures += expect(near_to(x[i], i + 1), "x is not (1, 2, 3)");
  failures += expect(sm->qxsmDestroyMatrix(instance, &a) == SM_OK && a == NULL, "destroy");
  return failures;
}

int main(void) {
  QxHost* host = qxhost_create(NULL);
  SmExtension* extension = host ? (SmExtension*)qxhost_load_extension(host, L"qxesm", 5) : NULL;
  SmInstance* instance = extension ? extension->CreateInstance(extension) : NULL;
  int failures = 0;
  if (!instance) {
    fprintf(stderr, "fit: no instance: %s\n", host ? qxhost_last_error(host) : "no host");
    return 1;
  }
  failures = fit(instance);
  instance->functions->qxsmDestroyInstance(&instance);
  extension->qxsmDestroyExtension(extension);
  failures += expect(qxhost_usage(host).pools_live == 0, "a pool is left");
  qxhost_destroy(host);
  if (!failures) puts("fit: rank 3, log det 2.8904, x = (1, 2, 3)");
  return failures ? 1 : 0;
}
