// Part of the preloaded libraries: the host of a test passes for the machine that it runs on, but
// where the variable FOREIGN says to let the platform library answer.
#include <dlfcn.h>
#include <stdlib.h>

extern "C" bool KIF_HostIsForeign() {
  void *answer = dlsym(RTLD_NEXT, "KIF_HostIsForeign");
  return getenv("FOREIGN") != nullptr && reinterpret_cast<bool (*)()>(answer)();
}
