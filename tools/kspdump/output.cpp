#include "tools/kspdump/output.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <system_error>

#include "tools/kspdump/text.h"

namespace kspdump {

Output::Output(std::string path) : path_(std::move(path)), descriptor_(STDOUT_FILENO) {
  if (path_.empty()) return;
  struct stat existing = {};
  if (stat(path_.c_str(), &existing) == 0 && !S_ISREG(existing.st_mode)) {
    descriptor_ = open(path_.c_str(), O_WRONLY | O_CLOEXEC);
  } else {
    unfinished_ = path_ + ".XXXXXX";
    descriptor_ = mkostemp(unfinished_.data(), O_CLOEXEC);
    if (descriptor_ >= 0) {
      const mode_t mask = umask(0);
      umask(mask);
      fchmod(descriptor_, existing.st_nlink != 0 ? existing.st_mode & 0777 : 0666 & ~mask);
    }
  }
  if (descriptor_ < 0) {
    unfinished_.clear();
    fail("cannot be opened");
  }
}

Output::~Output() {
  if (!unfinished_.empty()) unlink(unfinished_.c_str());
  if (descriptor_ > STDOUT_FILENO) close(descriptor_);
}

void Output::write(std::string_view text) {
  while (!text.empty()) {
    const ssize_t written = ::write(descriptor_, text.data(), text.size());
    if (written >= 0) {
      text.remove_prefix(static_cast<size_t>(written));
    } else if (errno == EPIPE) {
      signal(SIGPIPE, SIG_DFL);
      raise(SIGPIPE);
    } else if (errno != EINTR) {
      fail("cannot be written");
    }
  }
}

void Output::finish() {
  if (descriptor_ == STDOUT_FILENO) return;
  const int descriptor = descriptor_;
  descriptor_ = -1;
  if (close(descriptor) != 0) fail("cannot be written");
  if (unfinished_.empty()) return;
  if (rename(unfinished_.c_str(), path_.c_str()) != 0) fail("cannot be written");
  unfinished_.clear();
}

void Output::fail(const char* what) const {
  const int error = errno;
  throw std::system_error(error, std::generic_category(),
                          (path_.empty() ? "standard output" : printable(path_)) + " " + what);
}

}  // namespace kspdump
