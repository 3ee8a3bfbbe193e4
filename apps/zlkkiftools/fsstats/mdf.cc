// mdf: the space of the volumes that make up the in-memory root file system.
#include <inttypes.h>
#include <stdio.h>
#include <unistd.h>

#include "kif/kif.h"
#include "kiftools.h"
#include "output.h"
#include "records/morelfs.h"
#include "tools.h"

namespace {

struct View {
  bool humanReadable = false;  // else in KiB
  bool pool = false;
};

// A count of bytes as it stands in a column.
struct Figure {
  char text[24];
};

Figure MakeFigure(const View &view, uint64_t bytes) {
  Figure figure;
  if (view.humanReadable) {
    FormatSize(bytes, figure.text, sizeof(figure.text));
  } else {
    snprintf(figure.text, sizeof(figure.text), "%" PRIu64, bytes >> 10);
  }
  return figure;
}

int Usage() {
  fputs(
      "Gather stats about morelfs\n"
      "morelfsdf [filepath]\n"
      "   -h       multiple instead of blocks\n"
      "   -p       resource pool view\n",
      Messages());
  return 1;
}

bool ParseOptions(int argc, char **argv, View *view) {
  int option;
  while ((option = getopt(argc, argv, "hp")) != -1) {
    switch (option) {
      case 'h':
        view->humanReadable = true;
        break;
      case 'p':
        view->pool = true;
        break;
      default:
        return false;
    }
  }
  return argc - optind <= 1;
}

void PrintTardiskHeader(const View &view) {
  if (view.pool) {
    printf("%-20s%10s%10s%10s%10s%10s%10s\n", "Tardisk", "", "", "Used", "", "", "Space");
  } else {
    printf("%-20s%10s%10s\n", "Tardisk", view.humanReadable ? "Space" : "1k-blocks", "Used");
  }
}

void PrintTardisk(const View &view, const char *name, const TardiskStats &stats) {
  constexpr uint64_t kPageMask = 4095;
  const Figure used = MakeFigure(view, stats.used);
  const Figure space = MakeFigure(view, (stats.used + kPageMask) & ~kPageMask);
  if (view.pool) {
    printf("%-20s%10s%10s%10s%10s%10s%10s\n", name, "", "", used.text, "", "", space.text);
  } else {
    printf("%-20s%10s%10s\n", name, space.text, used.text);
  }
}

void PrintRamdiskHeader(const View &view) {
  if (view.pool) {
    printf("%-20s%10s%10s%10s%10s%10s%10s\n", "Ramdisk", "Min", "Max", "Used", "Sure avl",
           "Maybe avl", "Peak used");
  } else {
    printf("%-20s%10s%10s%10s%4s%% %s\n", "Ramdisk", view.humanReadable ? "Size" : "1k-blocks",
           "Used", "Available", "Use", "Mounted on");
  }
}

void PrintRamdisk(const View &view, const char *name, const RamdiskStats &stats) {
  const uint64_t min = uint64_t{stats.minimum} << 20;
  const uint64_t max = uint64_t{stats.maximum} << 20;
  const uint64_t used = uint64_t{stats.used} << 12;
  // A use above the maximum wraps at 32 bits.
  const uint64_t maybe = used <= max ? max - used : static_cast<uint32_t>(max - used);
  const Figure maxText = MakeFigure(view, max);
  const Figure usedText = MakeFigure(view, used);
  const Figure maybeText = MakeFigure(view, maybe);
  if (view.pool) {
    printf("%-20s%10s%10s%10s%10s%10s%10s\n", name, MakeFigure(view, min).text, maxText.text,
           usedText.text, MakeFigure(view, min >= used ? min - used : 0).text, maybeText.text,
           MakeFigure(view, uint64_t{stats.peakUsed} << 12).text);
  } else {
    const int percent = max == 0 ? 100 : static_cast<int>(100 * used / max);
    printf("%-20s%10s%10s%10s%4d%% %s\n", name, maxText.text, usedText.text, maybeText.text,
           percent, "--");
  }
}

// Prints a row for every volume in the list of the node `volumes`, with the record of `statsNode`.
// `prefix` is "tar" or "ram". False when the list could not be fetched.
template <typename Stats>
bool DiskTable(KIF_NodeId volumes, KIF_NodeId statsNode, const char *prefix, const View &view,
               void (*printRow)(const View &, const char *, const Stats &)) {
  ParamListHandle names;
  KIF_Status status = GetInstanceList(volumes, nullptr, &names);
  if (status != 0) {
    fprintf(Messages(), "Error fetching %sdisk list (%s)\n", prefix,
            ZLK_ReturnStatusToString(status));
    return false;
  }
  const int32_t count = KIF_ParamListUsedCount(names.get());
  for (int32_t i = 0; i < count; ++i) {
    KIF_Param *param = KIF_ParamListGetParam(names.get(), static_cast<uint32_t>(i));
    const char *name = param != nullptr ? KIF_ParamGetString(param) : nullptr;
    Stats stats = {};
    status = ReadRecordOf(statsNode, name, &stats);
    if (name == nullptr) name = "";
    if (status == 0) {
      printRow(view, ShownName(name).text(), stats);
    } else {
      fprintf(Messages(), "KIF_Get error for '%s' (%s)\n", ShownName(name, stderr).text(),
              ZLK_ReturnStatusToString(status));
    }
  }
  return true;
}

}  // namespace

int MdfEntry(int argc, char **argv) {
  View view;
  if (!ParseOptions(argc, argv, &view)) return Usage();
  if (optind < argc) fputs("Argument not supported yet. Ignoring.", stdout);

  PrintTardiskHeader(view);
  if (!DiskTable(KIF_NODE_system_morelfs_tardisks, KIF_NODE_system_morelfs_tardisks_stats, "tar",
                 view, PrintTardisk)) {
    return 1;
  }
  puts("-----");
  PrintRamdiskHeader(view);
  return DiskTable(KIF_NODE_system_morelfs_ramdisks, KIF_NODE_system_morelfs_ramdisks_stats, "ram",
                   view, PrintRamdisk)
             ? 0
             : 1;
}
