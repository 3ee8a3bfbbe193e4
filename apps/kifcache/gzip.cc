#include "gzip.h"

#include <zlib.h>

#include <algorithm>

namespace {

constexpr int kGzipWindow = 15 + 16;       // the largest one, in a gzip file
constexpr size_t kStep = size_t{1} << 30;  // zlib counts in 32 bits

constexpr char kNoMemory[] = "Out of memory";
constexpr char kTooLarge[] = "Too large: it expands to more than a recording has";
constexpr char kCut[] = "Damaged: the compressed file ends early: copy it again";
constexpr char kEmpty[] = "Not a cache file: there is nothing in the compressed file";
constexpr char kDamaged[] = "Damaged: the compressed file cannot be expanded: copy it again";

// One pass over a gzip file, into memory, or to learn the size.
class Inflater {
 public:
  explicit Inflater(const FileBytes &compressed) : compressed_(compressed) {}
  ~Inflater() { inflateEnd(&stream_); }
  Inflater(const Inflater &) = delete;
  Inflater &operator=(const Inflater &) = delete;

  // Null, or what is wrong. At most `most` bytes go to `target` (null: they are only counted).
  const char *Run(uint8_t *target, size_t most);

  size_t size() const { return size_; }

 private:
  // As inflate, on the next step.
  int Step(uint8_t *target, size_t most);

  const FileBytes &compressed_;
  z_stream stream_ = {};
  size_t used_ = 0;  // of the compressed bytes
  size_t size_ = 0;  // of the expanded ones
  uint8_t scratch_[1 << 16] = {};
};

int Inflater::Step(uint8_t *target, size_t most) {
  const size_t input = std::min(compressed_.size - used_, kStep);
  const size_t room = target != nullptr ? std::min(most - size_, kStep) : sizeof(scratch_);
  stream_.next_in = const_cast<uint8_t *>(compressed_.map) + used_;
  stream_.avail_in = static_cast<uInt>(input);
  stream_.next_out = target != nullptr ? target + size_ : scratch_;
  stream_.avail_out = static_cast<uInt>(room);
  const int result = inflate(&stream_, Z_NO_FLUSH);
  used_ += input - stream_.avail_in;
  size_ += room - stream_.avail_out;
  return result;
}

const char *Inflater::Run(uint8_t *target, size_t most) {
  if (inflateInit2(&stream_, kGzipWindow) != Z_OK) return kNoMemory;
  for (;;) {
    const int result = Step(target, most);
    if (size_ > most) return kTooLarge;
    if (result == Z_STREAM_END) {
      if (used_ == compressed_.size) return nullptr;
      inflateReset(&stream_);  // the next member
    } else if (result == Z_MEM_ERROR) {
      return kNoMemory;
    } else if (result != Z_OK) {
      return result == Z_BUF_ERROR && used_ == compressed_.size ? kCut : kDamaged;
    }
  }
}

}  // namespace

const char *Gunzip(const FileBytes &compressed, FileBytes *expanded) {
  Inflater counter(compressed);
  const char *problem = counter.Run(nullptr, kMostFileBytes);
  if (problem != nullptr) return problem;
  if (counter.size() == 0) return kEmpty;
  if (!AllocateFileBytes(counter.size(), expanded)) return kNoMemory;
  Inflater inflater(compressed);
  problem = inflater.Run(const_cast<uint8_t *>(expanded->map), counter.size());
  if (problem == nullptr && inflater.size() != counter.size()) problem = kDamaged;
  if (problem != nullptr) ReleaseFileBytes(expanded);
  return problem;
}

bool Gzip(const void *bytes, size_t size, std::string *compressed) {
  z_stream stream = {};
  if (deflateInit2(&stream, Z_DEFAULT_COMPRESSION, Z_DEFLATED, kGzipWindow, 8,
                   Z_DEFAULT_STRATEGY) != Z_OK) {
    return false;
  }
  compressed->resize(deflateBound(&stream, size));
  stream.next_in = const_cast<Bytef *>(static_cast<const Bytef *>(bytes));
  stream.avail_in = static_cast<uInt>(size);
  stream.next_out = reinterpret_cast<Bytef *>(compressed->data());
  stream.avail_out = static_cast<uInt>(compressed->size());
  const int result = deflate(&stream, Z_FINISH);
  compressed->resize(stream.total_out);
  deflateEnd(&stream);
  return result == Z_STREAM_END;
}
