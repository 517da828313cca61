/* One-way layout with a kept mean: y = mu + g_i, X'X is singular, and the answer is still right. */
#include <qxesm/qxesm.h>
#include <qxhost/qxhost.h>
#include <stdio.h>

int main(void) {
  const int group[6] = {1, 1, 2, 2, 2, 3};
  const double y[6] = {4.0, 6.0, 7.0, 8.0, 9.0, 1.0};
  double xty[4] = {0}, b[4] = {0}, log_det = 0.0;
  int64_t rank = 0;

  QxHost* host = qxhost_create(NULL);
  SmExtension* ext = (SmExtension*)qxhost_load_extension(host, L"qxesm", 5);
  if (!ext) return fprintf(stderr, "%s\n", qxhost_last_error(host)), 2;
  SmInstance* instance = ext->CreateInstance(ext);
  const SmFunctionTable* sm = instance->functions;

  SmMatrix* xtx = NULL;
  SmStatus status = sm->qxsmnewss(instance, &xtx, 4); /* columns: mean, three groups */
  for (int r = 0; r < 6 && status == SM_OK; ++r) {    /* add x x' of each record, upper triangle */
    sm->qxsmassign(xtx, 0, 0, 1, 1.0);
    sm->qxsmassign(xtx, 0, group[r], 1, 1.0);
    status = sm->qxsmassign(xtx, group[r], group[r], 1, 1.0);
    xty[0] += y[r];
    xty[group[r]] += y[r];
  }
  if (status == SM_OK) status = sm->qxsmclose(xtx, 0.0);
  if (status == SM_OK) status = sm->qxsmfact(xtx, 0);
  if (status == SM_OK) status = sm->qxsmsubst(xtx, xty, b, 1);
  if (status == SM_OK) status = sm->qxsmrank(xtx, &rank);
  if (status == SM_OK) status = sm->qxsmlogdet(xtx, &log_det);
  printf("status %d, rank %d of 4, log-determinant %.6f\n", status, (int)rank, log_det);
  for (int g = 1; g <= 3; ++g) printf("group %d: %.6f\n", g, b[0] + b[g]);

  sm->qxsmDestroyInstance(&instance);
  ext->qxsmDestroyExtension(ext);
  qxhost_destroy(host);
  return status == SM_OK ? 0 : 1;
}
