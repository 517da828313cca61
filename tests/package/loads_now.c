/* loads_now LIBRARY LIST: dlopens the library, every symbol resolved at once, and looks each name of LIST up in it. */
#include <dlfcn.h>
#include <stdio.h>
#include <string.h>

int main(int argc, char** argv) {
  char name[256];
  int missing = 0;
  int found = 0;
  if (argc != 3) return 2;
  void* library = dlopen(argv[1], RTLD_NOW | RTLD_LOCAL);
  if (!library) {
    fprintf(stderr, "%s\n", dlerror());
    return 1;
  }
  FILE* list = fopen(argv[2], "r");
  if (!list) return 2;
  while (fgets(name, sizeof name, list)) {
    name[strcspn(name, "\n")] = '\0';
    if (dlsym(library, name)) {
      ++found;
    } else {
      fprintf(stderr, "no %s in %s\n", name, argv[1]);
      ++missing;
    }
  }
  fclose(list);
  dlclose(library);
  printf("%d names found\n", found);
  return missing == 0 && found > 0 ? 0 : 1;
}
