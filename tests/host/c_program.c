/* The typical fit, from C: the headers are C11, and the host is enough to run the module. Answers 0, or the number of the
 * step that failed. */
#include <math.h>
#include <qxesm/qxesm.h>
#include <qxhost/qxhost.h>

int32_t run_c_program(void);

static int32_t fit(SmInstance* instance) {
  const SmFunctionTable* sm = instance->functions;
  SmMatrix* a = NULL;
  double log_det = 0.0;
  int64_t rank = 0;
  if (sm->qxsmnewss(instance, &a, 4)) return 3;
  for (int64_t i = 0; i < 4; ++i) {
    if (sm->qxsmassign(a, i, i, 1, 2.0)) return 4;
  }
  if (sm->qxsmclose(a, 0.0) || sm->qxsmfact(a, 0)) return 5;
  if (sm->qxsmlogdet(a, &log_det) || fabs(log_det - 4.0 * log(2.0)) > 1e-14) return 6;
  if (sm->qxsmrank(a, &rank) || rank != 4) return 7;
  return 0;
}

int32_t run_c_program(void) {
  QxHost* host = qxhost_create(NULL);
  if (!host) return 1;
  int32_t failed = 2;
  SmExtension* extension = (SmExtension*)qxhost_load_extension(host, L"qxesm", 5);
  if (extension) {
    SmInstance* instance = extension->CreateInstance(extension);
    if (instance) {
      failed = fit(instance);
      instance->functions->qxsmDestroyInstance(&instance);
    }
    extension->qxsmDestroyExtension(extension);
  }
  if (failed == 0 && qxhost_usage(host).bytes_in_use != 0) failed = 8;
  qxhost_destroy(host);
  return failed;
}
