/* An extension for the tests of loading. ENTRY names its entry; the other macros say what is wrong with it. */
#include "extensions/probe.h"

#ifndef MARK
#define MARK 0
#endif
#ifndef MAJOR
#define MAJOR 5
#endif
#ifndef VERSION_ANSWER
#define VERSION_ANSWER 0
#endif

#define PUBLIC __attribute__((visibility("default")))

static Probe probe_state = {MARK, NULL, NULL, NULL, 0};

#ifndef NO_VERSION
PUBLIC int32_t qxextver(HostServices* handle, int32_t* major, int32_t* minor);
PUBLIC int32_t qxextver(HostServices* handle, int32_t* major, int32_t* minor) {
  *major = MAJOR;
  *minor = 1;
  probe_state.services = handle;
  return VERSION_ANSWER;
}
#endif

#ifndef NO_ENTRY
PUBLIC void* ENTRY(void* unused, void* owner);
PUBLIC void* ENTRY(void* unused, void* owner) {
  ++probe_state.calls;
  probe_state.unused = unused;
  probe_state.owner = owner;
#if defined(ANSWERS_NULL)
  return NULL;
#elif defined(NEEDS_ANOTHER)
  HostServices* host = probe_state.services;
  return host->load_extension(host, L"absent", 6, NULL);
#else
  return &probe_state;
#endif
}
#endif
