// SPDX-License-Identifier: Apache-2.0
// Preloaded into the daemon by its end-to-end tests: a second of waiting, and of the clock that counts the
// machine's sleep, takes 10 ms, and what the kernel tells of power and pressure is read below
// $KSP_TEST_MACHINE.

#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <time.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>
#include <string>

namespace {

constexpr int64_t kFactor = 100;
constexpr int64_t kBillion = 1'000'000'000;

int64_t nanoseconds(const timespec& time) {
  return int64_t{time.tv_sec} * kBillion + time.tv_nsec;
}

timespec timeOf(int64_t nanoseconds) {
  return {.tv_sec = static_cast<time_t>(nanoseconds / kBillion),
          .tv_nsec = static_cast<long>(nanoseconds % kBillion)};
}

/// The function that this one stands before.
template <class Function>
Function* real(const char* name) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

std::string moved(const std::string& path) {
  const char* machine = getenv("KSP_TEST_MACHINE");
  const bool asked = path.starts_with("/sys/class/") || path.starts_with("/proc/pressure/");
  return machine != nullptr && asked ? machine + path : path;
}

}  // namespace

extern "C" {

[[gnu::visibility("default")]] unsigned sleep(unsigned seconds) {
  const timespec pause = timeOf(seconds * kBillion / kFactor);
  nanosleep(&pause, nullptr);
  return 0;
}

[[gnu::visibility("default")]] int clock_gettime(clockid_t clock, timespec* time) noexcept {
  const int result = real<int(clockid_t, timespec*)>("clock_gettime")(clock, time);
  if (clock == CLOCK_BOOTTIME) *time = timeOf(nanoseconds(*time) * kFactor);
  return result;
}

[[gnu::visibility("default")]] int clock_nanosleep(clockid_t clock, int flags, const timespec* asked,
                                                   timespec* left) {
  const timespec pause = clock == CLOCK_BOOTTIME ? timeOf(nanoseconds(*asked) / kFactor) : *asked;
  return real<int(clockid_t, int, const timespec*, timespec*)>("clock_nanosleep")(clock, flags, &pause, left);
}

[[gnu::visibility("default")]] DIR* opendir(const char* path) {
  return real<DIR*(const char*)>("opendir")(moved(path).c_str());
}

[[gnu::visibility("default")]] int openat(int folder, const char* path, int flags, ...) {
  return real<int(int, const char*, int, ...)>("openat")(folder, moved(path).c_str(), flags);
}
}
