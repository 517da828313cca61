/* One of two files of the same program that both include everything: the headers define nothing twice. */
#include <qxesm/qxesm.h>

SmStatus status_of_the_second_unit(void);
const void* handle_of_the_second_unit(void);

int main(void) {
  int32_t major = 0;
  int32_t minor = 0;
  int32_t release = 0;
  if (qxsmGetVersion(0, &major, &minor, &release) != 0 || major != 1) return 1;
  if (handle_of_the_second_unit() != (const void*)&Exported_QXHandle) return 2;
  return status_of_the_second_unit() == SM_OK ? 0 : 3;
}
