/* The other file: see first_unit.c. */
#include <qxesm/qxesm.h>

SmStatus status_of_the_second_unit(void);
const void* handle_of_the_second_unit(void);

SmStatus status_of_the_second_unit(void) {
  SmInstance* none = 0;
  return qxsmDestroyInstance(&none);
}

const void* handle_of_the_second_unit(void) { return (const void*)&Exported_QXHandle; }
