/* What a probe extension answers when it is loaded. */
#ifndef QXESM_TESTS_PROBE_H
#define QXESM_TESTS_PROBE_H

#include <qxesm/host.h>

typedef struct Probe {
  int64_t mark;           /* which file it is */
  HostServices* services; /* as handed over before the entry was called */
  void* unused;
  void* owner;
  int64_t calls; /* of the entry, since the library was loaded */
} Probe;

#endif
