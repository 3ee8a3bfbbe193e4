// Cache files that are none, damaged, of another version, or made to do harm.
#include <dlfcn.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "cache_file.h"
#include "host_fixture.h"
#include "kif/zellibs.h"
#include "status.h"

namespace {

// The library under test, as a program sees it that was built before it.
template <typename Function>
Function *Symbol(Function *, const char *name) {
  static void *library = dlopen(LIB_DIR "/libzellibs.so", RTLD_NOW | RTLD_LOCAL);
  return reinterpret_cast<Function *>(dlsym(library, name));
}
#define LIBRARY(name) Symbol(static_cast<decltype(&name)>(nullptr), #name)

const char kHost[] =
    "host name \"alpha\"\n"
    "list world = 1 2\n"
    "list userworld_cartel = 1\n"
    "list system_bootOptionFiles = \"f\" null\n"
    "list hardware_interrupts_cookieList_ZLKDevices 1 = \"nic\" \"disk\" null\n"
    "record world_name 1 = name=\"init\"\n"
    "record world_name 2 = name=\"idle\"\n"
    "record world_info 1 = worldID=1 cartelID=1 userspaceID=1\n"
    "record userworld_cartel_cmdline 1 = status 0xbad0062\n"
    "content system_bootOptionFiles_content \"f\" = \"root=/dev/sda\"\n";

class CacheFiles : public HostTest {
 protected:
  std::string Write(const std::string &bytes) { return WriteFile("bytes.kif", bytes); }

  KIF_Status StatusOf(const std::string &path) {
    CacheFile file;
    const KIF_Status status = OpenCacheFile(path.c_str(), &file);
    if (status == KIF_STATUS_OK) CloseCacheFile(&file);
    return status;
  }

  // Asks the library for everything that the host has, and for some that it has not.
  void ReadAll(const std::string &path);
};

void ReadRecords(uint32_t node, KIF_ParamList *selector) {
  static unsigned char record[1 << 18];
  LIBRARY(KIF_Get)(node, selector, record, sizeof(record));
  uint32_t length;
  if (LIBRARY(KIF_GetDataLength)(node, selector, &length) != 0) return;
  const uint32_t request[] = {1, 1000};
  KIFData *input = LIBRARY(KIFData_Create)(8, request, 8);
  KIFData *output = LIBRARY(KIFData_Create)(1001, nullptr, 0);
  LIBRARY(KIF_SetData)(node, selector, input, output);
  LIBRARY(KIFData_Destroy)(input);
  LIBRARY(KIFData_Destroy)(output);
}

void CacheFiles::ReadAll(const std::string &path) {
  if (LIBRARY(KIF_UseCache)(path.c_str(), 0) != 0) return;
  char date[21];
  const char *ours;
  LIBRARY(KIF_CheckSig)(date, sizeof(date), &ours);
  KIF_ParamList *selector = LIBRARY(KIF_ParamListCreate)(1, 1);
  LIBRARY(KIF_ParamListAddInt)(selector, 1);
  for (uint32_t node = 1; node <= kNodeCount; ++node) {
    for (KIF_ParamList *parent : {static_cast<KIF_ParamList *>(nullptr), selector}) {
      ReadRecords(node, parent);
      KIF_ParamList *list = nullptr;
      if (LIBRARY(KIF_GetInstanceListAlloc)(node, parent, &list) == 0) {
        LIBRARY(KIF_ParamListDestroy)(list);
      }
    }
  }
  LIBRARY(KIF_ParamListRemoveLastParam)(selector);
  LIBRARY(KIF_ParamListAddString)(selector, "f");
  for (uint32_t node = 1; node <= kNodeCount; ++node) ReadRecords(node, selector);
  LIBRARY(KIF_ParamListDestroy)(selector);
}

TEST_F(CacheFiles, ThatCannotBeUsedSayWhy) {
  const std::string good = Record(kHost);
  EXPECT_EQ(StatusOf(good), KIF_STATUS_OK);
  EXPECT_EQ(StatusOf(Scratch() + "/none"), KIF_STATUS_NO_CACHE_FILE);
  EXPECT_EQ(StatusOf(good + "/below"), KIF_STATUS_NO_CACHE_FILE);
  EXPECT_EQ(StatusOf(""), KIF_STATUS_NO_CACHE_FILE);
  EXPECT_EQ(StatusOf(Scratch()), KIF_STATUS_NOT_A_CACHE_FILE);
  EXPECT_EQ(StatusOf("/dev/zero"), KIF_STATUS_NOT_A_CACHE_FILE);
  EXPECT_EQ(StatusOf(Write("")), KIF_STATUS_NOT_A_CACHE_FILE);
  EXPECT_EQ(StatusOf(Write("root:x:0:0:root:/root:/bin/bash\n")), KIF_STATUS_NOT_A_CACHE_FILE);
  const std::string fifo = Scratch() + "/fifo";
  ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
  EXPECT_EQ(StatusOf(fifo), KIF_STATUS_NOT_A_CACHE_FILE);

  const std::string bytes = ReadFile(good);
  EXPECT_EQ(StatusOf(Write(bytes.substr(0, bytes.size() / 2))), KIF_STATUS_DAMAGED_CACHE_FILE);
  EXPECT_EQ(StatusOf(Write(bytes + '\0')), KIF_STATUS_DAMAGED_CACHE_FILE);
  if (geteuid() != 0) {
    ASSERT_EQ(chmod(good.c_str(), 0), 0);
    EXPECT_EQ(StatusOf(good), KIF_STATUS_NO_PERMISSION);
  }
}

// The file that was asked for is the host, also before anything else was asked of the library.
TEST_F(CacheFiles, TakeThePlaceOfTheLiveHost) {
  const char kText[] = "record system_ntpclock_upTime = seconds=";
  const std::string live = Record(kText + std::string("111\n"));
  const std::string file = Record(kText + std::string("222\n"));
  const pid_t child = fork();
  if (child == 0) {
    setenv("ZELLIBS_HOST", live.c_str(), 1);
    uint32_t uptime[2] = {};
    const bool used = LIBRARY(KIF_UseCache)(file.c_str(), 0) == 0 &&
                      LIBRARY(KIF_Get)(kNode_system_ntpclock_upTime + 1, nullptr, uptime, 8) == 0;
    _exit(used && uptime[0] == 222 ? 0 : 1);
  }
  int status = 1;
  waitpid(child, &status, 0);
  EXPECT_EQ(status, 0);
}

// A file of the given version, otherwise whole.
std::string WithVersion(uint16_t majorVersion, uint16_t minorVersion, const CacheFile &file) {
  flatbuffers::FlatBufferBuilder builder;
  const auto *content = file.header->content();
  builder.ForceVectorAlignment(content->size(), 1, 8);
  const auto contentAt = builder.CreateVector(content->data(), content->size());
  cache::FinishFileBuffer(builder, cache::CreateFile(builder, majorVersion, minorVersion,
                                                     file.header->checksum(), contentAt));
  return {reinterpret_cast<const char *>(builder.GetBufferPointer()), builder.GetSize()};
}

TEST_F(CacheFiles, OfANewerMinorVersionAreReadAndOfAnotherMajorOneAreNot) {
  CacheFile file;
  ASSERT_EQ(OpenCacheFile(Record(kHost).c_str(), &file), KIF_STATUS_OK);
  const std::string newer = WithVersion(kCacheMajorVersion, 7, file);
  const std::string other = WithVersion(kCacheMajorVersion + 1, 0, file);
  CloseCacheFile(&file);
  const Outcome check = Run({BIN_DIR "/kifcache", "check", Write(newer)});
  EXPECT_EQ(check.status, 0) << check.err;
  EXPECT_EQ(check.out.substr(0, 15), "format     1.7\n");
  EXPECT_EQ(StatusOf(Write(other)), KIF_STATUS_CACHE_VERSION);
  // Nothing behind the version matters then.
  EXPECT_EQ(StatusOf(Write(other.substr(0, other.size() - 1))), KIF_STATUS_CACHE_VERSION);
}

TEST_F(CacheFiles, AreRefusedAtEveryShorterLength) {
  const std::string bytes = ReadFile(Record(kHost));
  for (size_t length = 0; length < bytes.size(); ++length) {
    const KIF_Status expected =
        length < 8 ? KIF_STATUS_NOT_A_CACHE_FILE : KIF_STATUS_DAMAGED_CACHE_FILE;
    ASSERT_EQ(StatusOf(Write(bytes.substr(0, length))), expected) << length;
  }
}

TEST_F(CacheFiles, DoNoHarmWithAnyByteChanged) {
  const std::string bytes = ReadFile(Record(kHost));
  int opened = 0;
  for (size_t place = 0; place < bytes.size(); ++place) {
    for (const int change : {0x01, 0x80, 0xff}) {
      std::string changed = bytes;
      changed[place] = static_cast<char>(changed[place] ^ change);
      const std::string path = Write(changed);
      opened += StatusOf(path) == KIF_STATUS_OK;
      ReadAll(path);
    }
  }
  EXPECT_GT(opened, static_cast<int>(bytes.size()));  // most of it is data
}

TEST_F(CacheFiles, AreShownOrRefusedWithAnyByteChanged) {
  const std::string bytes = ReadFile(Record(kHost));
  const std::string content = bytes.substr(bytes.size() - 600);
  for (size_t place = 0; place < bytes.size(); place += 17) {
    std::string changed = bytes;
    changed[place] = static_cast<char>(changed[place] ^ 0xff);
    const std::string path = Write(changed);
    const Outcome dump = Run({BIN_DIR "/kifcache", "dump", path});
    ASSERT_TRUE(dump.status == 0 || dump.status == 1) << place << dump.err;
    const bool isContent = place >= bytes.size() - content.size();
    if (!isContent) continue;
    ASSERT_EQ(Run({BIN_DIR "/kifcache", "check", path}).status, 1) << place;
  }
}

TEST_F(CacheFiles, TellOfThemselves) {
  const std::string file = Record(
      "host name \"alpha\\x1b[31m\"\nhost system \"Linux\"\nhost release \"6.1\"\n"
      "host kernelBuildDate \"Nov  2 2026 01:02:03\"\nhost signature 0x12\nhost begin 86400\n"
      "host end 86401\nhost recorder \"kifcache 1\"\nhost rights \"root\"\n"
      "host omitted \"world: 3 answers\"\nlist world = 1 2\nrecord world_name 1 = status 5\n"
      "record world_name 2 =\nset hardware_chipset_rtc = status 5\n");
  const Outcome check = Run({BIN_DIR "/kifcache", "check", file});
  EXPECT_EQ(check.status, 0);
  EXPECT_EQ(check.out,
            "format     1.0\n"
            "host       alpha\\x1b[31m\n"
            "system     Linux 6.1\n"
            "kernel     Nov  2 2026 01:02:03\n"
            "recorded   1970-01-02 00:00:00 UTC to 1970-01-02 00:00:01 UTC\n"
            "recorder   kifcache 1\n"
            "rights     root\n"
            "interface  0x0000000000000012, not this kifcache's\n"
            "omitted    world: 3 answers\n"
            "\n"
            "    lists   records  contents   failing  node\n"
            "        0         0         0         1  hardware_chipset_rtc\n"
            "        1         0         0         0  world\n"
            "        0         2         0         1  world_name\n");
}

}  // namespace
