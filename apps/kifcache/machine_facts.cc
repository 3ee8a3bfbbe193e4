#include "machine_facts.h"

#include <stdio.h>
#include <sys/utsname.h>
#include <unistd.h>

#include "base/own_process.h"
#include "kif/kif.h"
#include "records/platform.h"

// The host may be a file or a tree of files from elsewhere. No node has the name of the machine,
// but one has the release of its kernel: where that is not this machine's, nothing else here is
// either.
void TellOfMachine(Facts *facts) {
  VersionRecord version = {};
  struct utsname names;
  const bool isKnown = KIF_Get(KIF_NODE_system_version, nullptr, &version, sizeof(version)) == 0;
  version.product[sizeof(version.product) - 1] = version.version[sizeof(version.version) - 1] = 0;
  facts->system = version.product;
  facts->release = version.version;
  if (uname(&names) == 0 && (HostType_OSIsZLK() || !isKnown || facts->release == names.release)) {
    facts->name = names.nodename;
    facts->system = names.sysname;
    facts->release = names.release;
    facts->architecture = names.machine;
  }
  facts->recorder = "kifcache " KIFCACHE_VERSION;
  facts->rights = geteuid() == 0 ? "root" : "user " + std::to_string(geteuid());
}

void TellOfBoot(const RecordingClock &clock, Facts *facts) {
  char bootID[37] = "";
  FILE *file = fopen("/proc/sys/kernel/random/boot_id", "re");
  if (file != nullptr && fgets(bootID, sizeof(bootID), file) != nullptr) facts->bootID = bootID;
  if (file != nullptr) fclose(file);
  if (!clock.isFixed()) facts->recorderCartel = OwnProcessInProc();
}
