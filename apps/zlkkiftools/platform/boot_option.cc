// bootOption: how the host was booted: mode flags, kernel, options, modules and option files.
#include <getopt.h>
#include <stdio.h>
#include <string.h>

#include "kif/kif.h"
#include "kiftools.h"
#include "output.h"
#include "records/morelfs.h"
#include "records/platform.h"
#include "tools.h"

namespace {

constexpr uint32_t kLargestChunk = 3 << 20;

struct Request {
  bool fsCheck = false;
  bool auditMode = false;
  bool rollback = false;
  bool pxe = false;
  bool kernel = false;
  bool options = false;
  bool modules = false;
  bool files = false;
  bool allContents = false;
  const char *contentName = nullptr;
  bool raw = false;
};

int Usage() {
  fputs(
      "bootOption\n"
      "  -r --raw                      Print w/o annotation\n"
      "  -a --all                      Print f,i,u,w,R boot options\n"
      "  -f --fsck                     FS Check Mode\n"
      "  -i --audit                    Audit Mode\n"
      "  -R --rollback                 Booted after a rollback\n"
      "  -p --pxeboot                  Booted via (g)PXE\n"
      "  -k --kernel                   Kernel used to boot\n"
      "  -m --modules                  List of modules used to boot\n"
      "  -o --options                  List of boot options used to boot\n"
      "  -b --bootOptionFiles          List of boot option files to boot\n"
      "  -c --bootOptionFileContent    Content of a boot option file used to boot\n"
      "  -C --bootOptionFilesContent   Content of all boot option files used to boot\n",
      Messages());
  return 1;
}

// Takes one option into `request`; false when the usage text is due.
bool TakeOption(int option, Request *request) {
  switch (option) {
    case 'r':
      request->raw = true;
      return true;
    case 'a':
      request->fsCheck = request->auditMode = request->rollback = true;
      return true;
    case 'f':
      request->fsCheck = true;
      return true;
    case 'i':
      request->auditMode = true;
      return true;
    case 'R':
      request->rollback = true;
      return true;
    case 'p':
      request->pxe = true;
      return true;
    case 'k':
      request->kernel = true;
      return true;
    case 'm':
      request->modules = true;
      return true;
    case 'o':
      request->options = true;
      return true;
    case 'b':
      request->files = true;
      return true;
    case 'c':
      request->contentName = optarg;
      return true;
    case 'C':
      request->allContents = true;
      return true;
    default:
      return false;
  }
}

bool ParseOptions(int argc, char **argv, Request *request) {
  static const struct option longOptions[] = {
      {"raw", no_argument, nullptr, 'r'},
      {"all", no_argument, nullptr, 'a'},
      {"fsck", no_argument, nullptr, 'f'},
      {"audit", no_argument, nullptr, 'i'},
      {"rollback", no_argument, nullptr, 'R'},
      {"pxeboot", no_argument, nullptr, 'p'},
      {"kernel", no_argument, nullptr, 'k'},
      {"modules", no_argument, nullptr, 'm'},
      {"options", no_argument, nullptr, 'o'},
      {"bootOptionFiles", no_argument, nullptr, 'b'},
      {"bootOptionContent", required_argument, nullptr, 'c'},
      {"bootOptionFilesContent", no_argument, nullptr, 'C'},
      {"help", no_argument, nullptr, 'h'},
      {nullptr, 0, nullptr, 0},
  };
  int option;
  while ((option = getopt_long(argc, argv, "afhiruwRpkmobc:C", longOptions, nullptr)) != -1) {
    if (!TakeOption(option, request)) return false;
  }
  return true;
}

void PrintLabel(const Request &request, const char *label) {
  if (!request.raw) fputs(label, stdout);
}

bool PrintFlags(const Request &request) {
  BootFlags flags = {};
  if (ReadRecord(KIF_NODE_system_bootOption, nullptr, &flags) != 0) return false;
  if (request.fsCheck) {
    PrintLabel(request, "FS Check : ");
    printf("%d\n", flags.fsCheck);
  }
  if (request.auditMode) {
    PrintLabel(request, "Audit Mode : ");
    printf("%d\n", flags.auditMode);
  }
  if (request.rollback) {
    PrintLabel(request, "Booted after rollback : ");
    printf("%d\n", flags.rollback);
  }
  return true;
}

bool PrintPxe(const Request &request) {
  BootMac mac = {};
  if (ReadRecord(KIF_NODE_system_bootMAC, nullptr, &mac) != 0) return false;
  PrintLabel(request, "Booted via (g)PXE : ");
  printf("%d\n", mac.address[0] != '\0' ? 1 : 0);
  return true;
}

// The name at `index` of a list of names, or null where there is none.
const char *NameAt(KIF_ParamList *names, int32_t index) {
  const char *name = nullptr;
  if (KIF_ParamListGetString(names, static_cast<uint32_t>(index), &name) != 0) return nullptr;
  return name;
}

KIF_Status FetchFiles(ParamListHandle *files) {
  KIF_ParamList *fetched = nullptr;
  const KIF_Status status =
      KIF_GetInstanceListAllocHint(KIF_NODE_system_bootOptionFiles, nullptr, 0, &fetched);
  if (status == 0) files->reset(fetched);
  return status;
}

// Prints the part of a content that begins at `request` up to its first zero byte, with its line
// breaks as blanks. Gives the length of the part, zero bytes and all; 0 when there was none.
uint32_t PrintChunk(KIF_ParamList *file, const ContentRequest &request) {
  DataHandle input(KIFData_Create(sizeof(request), &request, sizeof(request)));
  if (input == nullptr) return 0;
  const DataHandle output(KIFData_Create(request.wanted + 1, nullptr, 0));
  if (output == nullptr) return 0;
  const KIF_Status status =
      KIF_SetData(KIF_NODE_system_bootOptionFiles_content, file, input.get(), output.get());
  input.reset();
  if (status != 0) return 0;
  const uint32_t length = output->length;
  char *text = static_cast<char *>(KIFData_GetData(output.get()));
  if (text == nullptr || length > request.wanted) return 0;

  text[length] = '\0';
  for (uint32_t i = 0; i < length; ++i) {
    if (text[i] == '\n') text[i] = ' ';
  }
  fputs(Shown(text).text(), stdout);
  return length;
}

bool PrintContent(const Request &request, const char *name) {
  if (InvokedWithCache != 0) {
    fputs("Using KIF cache is unsupported\n", Messages());
    return false;
  }
  const ParamListHandle file = CreateInstance();
  if (file == nullptr || KIF_ParamListAddString(file.get(), name) != 0) return false;
  uint32_t total = 0;
  if (KIF_GetDataLength(KIF_NODE_system_bootOptionFiles_content, file.get(), &total) != 0) {
    printf("Invalid boot option file name %s\n", Printable(name).text());
    return false;
  }
  if (!request.raw) printf("Boot Option File Content %s : ", ShownName(name).text());
  const uint32_t chunk = total < kLargestChunk ? total : kLargestChunk;
  for (uint64_t offset = 0; offset < total;) {
    const uint32_t length = PrintChunk(file.get(), {static_cast<uint32_t>(offset), chunk});
    if (length == 0) {
      fprintf(Messages(), "bootOption: only %u of the %u bytes of %s could be read\n",
              static_cast<uint32_t>(offset), total, Printable(name).text());
      return false;
    }
    offset += length;
  }
  return true;
}

bool PrintAllContents(const Request &request) {
  ParamListHandle files;
  if (FetchFiles(&files) != 0) return false;
  const int32_t count = KIF_ParamListUsedCount(files.get());
  for (int32_t i = 0; i < count; ++i) {
    const char *name = NameAt(files.get(), i);
    if (name == nullptr || !PrintContent(request, name)) return false;
    putchar(request.raw ? ' ' : '\n');
  }
  return true;
}

// What the boot command line says, with the other things that stand between its kernel and its
// options in the output.
bool PrintCommandLine(const Request &request) {
  BootCommandLine line = {};
  char *options = nullptr;
  if (request.pxe || request.kernel || request.options) {
    if (ReadRecord(KIF_NODE_system_bootCmdLine, nullptr, &line) != 0) return false;
    if (request.pxe && !PrintPxe(request)) return false;
    options = strchr(FieldText(line.commandLine), ' ');
    if (options != nullptr) *options++ = '\0';
  }
  if (request.kernel) {
    PrintLabel(request, "Kernel : ");
    printf("%s\n", Shown(line.commandLine).text());
  }
  if (request.allContents && !PrintAllContents(request)) return false;
  if (request.options) {
    PrintLabel(request, "Options : ");
    printf("%s\n", Shown(options != nullptr ? options : "").text());
  }
  return true;
}

bool PrintModules(const Request &request) {
  PrintLabel(request, "Modules : ");
  ParamListHandle archives;
  if (GetInstanceList(KIF_NODE_system_morelfs_tardisks, nullptr, &archives) != 0) return false;
  const int32_t count = KIF_ParamListUsedCount(archives.get());
  for (int32_t i = 0; i < count; ++i) {
    const char *name = NameAt(archives.get(), i);
    if (name == nullptr) return false;
    TardiskStats stats = {};
    if (ReadRecordOf(KIF_NODE_system_morelfs_tardisks_stats, name, &stats) != 0) return false;
    if (static_cast<uint8_t>(stats.usedToBoot) != 0) printf("%s ", ShownName(name).text());
  }
  putchar('\n');
  return true;
}

bool PrintFiles(const Request &request) {
  ParamListHandle files;
  if (FetchFiles(&files) != 0) return false;
  PrintLabel(request, "Boot Option Files : ");
  const int32_t count = KIF_ParamListUsedCount(files.get());
  for (int32_t i = 0; i < count; ++i) {
    const char *name = NameAt(files.get(), i);
    if (name == nullptr) return false;
    printf("%s ", ShownName(name).text());
  }
  putchar('\n');
  return true;
}

bool PrintNamedContent(const Request &request) {
  if (!PrintContent(request, request.contentName)) return false;
  putchar('\n');
  return true;
}

}  // namespace

int BootOptionEntry(int argc, char **argv) {
  if (argc < 2) {
    fputs("bootOption: no option specified\n", Messages());
    return Usage();
  }
  Request request;
  if (!ParseOptions(argc, argv, &request)) return Usage();

  const bool flags = request.fsCheck || request.auditMode || request.rollback;
  if (flags && !PrintFlags(request)) return 1;
  if (!PrintCommandLine(request)) return 1;
  if (request.modules && !PrintModules(request)) return 1;
  if (request.files && !PrintFiles(request)) return 1;
  if (request.contentName != nullptr && !PrintNamedContent(request)) return 1;
  return 0;
}
