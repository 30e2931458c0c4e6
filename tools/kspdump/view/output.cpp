// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/view/output.h"

#include <fcntl.h>
#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <system_error>
#include <utility>

#include "tools/kspdump/view/text.h"
#include "tools/kspdump/wait.h"

namespace kspdump {

namespace {

/// The file that a signal which ends the program is to remove.
char doomed[PATH_MAX];

void removeAndEnd(int signal) {
  unlink(doomed);
  ::signal(signal, SIG_DFL);
  raise(signal);
}

/// Creates a file by `mkostemp`, which goes with the program where a signal ends it.
int createDoomed(std::string& file) {
  constexpr int kEnding[] = {SIGINT, SIGTERM, SIGHUP};
  sigset_t ending;
  sigset_t before;
  sigemptyset(&ending);
  for (const int number : kEnding) sigaddset(&ending, number);
  sigprocmask(SIG_BLOCK, &ending, &before);
  const int descriptor = mkostemp(file.data(), O_CLOEXEC);
  if (descriptor != -1) {
    file.copy(doomed, sizeof doomed);  // no path that opens is longer, with its end
    for (const int number : kEnding) {
      if (signal(number, removeAndEnd) == SIG_IGN) signal(number, SIG_IGN);
    }
  }
  sigprocmask(SIG_SETMASK, &before, nullptr);
  return descriptor;
}

/// Whether a path is a way to something that is open already, or to a device.
bool isDirect(const std::string& path) {
  struct stat existing = {};
  return path.starts_with("/dev/") || path.starts_with("/proc/") ||
         (stat(path.c_str(), &existing) == 0 && !S_ISREG(existing.st_mode));
}

/// The file behind links, so that the links stay.
std::string target(const std::string& path) {
  char resolved[PATH_MAX];
  return realpath(path.c_str(), resolved) != nullptr ? resolved : path;
}

}  // namespace

Output::Output(std::string path) : path_(path == "-" ? "" : std::move(path)), descriptor_(STDOUT_FILENO) {
  if (path_.empty()) return;
  if (isDirect(path_)) {
    descriptor_ = open(path_.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC);
  } else {
    target_ = target(path_);
    struct stat existing = {};
    const bool exists = stat(target_.c_str(), &existing) == 0;
    unfinished_ = target_.substr(0, target_.rfind('/') + 1) + ".kspdump-XXXXXX";
    descriptor_ = createDoomed(unfinished_);
    if (descriptor_ != -1) {
      // Nothing else is created, so the mask need not come back.
      fchmod(descriptor_, exists ? existing.st_mode & 07777 : 0666 & ~umask(0));
    }
  }
  if (descriptor_ == -1) {
    unfinished_.clear();
    fail("cannot be opened");
  }
}

Output::~Output() {
  if (!unfinished_.empty()) unlink(unfinished_.c_str());
  if (!path_.empty() && descriptor_ != -1) close(descriptor_);
}

void Output::write(std::string_view text) {
  while (!text.empty()) {
    const ssize_t written = ::write(descriptor_, text.data(), text.size());
    if (written != -1) {
      text.remove_prefix(static_cast<size_t>(written));
    } else if (errno == EPIPE) {
      _exit(128 + SIGPIPE);  // as a shell tells of the signal, which is ignored or blocked
    } else if (errno == EAGAIN) {
      waitFor(descriptor_, POLLOUT);
    } else if (errno != EINTR) {
      fail("cannot be written");
    }
  }
}

void Output::finish() {
  if (path_.empty()) return;
  if (close(std::exchange(descriptor_, -1)) != 0) fail("cannot be written");
  if (unfinished_.empty()) return;
  if (rename(unfinished_.c_str(), target_.c_str()) != 0) fail("cannot be written");
  unfinished_.clear();
}

void Output::fail(const char* what) const {
  const int error = errno;
  throw std::system_error(error, std::generic_category(),
                          (path_.empty() ? "standard output" : printable(path_)) + " " + what);
}

}  // namespace kspdump
