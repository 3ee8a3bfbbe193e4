// Cache files that are damaged.
#include <set>

#include <gmock/gmock.h>

#include "cache_file.h"
#include "host_fixture.h"
#include "status.h"
#include "zellibs.h"

namespace {

const char kHost[] =
    "host name \"alpha\"\nlist world = 1 2\nlist system_bootOptionFiles = \"f\" null\n"
    "record world_name 1 = name=\"init\"\nrecord userworld_cartel_cmdline 1 = status 0xbad0062\n"
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
};

TEST_F(CacheFiles, AreRefusedAtEveryShorterLength) {
  const std::string bytes = ReadFile(Record(kHost));
  EXPECT_EQ(StatusOf(Write(bytes)), KIF_STATUS_OK);
  for (size_t length = 0; length < bytes.size(); ++length) {
    const KIF_Status expected =
        length < 8 ? KIF_STATUS_NOT_A_CACHE_FILE : KIF_STATUS_DAMAGED_CACHE_FILE;
    ASSERT_EQ(StatusOf(Write(bytes.substr(0, length))), expected) << length;
  }
}

// The checksum that a content has behind it: what is changed is not for want of the right one.
uint32_t Checksum(const uint8_t *bytes, size_t size) {
  uint32_t sum = ~0u;
  for (size_t i = 0; i < size * 8; ++i) {
    const bool bit = ((sum ^ bytes[i / 8] >> i % 8) & 1) != 0;
    sum = sum >> 1 ^ (bit ? 0xedb88320u : 0);
  }
  return ~sum;
}

TEST_F(CacheFiles, AreShownWholeOrRefusedWithAnyByteChanged) {
  const std::string bytes = ReadFile(Record(kHost));
  CacheFile file;
  ASSERT_EQ(OpenCacheFile(Write(bytes).c_str(), &file), KIF_STATUS_OK);
  const auto *content = file.header->content();
  const size_t start = content->data() - file.map;
  const uint32_t written = Checksum(content->data(), content->size());
  const size_t sumAt = bytes.find({reinterpret_cast<const char *>(&written), sizeof(written)});
  EXPECT_EQ(written, file.header->checksum());
  CloseCacheFile(&file);
  std::set<std::string> messages;
  for (size_t place = start; place < bytes.size(); place += 7) {
    std::string changed = bytes;
    changed[place] = static_cast<char>(changed[place] ^ 0xff);
    EXPECT_EQ(Run({BIN_DIR "/kifcache", "check", Write(changed)}).status, 1) << place;
    const uint32_t sum =
        Checksum(reinterpret_cast<uint8_t *>(changed.data()) + start, changed.size() - start);
    memcpy(&changed[sumAt], &sum, sizeof(sum));
    const Outcome check = Run({BIN_DIR "/kifcache", "check", Write(changed)});
    EXPECT_EQ(Run({BIN_DIR "/kifcache", "dump", Write(changed)}).status, check.status) << place;
    if (check.status != 0) messages.insert(check.err.substr(check.err.rfind("bytes.kif")));
  }
  EXPECT_THAT(messages, testing::Contains("bytes.kif: damaged: what it has of world\n"));
}

}  // namespace
