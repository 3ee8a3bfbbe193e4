#include "host.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "base/utf8.h"
#include "status.h"

namespace {

struct Choice {
  bool made;
  bool live;
  bool foreign;
  KIF_Status status;
  const Host *host;
};

Choice choice;

constexpr char kLinux[] = "linux";
constexpr size_t kLinuxLength = sizeof(kLinux) - 1;

const char *HostName() {
  return secure_getenv("ZELLIBS_HOST");
}

Choice ChooseByEnvironment() {
  const char *name = HostName();
  if (name == nullptr || name[0] == '\0' || strcmp(name, kLinux) == 0) {
    return {true, true, false, KIF_STATUS_OK, &kLinuxHost};
  }
  if (strncmp(name, kLinux, kLinuxLength) == 0 && name[kLinuxLength] == ':') {
    const char *root = name + kLinuxLength + 1;
    // A script's variable that is not set must not turn a stranger's tree into this machine.
    if (root[0] == '\0') return {true, true, true, KIF_STATUS_BAD_PARAMETER, nullptr};
    SetLinuxRoot(root);
    return {true, true, true, KIF_STATUS_OK, &kLinuxHost};
  }
  if (strcmp(name, "none") == 0) return {true, false, false, KIF_STATUS_NO_HOST, nullptr};
  const Host *recorded = nullptr;
  const KIF_Status status = OpenRecordedHost(name, &recorded);
  return {true, true, true, status, recorded};
}

const Choice &Chosen() {
  if (!choice.made) choice = ChooseByEnvironment();
  return choice;
}

}  // namespace

KIF_Status CurrentHost(const Host **host) {
  *host = Chosen().host;
  return Chosen().status;
}

bool HasLiveHost() {
  return Chosen().live;
}

bool IsForeignHost() {
  return Chosen().foreign;
}

bool TellOfUnusableHost() {
  if (!Chosen().live || Chosen().status == KIF_STATUS_OK) return false;
  const char *name = HostName();
  // A file may be called anything, such as a line of a log.
  char line[4096];
  const int length = snprintf(line, sizeof(line), "libzellibs.so: ZELLIBS_HOST: %s: %s",
                              name != nullptr ? name : "", ZLK_ReturnStatusToString(choice.status));
  const size_t size = static_cast<size_t>(length);
  MaskControls(line, size < sizeof(line) ? size : sizeof(line) - 1);
  fprintf(stderr, "%s\n", line);
  return true;
}

KIF_Status UseRecordedHost(const char *path) {
  const bool live = Chosen().live;  // before the file is opened: this may open another one
  const Host *recorded = nullptr;
  const KIF_Status status = OpenRecordedHost(path, &recorded);
  if (status == KIF_STATUS_OK) choice = {true, live, true, status, recorded};
  return status;
}
