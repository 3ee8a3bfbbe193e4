// zelvar: the kernel's product name, version and build number, and its release level.
#include <getopt.h>
#include <stdio.h>
#include <string.h>

#include "kif/kif.h"
#include "output.h"
#include "records/platform.h"
#include "tools.h"

namespace {

int Usage() {
  fputs(
      "zelvar      -v, --version         Get version information for zelkernel\n"
      "            -l, --level           Get release level information\n"
      "            -h, --help            Print this menu\n",
      Messages());
  return 1;
}

// False when the usage text is due.
bool ParseOptions(int argc, char **argv, bool *version, bool *level) {
  static const struct option longOptions[] = {
      {"version", no_argument, nullptr, 'v'},
      {"level", no_argument, nullptr, 'l'},
      {"help", no_argument, nullptr, 'h'},
      {nullptr, 0, nullptr, 0},
  };
  int option;
  while ((option = getopt_long(argc, argv, "vhl", longOptions, nullptr)) != -1) {
    switch (option) {
      case 'v':
        *version = true;
        break;
      case 'l':
        *level = true;
        break;
      default:
        return false;
    }
  }
  return true;
}

void PrintLevel(const char *product, const char *version, const char *level, const char *update) {
  const bool isUpdate = update[0] != '0';
  if (strcmp(level, "Release") == 0) level = "GA";
  printf("%s %s %s%s\n", Shown(product).text(), Shown(version).text(),
         isUpdate ? "Update " : Shown(level).text(), isUpdate ? Shown(update).text() : "");
}

}  // namespace

int ZelvarEntry(int argc, char **argv) {
  if (argc < 2) {
    fputs("zelvar: no option specified\n", Messages());
    return Usage();
  }
  bool wantsVersion = false;
  bool wantsLevel = false;
  if (!ParseOptions(argc, argv, &wantsVersion, &wantsLevel)) return Usage();
  if (!wantsVersion && !wantsLevel) {
    fputs("zelvar: Invalid arguments\n", Messages());
    return Usage();
  }
  VersionRecord record = {};
  if (ReadRecord(KIF_NODE_system_version, nullptr, &record) != 0) return 1;

  const char *product = FieldText(record.product);
  const char *version = FieldText(record.version);
  if (wantsVersion) {
    printf("%s %s build-%.5d\n", Shown(product).text(), Shown(version).text(), record.buildNumber);
  }
  if (wantsLevel) {
    PrintLevel(product, version, FieldText(record.releaseLevel), FieldText(record.update));
  }
  return 0;
}
