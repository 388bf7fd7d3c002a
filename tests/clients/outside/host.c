// SPDX-License-Identifier: Apache-2.0
/* Loads a plug-in, runs it and unloads it, again and again. */
#include <dlfcn.h>
#include <stdio.h>
#include <string.h>

int main(int count, char** words) {
  int times = 0;
  for (int round = 0; count == 2 && round < 3; ++round) {
    void* const plugin = dlopen(words[1], RTLD_NOW | RTLD_LOCAL);
    void* const found = plugin != NULL ? dlsym(plugin, "plugin_run") : NULL;
    int (*run)(void) = NULL;
    if (found == NULL) {
      fprintf(stderr, "%s\n", dlerror());
      return 1;
    }
    memcpy(&run, &found, sizeof run);
    times += run() == 0;
    dlclose(plugin);
  }
  printf("posted %d times\n", times);
  return 0;
}
