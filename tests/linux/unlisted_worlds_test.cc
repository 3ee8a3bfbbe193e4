// Worlds that no list has named: a reader of the library may ask for them when it has a list of
// others, as no tool does.
#include <dlfcn.h>
#include <stdlib.h>

#include "host_fixture.h"
#include "zellibs.h"

namespace {

void *const library = dlopen(LIB_DIR "/libzellibs.so", RTLD_NOW);
#define KIF(name) (*reinterpret_cast<decltype(&name)>(dlsym(library, #name)))

using UnlistedWorlds = HostTest;

TEST_F(UnlistedWorlds, AreFoundOrNot) {
  const std::string rest = " S 0 1 1 0 -1 0 0 0 0 0 1 2 0 0 20 0 2 0 9 0 0\n";
  WriteFile("tree/proc/1/task/1/stat", "1 (init)" + rest);
  WriteFile("tree/proc/1/task/7/stat", "7 (thread)" + rest);
  WriteFile("tree/proc/2/task/2/stat", "2 (other)" + rest);
  setenv("ZELLIBS_HOST", ("linux:" + Scratch() + "/tree").c_str(), 1);
  for (const KIF_NodeId node : {KIF(KIF_NODE_userworld_cartel), KIF(KIF_NODE_world)}) {
    KIF_ParamList *list = nullptr;
    ASSERT_EQ(KIF(KIF_GetInstanceListAlloc)(node, nullptr, &list), 0u);
    KIF(KIF_ParamListDestroy)(list);
    for (const auto &[id, name] : {std::pair(99, ""), {7, "thread"}, {0, ""}, {2, "other"}}) {
      KIF_ParamList *instance = KIF(KIF_ParamListCreate)(1, 1);
      KIF(KIF_ParamListAddInt)(instance, id);
      char text[128] = "";
      const KIF_Status status =
          KIF(KIF_Get)(KIF(KIF_NODE_world_name), instance, text, sizeof(text));
      EXPECT_EQ(status, *name != '\0' ? 0u : 0xbad0003u) << id;
      EXPECT_STREQ(text, name);
      KIF(KIF_ParamListDestroy)(instance);
    }
  }
}

}  // namespace
