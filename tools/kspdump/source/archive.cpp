// SPDX-License-Identifier: Apache-2.0
#include <archive.h>
#include <archive_entry.h>
#include <zlib.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <vector>

#include "tools/kspdump/source/stream.h"

namespace kspdump {

namespace {

/// An archive's first header has the sum of its bytes, its own field counted as blanks.
bool isTarHeader(std::span<const unsigned char> header) {
  constexpr size_t kSumAt = 148;
  constexpr size_t kSumBytes = 8;
  constexpr size_t kHeaderBytes = 512;
  if (header.size() < kHeaderBytes) return false;
  uint32_t told = 0;
  size_t digits = 0;
  for (size_t i = kSumAt; i < kSumAt + kSumBytes; ++i) {
    const unsigned char c = header[i];
    if (c == ' ' && digits == 0) continue;
    if (c < '0' || c > '7') break;
    told = told * 8 + (c - '0');
    ++digits;
  }
  if (digits == 0) return false;
  uint32_t sum = kSumBytes * ' ';
  for (size_t i = 0; i < kHeaderBytes; ++i) {
    if (i < kSumAt || i >= kSumAt + kSumBytes) sum += header[i];
  }
  return told == sum;
}

}  // namespace

Packing packingOf(std::span<const unsigned char> head) {
  using std::string_view_literals::operator""sv;
  const std::string_view text(reinterpret_cast<const char*>(head.data()), head.size());
  if (text.starts_with("\x1F\x8B\x08"sv)) return Packing::kGzip;
  if (text.starts_with("\xFD"
                       "7zXZ\0"sv))
    return Packing::kXz;
  if (text.starts_with("\x28\xB5\x2F\xFD"sv)) return Packing::kZstd;
  // Behind a digit, a block or the end.
  if (text.starts_with("BZh"sv) &&
      (text.find("1AY&SY"sv) == 4 || text.find("\x17\x72\x45\x38\x50\x90"sv) == 4)) {
    return Packing::kBzip2;
  }
  if (text.starts_with("PK\3\4"sv) || text.starts_with("PK\5\6"sv)) return Packing::kZip;
  return isTarHeader(head) ? Packing::kTar : Packing::kNone;
}

namespace {

/// The library's reader over a stream, for one way of packing alone.
class Reader {
 public:
  Reader(std::unique_ptr<Stream> stream, Packing packing, uint64_t greatest)
      : stream_(std::move(stream)), expansion_(greatest), block_(kBlockBytes), archive_(archive_read_new()) {
    if (archive_ == nullptr) throw std::bad_alloc();
    check(enable(packing));
    check(archive_read_set_callback_data(archive(), this));
    check(archive_read_set_read_callback(archive(), refill));
    // The library passes over what is large by it, too.
    if (canSeek()) check(archive_read_set_seek_callback(archive(), seek));
    check(archive_read_open1(archive()));
  }

  struct archive* archive() const {
    return archive_.get();
  }
  bool canSeek() const { return stream_->size() != 0; }

  /// Reads what the current member has. Throws ReadFault.
  size_t read(unsigned char* out, size_t size) {
    const la_ssize_t got = archive_read_data(archive(), out, size);
    if (got < 0) {
      isLost_ = got == ARCHIVE_FATAL;
      throw ReadFault(error());
    }
    expansion_.gave(static_cast<uint64_t>(got));
    return static_cast<size_t>(got);
  }

  /// Reads the next bytes of the current member, where holes do not matter; none at its end. They are valid
  /// until the next call, and none that are sound are lost. Throws ReadFault.
  std::span<const unsigned char> readBlock() {
    const void* block = nullptr;
    size_t size = 0;
    la_int64_t offset = 0;
    while (size == 0) {
      const int result = archive_read_data_block(archive(), &block, &size, &offset);
      if (result == ARCHIVE_EOF) break;
      if (result != ARCHIVE_OK) throw ReadFault(error());
    }
    expansion_.gave(size);
    return {static_cast<const unsigned char*>(block), size};
  }

  /// Goes to the next member. Returns null at the end. Throws ReadFault.
  archive_entry* next() {
    for (int tries = 0;; ++tries) {
      archive_entry* entry = nullptr;
      const int result = archive_read_next_header(archive(), &entry);
      if (result == ARCHIVE_EOF) return nullptr;
      if (result == ARCHIVE_OK || result == ARCHIVE_WARN) return entry;
      if (result == ARCHIVE_RETRY && tries < kMostTries) continue;
      isLost_ = true;
      throw ReadFault(error());
    }
  }

  /// Whether nothing can be read any more.
  bool isLost() const { return isLost_; }

 private:
  static constexpr int kMostTries = 16;

  int enable(Packing packing) const {
    const auto both = [](int a, int b) { return std::min(a, b); };
    const auto compressed = [&](int filter) {
      // The empty format stands for a compressed file without bytes.
      return both(filter, both(archive_read_support_format_raw(archive()),
                               archive_read_support_format_empty(archive())));
    };
    switch (packing) {
      case Packing::kXz:
        return compressed(archive_read_support_filter_xz(archive()));
      case Packing::kZstd:
        return compressed(archive_read_support_filter_zstd(archive()));
      case Packing::kBzip2:
        return compressed(archive_read_support_filter_bzip2(archive()));
      case Packing::kTar:
        return archive_read_support_format_tar(archive());
      case Packing::kZip:
        return archive_read_support_format_zip(archive());
      default:
        return ARCHIVE_FATAL;
    }
  }

  std::string error() const {
    const char* const text = archive_error_string(archive());
    return text == nullptr ? "damaged" : text;
  }

  /// A warning counts: the library warns where it would run another program.
  void check(int result) const {
    if (result != ARCHIVE_OK) throw ReadFault(error());
  }

  static la_ssize_t refill(struct archive* archive, void* data, const void** block) {
    Reader& self = *static_cast<Reader*>(data);
    try {
      const size_t got = self.stream_->read(self.block_.data(), self.block_.size());
      self.at_ += got;
      self.expansion_.took(got, self.stream_->size());
      *block = self.block_.data();
      return static_cast<la_ssize_t>(got);
    } catch (const std::exception& fault) {
      archive_set_error(archive, EIO, "%s", fault.what());
      return ARCHIVE_FATAL;
    }
  }

  static la_int64_t seek(struct archive*, void* data, la_int64_t offset, int whence) {
    Reader& self = *static_cast<Reader*>(data);
    const uint64_t size = self.stream_->size();
    const uint64_t from = whence == SEEK_SET ? 0 : whence == SEEK_CUR ? self.at_ : size;
    const uint64_t to =
        from + static_cast<uint64_t>(offset);  // far behind the end where it is before the start
    if (to > size || !self.stream_->seek(to)) return ARCHIVE_FATAL;
    self.at_ = to;
    return static_cast<la_int64_t>(to);
  }

  struct Free {
    void operator()(struct archive* archive) const { archive_read_free(archive); }
  };

  std::unique_ptr<Stream> stream_;
  uint64_t at_ = 0;
  Expansion expansion_;
  std::vector<unsigned char> block_;
  bool isLost_ = false;
  std::unique_ptr<struct archive, Free> archive_;
};

class Unpacked : public Stream {
 public:
  Unpacked(std::unique_ptr<Stream> stream, Packing packing, uint64_t greatest)
      : reader_(std::move(stream), packing, greatest), isEmpty_(reader_.next() == nullptr) {}
  size_t read(unsigned char* out, size_t size) override {
    if (block_.empty() && !isEmpty_) block_ = reader_.readBlock();
    const size_t count = std::min(size, block_.size());
    std::copy_n(block_.begin(), count, out);
    block_ = block_.subspan(count);
    return count;
  }

 private:
  Reader reader_;
  std::span<const unsigned char> block_;
  const bool isEmpty_;
};

/// The archive library passes over the checksums of gzip, zlib does not.
class Gunzipped : public Stream {
 public:
  Gunzipped(std::unique_ptr<Stream> stream, uint64_t greatest)
      : stream_(std::move(stream)), expansion_(greatest), block_(kBlockBytes) {
    constexpr int kGzipAlone = 16 + MAX_WBITS;
    if (inflateInit2(&state_, kGzipAlone) != Z_OK) throw std::bad_alloc();
  }
  ~Gunzipped() override { inflateEnd(&state_); }

  size_t read(unsigned char* out, size_t size) override {
    state_.next_out = out;
    const auto room = static_cast<uInt>(std::min<size_t>(size, UINT_MAX));
    state_.avail_out = room;
    while (state_.avail_out == room && !isOver_) {
      if (state_.avail_in == 0 && !refill()) throw ReadFault("truncated gzip input");
      const int result = inflate(&state_, Z_NO_FLUSH);
      if (result == Z_STREAM_END) {
        // Another part may follow; whatever else does is padding.
        isOver_ = (state_.avail_in == 0 && !refill()) || *state_.next_in != kFirstByte;
        if (!isOver_) inflateReset(&state_);
      } else if (result != Z_OK && result != Z_BUF_ERROR) {
        throw ReadFault(state_.msg == nullptr ? "damaged gzip input"
                                              : std::string("damaged gzip input: ") + state_.msg);
      }
    }
    const size_t got = room - state_.avail_out;
    expansion_.gave(got);
    return got;
  }

 private:
  static constexpr unsigned char kFirstByte = 0x1F;

  bool refill() {
    state_.next_in = block_.data();
    state_.avail_in = static_cast<uInt>(stream_->read(block_.data(), block_.size()));
    expansion_.took(state_.avail_in, 0);
    return state_.avail_in != 0;
  }

  std::unique_ptr<Stream> stream_;
  Expansion expansion_;
  std::vector<unsigned char> block_;
  z_stream state_ = {};
  bool isOver_ = false;
};

class Archive : public Source {
 public:
  Archive(const Input& input, std::unique_ptr<Stream> stream, Packing packing, const Reading& reading)
      : name_(input.name),
        depth_(input.depth + 1),
        greatest_(reading.greatest),
        reader_(std::move(stream), packing, reading.greatest) {}

  bool next(Input& input) override {
    while (!isOver_) {
      input.reset();
      input.name = name_;
      input.isFound = true;
      input.depth = depth_;
      try {
        archive_entry* const entry = reader_.next();
        isOver_ = entry == nullptr;
        if (isOver_ || archive_entry_filetype(entry) == AE_IFDIR) continue;
        input.name += "/" + memberName(entry);
        if (archive_entry_filetype(entry) != AE_IFREG || archive_entry_hardlink(entry) != nullptr) {
          input.state = Input::State::kPassedOver;
        } else {
          readMember(entry, input);
        }
      } catch (const ReadFault& fault) {
        isOver_ |= reader_.isLost();
        input.fail(std::string(fault.what()) + (isOver_ ? "; what follows in the archive is not read" : ""));
      }
      return true;
    }
    return false;
  }

 private:
  /// The way to a member within the archive; nothing is ever opened by it.
  static std::string memberName(archive_entry* entry) {
    const char* const own = archive_entry_pathname(entry);
    const char* const text = own != nullptr ? own : archive_entry_pathname_utf8(entry);
    std::string_view name = text == nullptr ? "?" : text;
    while (name.starts_with("/") || name.starts_with("./")) name.remove_prefix(1);
    return std::string(name);
  }

  void readMember(archive_entry* entry, Input& input) {
    const la_int64_t told = archive_entry_size_is_set(entry) != 0 ? archive_entry_size(entry) : 0;
    try {
      readAll([this](unsigned char* out, size_t size) { return reader_.read(out, size); },
              static_cast<uint64_t>(std::max<la_int64_t>(told, 0)), greatest_, input.bytes);
    } catch (const TooLarge&) {
      // To pass over what is compressed is to unpack it.
      isOver_ = !reader_.canSeek();
      throw;
    }
    input.state = Input::State::kRead;
  }

  std::string name_;
  unsigned depth_;
  uint64_t greatest_;
  bool isOver_ = false;
  Reader reader_;
};

}  // namespace

std::unique_ptr<Stream> unpacked(std::unique_ptr<Stream> stream, Packing packing, uint64_t greatest) {
  if (packing == Packing::kGzip) return std::make_unique<Gunzipped>(std::move(stream), greatest);
  return std::make_unique<Unpacked>(std::move(stream), packing, greatest);
}

std::unique_ptr<Source> archiveSource(const Input& input, std::unique_ptr<Stream> stream, Packing packing,
                                      const Reading& reading) {
  return std::make_unique<Archive>(input, std::move(stream), packing, reading);
}

}  // namespace kspdump
