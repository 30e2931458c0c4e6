// SPDX-License-Identifier: Apache-2.0
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <system_error>

#include "tools/kspdump/source/stream.h"
#include "tools/kspdump/wait.h"

namespace kspdump {

namespace {

mode_t modeOf(int descriptor) {
  struct stat status = {};
  fstat(descriptor, &status);
  return status.st_mode;
}

/// Bytes in a file or on a disk; 0 where nobody knows.
uint64_t sizeOf(int descriptor) {
  // What others have read of standard input is gone; its offsets are not ours.
  if (lseek(descriptor, 0, SEEK_CUR) != 0) return 0;
  const off_t end = lseek(descriptor, 0, SEEK_END);
  lseek(descriptor, 0, SEEK_SET);
  return static_cast<uint64_t>(std::max<off_t>(end, 0));
}

}  // namespace

File::File(int descriptor) : descriptor_(descriptor), mode_(modeOf(descriptor)), size_(sizeOf(descriptor)) {}

File::~File() {
  if (descriptor_ != STDIN_FILENO) close(descriptor_);
}

size_t File::read(unsigned char* out, size_t size) {
  // A file that grows meanwhile is read as it was, and its end needs no further call.
  if (size_ != 0 && at_ == size_) return 0;
  for (;;) {
    const ssize_t got = ::read(descriptor_, out, size);
    if (got != -1) {
      at_ += static_cast<size_t>(got);
      return static_cast<size_t>(got);
    }
    if (errno == EAGAIN) {
      waitFor(descriptor_, POLLIN);
    } else if (errno != EINTR) {
      throw ReadFault(std::generic_category().message(errno));
    }
  }
}

bool File::seek(uint64_t offset) {
  if (size_ == 0) return false;
  lseek(descriptor_, static_cast<off_t>(offset), SEEK_SET);
  at_ = offset;
  return true;
}

std::unique_ptr<File> openFile(const std::string& path, bool found) {
  if (path == "-") return std::make_unique<File>(STDIN_FILENO);
  // What was a file when its folder was read may be a pipe by now, or a link.
  const int descriptor = open(path.c_str(), O_RDONLY | O_CLOEXEC | (found ? O_NOFOLLOW | O_NONBLOCK : 0));
  if (descriptor == -1) throw ReadFault(std::generic_category().message(errno));
  return std::make_unique<File>(descriptor);
}

Rejoined::Rejoined(Buffer head, std::unique_ptr<Stream> rest)
    : head_(std::move(head)), rest_(std::move(rest)) {}

size_t Rejoined::read(unsigned char* out, size_t size) {
  if (at_ < head_.size()) {
    const size_t count = std::min(size, static_cast<size_t>(head_.size() - at_));
    std::memcpy(out, head_.data() + at_, count);
    at_ += count;
    return count;
  }
  return rest_ == nullptr ? 0 : rest_->read(out, size);
}

bool Rejoined::seek(uint64_t offset) {
  if (rest_ == nullptr) {
    at_ = std::min<uint64_t>(offset, head_.size());
    return true;
  }
  if (!rest_->seek(offset)) return false;
  at_ = head_.size();
  return true;
}

uint64_t Rejoined::size() const {
  return rest_ == nullptr ? head_.size() : rest_->size();
}

void Expansion::gave(uint64_t bytes) {
  constexpr uint64_t kUtmostRatio = 1000;
  given_ += bytes;
  if (given_ > greatest_ && given_ - greatest_ > kUtmostRatio * taken_) {
    throw ReadFault("unpacks to a thousand times its size and more");
  }
}

namespace {

std::string largerThan(uint64_t greatest) {
  constexpr const char* kUnits[] = {"bytes", "KiB", "MiB", "GiB"};
  size_t unit = 0;
  for (; unit + 1 < std::size(kUnits) && greatest != 0 && greatest % 1024 == 0; ++unit) greatest /= 1024;
  return "larger than " + std::to_string(greatest) + " " + kUnits[unit] + " (--max-size)";
}

}  // namespace

TooLarge::TooLarge(uint64_t greatest) : ReadFault(largerThan(greatest)) {}

void readAll(const std::function<size_t(unsigned char* out, size_t size)>& read, uint64_t told,
             uint64_t greatest, Buffer& bytes) {
  // What a header says of a size is no reason to take as much memory.
  for (;;) {
    if (std::max<uint64_t>(told, bytes.size()) > greatest) throw TooLarge(greatest);
    const size_t got = read(bytes.room(kBlockBytes), kBlockBytes);
    if (got == 0) return;
    bytes.added(got);
  }
}

void readAll(Stream& stream, uint64_t greatest, Buffer& bytes) {
  readAll([&](unsigned char* out, size_t size) { return stream.read(out, size); }, stream.size(), greatest,
          bytes);
}

}  // namespace kspdump
