// SPDX-License-Identifier: Apache-2.0
// Bytes on their way from a file or through a decompressor.
#pragma once

#include <sys/stat.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <stdexcept>
#include <string>

#include "tools/kspdump/source/buffer.h"
#include "tools/kspdump/source/source.h"

namespace kspdump {

/// Bytes that are read at once.
inline constexpr size_t kBlockBytes = size_t{1} << 16;

/// Why something cannot be read.
class ReadFault : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

/// Bytes, one after another.
class Stream {
 public:
  Stream() = default;
  Stream(const Stream&) = delete;
  Stream& operator=(const Stream&) = delete;
  virtual ~Stream() = default;

  /// Reads up to `size` bytes, of which there is one at least; none only at the end. Throws ReadFault.
  virtual size_t read(unsigned char* out, size_t size) = 0;

  /// Goes to an offset from the first byte. Returns false where it cannot.
  virtual bool seek(uint64_t /*offset*/) { return false; }

  /// Bytes in it all; 0 where nobody knows. Where it is known, `seek` works.
  [[nodiscard]] virtual uint64_t size() const { return 0; }
};

/// An open file, or standard input.
class File : public Stream {
 public:
  /// Takes the descriptor; standard input stays open.
  explicit File(int descriptor);
  ~File() override;
  size_t read(unsigned char* out, size_t size) override;
  bool seek(uint64_t offset) override;
  [[nodiscard]] uint64_t size() const override { return size_; }
  [[nodiscard]] bool isFolder() const { return S_ISDIR(mode_); }
  [[nodiscard]] bool isRegular() const { return S_ISREG(mode_); }

 private:
  int descriptor_;
  mode_t mode_;
  uint64_t size_;
  uint64_t at_ = 0;
};

/// Opens a file to read, or standard input for "-"; one that was found in a folder is not waited for, and its
/// links are not followed. Throws ReadFault.
std::unique_ptr<File> openFile(const std::string& path, bool found);

/// Bytes that were read already, and then those of the stream behind them, where there is one.
class Rejoined : public Stream {
 public:
  Rejoined(Buffer head, std::unique_ptr<Stream> rest);
  size_t read(unsigned char* out, size_t size) override;
  bool seek(uint64_t offset) override;
  [[nodiscard]] uint64_t size() const override;

 private:
  Buffer head_;
  std::unique_ptr<Stream> rest_;
  uint64_t at_ = 0;
};

/// Guards against what is small and unpacks to no end: an archive, or a compressed file, may unpack to
/// `greatest` bytes and a thousand times its own.
class Expansion {
 public:
  explicit Expansion(uint64_t greatest) : greatest_(greatest) {}
  /// What lies in a stream of known `size` may be taken again and again, and still is no more.
  void took(uint64_t bytes, uint64_t size) {
    taken_ += bytes;
    if (size != 0) taken_ = std::min(taken_, size);
  }
  /// Throws ReadFault.
  void gave(uint64_t bytes);

 private:
  uint64_t greatest_;
  uint64_t taken_ = 0;
  uint64_t given_ = 0;
};

/// A capture that is larger than `greatest` bytes.
class TooLarge : public ReadFault {
 public:
  explicit TooLarge(uint64_t greatest);
};

/// Calls `read(out, size)`, which returns 0 at the end, until then; the bytes come behind those that are
/// there already. `told` of them are said to be there in all, 0 where nobody knows. Throws TooLarge as soon
/// as it shows, what `read` throws, and std::bad_alloc.
void readAll(const std::function<size_t(unsigned char* out, size_t size)>& read, uint64_t told,
             uint64_t greatest, Buffer& bytes);
void readAll(Stream& stream, uint64_t greatest, Buffer& bytes);

std::unique_ptr<Source> folderSource(const Input& input);

/// What the first bytes of a stream announce.
enum class Packing { kNone, kGzip, kXz, kZstd, kBzip2, kTar, kZip };
Packing packingOf(std::span<const unsigned char> head);

/// Unpacks a compressed stream.
std::unique_ptr<Stream> unpacked(std::unique_ptr<Stream> stream, Packing packing, uint64_t greatest);

/// The members of a tar or zip archive.
std::unique_ptr<Source> archiveSource(const Input& input, std::unique_ptr<Stream> stream, Packing packing,
                                      const Reading& reading);

}  // namespace kspdump
