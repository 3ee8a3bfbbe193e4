// mdu: how much of the in-memory root file system a tree uses, by the volume that holds each file;
// or which files nothing leads to any more.
#include <dirent.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <memory>

#include "base/bytes.h"
#include "base/free_deleter.h"
#include "kif/kif.h"
#include "kiftools.h"
#include "output.h"
#include "records/morelfs.h"
#include "tools.h"

namespace {

constexpr uint32_t kNoDepthLimit = 0x100000;
constexpr dev_t kRootDevice = 1;  // the in-memory file system
constexpr size_t kPathSize = 4096;
constexpr size_t kLongestPath = kPathSize - 1;
constexpr int kNoMemory = -12;

enum VolumeKind : uint32_t { kTardisk = 0, kRamdisk = 1 };
constexpr const char *kKindNames[] = {"tardisk", "ramdisk"};

// The sums are kept, and wrap, in 32 bits.
struct DustatsBucket {
  uint32_t inodes;
  uint32_t bytes;
  uint32_t kind;  // VolumeKind
  char name[32];
};
using Buckets = std::unique_ptr<DustatsBucket[], FreeDeleter>;

struct Options {
  uint32_t depthLimit = 1;
  bool humanReadable = false;
  bool countEmpty = false;
  bool unlinked = false;
};

// A walk under way. The path of the file that is looked at is built in the one buffer, behind that
// of its directory, so that a level of the tree costs little stack.
struct Walk {
  const Options &options;
  size_t capacity;  // buckets in an array
  char path[kPathSize];
};

int Usage() {
  fputs(
      "Gather stats about morelfs\n"
      "morelfsdu [filepath]\n"
      "   -h       multiple instead of bytes\n"
      "   -d depth reports for each element up to that depth (default 1)\n"
      "   -a       equivalent to unlimited depth\n"
      "   -s       equivalent to zero depth\n"
      "   -u       display stats for unlinked files\n",
      Messages());
  return 1;
}

bool ParseOptions(int argc, char **argv, Options *options) {
  int option;
  while ((option = getopt(argc, argv, "ad:hsiu")) != -1) {
    switch (option) {
      case 'a':
        options->depthLimit = kNoDepthLimit;
        break;
      case 'd':
        options->depthLimit = static_cast<uint32_t>(strtol(optarg, nullptr, 10));
        break;
      case 'h':
        options->humanReadable = true;
        break;
      case 's':
        options->depthLimit = 0;
        break;
      case 'i':
        options->countEmpty = true;
        break;
      case 'u':
        options->unlinked = true;
        break;
      default:
        return false;
    }
  }
  return argc - optind <= 1;
}

void PrintSize(const Options &options, uint32_t bytes) {
  if (options.humanReadable) {
    char text[16];
    FormatSize(bytes, text, sizeof(text));
    printf("%5s", text);
  } else {
    printf("%12d", static_cast<int32_t>(bytes));
  }
}

// A list that selects the inode `number`; null, with the reason in `*status`, when there is none.
ParamListHandle SelectInode(uint64_t number, KIF_Status *status) {
  ParamListHandle inode = CreateInstance();
  *status = inode != nullptr ? KIF_ParamListAddInt(inode.get(), static_cast<int64_t>(number))
                             : KIF_STATUS_NO_MEMORY;
  if (*status != 0) inode.reset();
  return inode;
}

void DustatsPrint(const Options &options, const char *path, const DustatsBucket *buckets,
                  size_t count, bool isDirectory) {
  printf("For '%s':\n", Shown(path).text());
  for (size_t i = 0; i < count; ++i) {
    char volume[48];
    snprintf(volume, sizeof(volume), "%s %s", kKindNames[buckets[i].kind], buckets[i].name);
    printf("%38s: ", Shown(volume).text());
    PrintSize(options, buckets[i].bytes);
    if (isDirectory) printf("\t\t(%5d inodes)", static_cast<int32_t>(buckets[i].inodes));
    putchar('\n');
  }
}

void FillBucket(const InodeStats &stats, DustatsBucket *bucket) {
  const bool onTardisk = (stats.flags & kInodeOnTardisk) != 0;
  const char *name = onTardisk ? stats.tardisk : stats.ramdisk;
  bucket->kind = onTardisk ? kTardisk : kRamdisk;
  memcpy(bucket->name, name, strnlen(name, sizeof(bucket->name) - 1));
  bucket->bytes = (stats.flags & kInodeUncharged) != 0 ? 0 : stats.size;
  bucket->inodes = 1;
}

enum class Measured { kNothing, kEmptyFile, kFile, kDirectory };

// Puts the file at `path` alone into `*bucket`. Its records are off the stack before the walk goes
// down.
__attribute__((noinline)) Measured Measure(const Walk &walk, const char *path,
                                           DustatsBucket *bucket) {
  struct stat file;
  if (lstat(path, &file) != 0 || file.st_dev != kRootDevice) return Measured::kNothing;
  InodeStats stats = {};
  KIF_Status status;
  const ParamListHandle inode = SelectInode(file.st_ino, &status);
  if (status == 0) status = ReadRecord(KIF_NODE_system_morelfs_inodes_stats, inode.get(), &stats);
  if (status != 0) {
    fprintf(Messages(), "KIF_Get error for '%s' (%s)\n", Printable(path).text(),
            ZLK_ReturnStatusToString(status));
    return Measured::kNothing;
  }
  if (walk.capacity == 0) {
    fprintf(Messages(), "No bucket space for '%s'\n", Printable(path).text());
    return Measured::kNothing;
  }
  FillBucket(stats, bucket);
  if (S_ISDIR(file.st_mode)) return Measured::kDirectory;
  return stats.size != 0 ? Measured::kFile : Measured::kEmptyFile;
}

// False when the directory cannot be opened. It is closed again before the walk goes down: a tree
// may have more levels than a process has descriptors.
bool ReadDirectory(const char *path, Bytes *names) {
  DIR *directory = opendir(path);
  if (directory == nullptr) return false;
  while (const struct dirent *entry = readdir(directory)) {
    if (names->Append(entry->d_name, strlen(entry->d_name) + 1)) continue;
    fputs("unable to allocate memory for stats", Messages());
    break;
  }
  closedir(directory);
  return true;
}

// A directory whose entries are walked. Its path is the first bytes of the walk's.
struct Level {
  size_t pathLength;  // bytes, as it was reached
  size_t prefix;      // bytes, with the '/' before an entry
  uint32_t depth;
  DustatsBucket *buckets;
  size_t filled;
};

// Adds one bucket of an entry to those of its directory.
void MergeBucket(const DustatsBucket &bucket, size_t capacity, Level *level) {
  for (size_t i = 0; i < level->filled; ++i) {
    DustatsBucket &sum = level->buckets[i];
    if (sum.kind != bucket.kind || strcmp(sum.name, bucket.name) != 0) continue;
    sum.bytes += bucket.bytes;
    sum.inodes += bucket.inodes;
    return;
  }
  if (level->filled == capacity) {
    fputs("Not enough dustats buckets\n", Messages());
    return;
  }
  level->buckets[level->filled++] = bucket;
}

size_t DustatsWalk(Walk *walk, const char *path, uint32_t depth, DustatsBucket *buckets);

void PrintTooLong(Walk *walk, const Level &level, const char *name, size_t length) {
  walk->path[level.pathLength] = '\0';
  fprintf(Messages(), "path too long for '%s' '%s' (%zu)\n", Printable(walk->path).text(),
          Printable(name).text(), length);
  walk->path[level.prefix - 1] = '/';
}

// Walks the entry `name` of a directory.
void WalkEntry(Walk *walk, const char *name, Level *level) {
  const size_t nameLength = strlen(name);
  if (level->prefix + nameLength + 1 > kLongestPath) {
    PrintTooLong(walk, *level, name, level->prefix + nameLength);
    return;
  }
  if (strcmp(name, ".") == 0 || strcmp(name, "..") == 0) return;
  const Buckets entry(static_cast<DustatsBucket *>(calloc(walk->capacity, sizeof(DustatsBucket))));
  if (entry == nullptr) {
    fputs("unable to allocate memory for stats", Messages());
    return;
  }
  memcpy(walk->path + level->prefix, name, nameLength + 1);
  const size_t count = DustatsWalk(walk, walk->path, level->depth + 1, entry.get());
  for (size_t i = 0; i < count; ++i) MergeBucket(entry[i], walk->capacity, level);
}

// Walks the directory at `path`, whose own bucket is filled; gives the number of filled ones.
size_t WalkDirectory(Walk *walk, const char *path, uint32_t depth, DustatsBucket *buckets) {
  Bytes names;  // each one ended
  if (!ReadDirectory(path, &names)) return 0;
  const size_t length = strlen(path);
  const bool hasSlash = length > 0 && path[length - 1] == '/';
  Level level = {length, hasSlash ? length : length + 1, depth, buckets, 1};
  if (level.prefix > kLongestPath) {
    fprintf(Messages(), "path too long for '%s' (%zu)\n", Printable(path).text(),
            length > kLongestPath ? length : level.prefix);
    return 0;
  }
  if (path != walk->path) memcpy(walk->path, path, length);
  walk->path[level.prefix - 1] = '/';
  const char *name = names.text();
  for (const char *end = name + names.size(); name < end; name += strlen(name) + 1) {
    WalkEntry(walk, name, &level);
  }
  walk->path[length] = '\0';
  if (depth <= walk->options.depthLimit) {
    DustatsPrint(walk->options, walk->path, buckets, level.filled, true);
  }
  return level.filled;
}

// Adds the tree at `path` into the empty array `buckets`; gives the number of filled ones.
size_t DustatsWalk(Walk *walk, const char *path, uint32_t depth, DustatsBucket *buckets) {
  const Measured measured = Measure(*walk, path, buckets);
  if (measured == Measured::kNothing) return 0;
  if (measured == Measured::kDirectory) return WalkDirectory(walk, path, depth, buckets);
  if (measured == Measured::kEmptyFile && !walk->options.countEmpty) return 0;
  if (depth <= walk->options.depthLimit) DustatsPrint(walk->options, path, buckets, 1, false);
  return 1;
}

size_t CountVolumes(KIF_NodeId node) {
  ParamListHandle volumes;
  if (GetInstanceList(node, nullptr, &volumes) != 0) return 0;
  const int32_t count = KIF_ParamListUsedCount(volumes.get());
  return count > 0 ? static_cast<size_t>(count) : 0;
}

int ReportTree(const Options &options, const char *path) {
  const size_t tardisks = CountVolumes(KIF_NODE_system_morelfs_tardisks);
  const size_t capacity = tardisks + CountVolumes(KIF_NODE_system_morelfs_ramdisks);
  const Buckets buckets(
      static_cast<DustatsBucket *>(calloc(capacity > 0 ? capacity : 1, sizeof(DustatsBucket))));
  if (buckets == nullptr) return kNoMemory;
  Walk walk = {options, capacity, ""};
  DustatsWalk(&walk, path, 0, buckets.get());
  return 0;
}

struct UnlinkedTotal {
  size_t files = 0;
  uint64_t bytes = 0;
  bool refused = false;  // something may not be seen
};

void CountUnlinked(const Options &options, InodeStats *stats, UnlinkedTotal *total) {
  if (stats->linkState != kInodeUnlinked) return;
  if (total->files == 0) puts("Unlinked files:");
  ++total->files;
  total->bytes += stats->size;
  printf("%38s: ", Shown(FieldText(stats->name)).text());
  PrintSize(options, stats->size);
  putchar('\n');
}

// Gives the status of the last operation. An inode that went away meanwhile is passed over; any
// other failure ends the listing.
KIF_Status ListUnlinked(const Options &options, KIF_ParamList *inodes, UnlinkedTotal *total) {
  KIF_Status status = 0;
  const int32_t count = KIF_ParamListUsedCount(inodes);
  for (int32_t i = 0; i < count; ++i) {
    uint64_t number = 0;
    status = KIF_ParamListGetUInt64(inodes, static_cast<uint32_t>(i), &number);
    if (status != 0) return status;
    const ParamListHandle inode = SelectInode(number, &status);
    if (status != 0) return status;
    InodeStats stats = {};
    status = ReadRecord(KIF_NODE_system_morelfs_inodes_stats, inode.get(), &stats);
    if (status == 0) CountUnlinked(options, &stats, total);
    if (status == KIF_STATUS_NO_PERMISSION) total->refused = true;
  }
  return status;
}

KIF_Status UnlinkedFilesReport(const Options &options) {
  ParamListHandle inodes;
  KIF_Status status = GetInstanceList(KIF_NODE_system_morelfs_inodes, nullptr, &inodes);
  if (status != 0) return status;
  UnlinkedTotal total;
  status = ListUnlinked(options, inodes.get(), &total);
  if (total.refused) {
    fputs("mdu: not every process may be looked into: there may be more unlinked files\n",
          Messages());
  }
  if (total.files == 0) {
    if (!total.refused) puts("No unlinked files.");
    return status;
  }
  printf("Total unlinked files: %zu\n", total.files);
  char bytes[24];
  if (options.humanReadable) {
    FormatSize(total.bytes, bytes, sizeof(bytes));
  } else {
    snprintf(bytes, sizeof(bytes), "%llu", static_cast<unsigned long long>(total.bytes));
  }
  printf("Size of unlinked files:  %s\n", bytes);
  return status;
}

int RefuseCache() {
  fputs("Using KIF cache is unsupported\n", Messages());
  return 1;
}

}  // namespace

int MduEntry(int argc, char **argv) {
  if (InvokedWithCache != 0) return RefuseCache();
  Options options;
  if (!ParseOptions(argc, argv, &options)) return Usage();
  if (options.unlinked) return UnlinkedFilesReport(options) != 0 ? 1 : 0;
  if (HostIsElsewhere()) return RefuseCache();  // these files are not those of its inodes
  return ReportTree(options, optind < argc ? argv[optind] : ".");
}
