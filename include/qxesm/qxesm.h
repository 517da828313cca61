/* qxesm: sparse and packed matrices of mixed models, least squares and Gaussian fields. All public declarations.
 *
 * The usual road: CreateInstance, then qxsmnewss, qxsmassign in add mode, qxsmclose, qxsmfact, and then
 * qxsminvmultv, qxsmlogdet, qxsmrank. Every operation answers an SmStatus (status.h) and checks its arguments in the
 * order in which its declaration lists the answers. Indices are zero-based int64_t; blocks of vectors stand one after
 * the other; values are doubles. Operations on one matrix, and on one instance, must not run at the same time. */
#ifndef QXESM_QXESM_H
#define QXESM_QXESM_H

#include <qxesm/cholesky.h>
#include <qxesm/forms.h>
#include <qxesm/ginv.h>
#include <qxesm/host.h>
#include <qxesm/instance.h>
#include <qxesm/iterative.h>
#include <qxesm/matrix.h>
#include <qxesm/status.h>
#include <qxesm/store.h>
#include <qxesm/trace.h>
#include <qxesm/types.h>

#endif
