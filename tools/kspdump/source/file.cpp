#include "tools/kspdump/source/source.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <limits>

namespace kspdump {

namespace {

/// The parsers take lengths of 32 bits.
constexpr size_t kGreatestCapture = std::numeric_limits<uint32_t>::max();
constexpr size_t kLeastRead = size_t{1} << 16;

class Descriptor {
 public:
  explicit Descriptor(const std::string& path)
      : number_(path == "-" ? STDIN_FILENO : open(path.c_str(), O_RDONLY | O_CLOEXEC)) {}
  Descriptor(const Descriptor&) = delete;
  Descriptor& operator=(const Descriptor&) = delete;
  ~Descriptor() {
    if (number_ > STDIN_FILENO) close(number_);
  }

  int number() const { return number_; }

 private:
  int number_;
};

}  // namespace

std::string readFile(const std::string& path, std::vector<unsigned char>& bytes) {
  bytes.clear();
  const Descriptor file(path);
  struct stat status = {};
  if (file.number() < 0 || fstat(file.number(), &status) != 0) return std::strerror(errno);
  if (S_ISREG(status.st_mode) && static_cast<uint64_t>(status.st_size) > kGreatestCapture) {
    return "larger than 4 GiB";
  }
  // One byte more than the file is said to hold, so that its end is seen without growing.
  const size_t expected = S_ISREG(status.st_mode) ? static_cast<size_t>(status.st_size) + 1 : kLeastRead;
  size_t size = 0;
  for (;;) {
    if (size > kGreatestCapture) return "larger than 4 GiB";
    if (size == bytes.size()) {
      bytes.resize(std::min(std::max({expected, kLeastRead, size * 2}), kGreatestCapture + 1));
    }
    const ssize_t got = read(file.number(), bytes.data() + size, bytes.size() - size);
    if (got < 0 && errno == EINTR) continue;
    if (got < 0) return std::strerror(errno);
    if (got == 0) break;
    size += static_cast<size_t>(got);
  }
  bytes.resize(size);
  return "";
}

}  // namespace kspdump
