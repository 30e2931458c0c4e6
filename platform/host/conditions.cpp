// SPDX-License-Identifier: Apache-2.0
#include "platform/host/conditions.h"

#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <memory>
#include <string_view>

namespace host {

namespace {

/// The start of a small file, which is all that it holds.
class SmallFile {
 public:
  SmallFile(int folder, const char* name) {
    const int file = openat(folder, name, O_RDONLY | O_CLOEXEC);
    if (file < 0) return;
    const ssize_t got = read(file, bytes_.data(), bytes_.size());
    if (got > 0) size_ = static_cast<size_t>(got);
    close(file);
  }

  std::string_view text() const { return {bytes_.data(), size_}; }
  std::string_view line() const { return text().substr(0, text().find('\n')); }

 private:
  std::array<char, 256> bytes_;
  size_t size_ = 0;
};

enum class Supply { kNone, kLine, kDischarging };

Supply supplyAt(int folder, const char* name) {
  const auto property = [&](const char* key) {
    std::array<char, 512> path;
    std::snprintf(path.data(), path.size(), "%s/%s", name, key);
    return SmallFile(folder, path.data());
  };
  if (property("scope").line() == "Device") return Supply::kNone;
  const SmallFile type = property("type");
  if (type.line() == "Battery" || type.line() == "UPS") {
    return property("status").line() == "Discharging" ? Supply::kDischarging : Supply::kNone;
  }
  const SmallFile online = property("online");
  return online.line().empty() || online.line() == "0" ? Supply::kNone : Supply::kLine;
}

}  // namespace

std::optional<bool> runsOnBattery(const char* folder) {
  const std::unique_ptr<DIR, int (*)(DIR*)> supplies(opendir(folder), closedir);
  if (supplies == nullptr) return std::nullopt;
  bool discharging = false;
  while (const dirent* entry = readdir(supplies.get())) {
    const Supply supply = supplyAt(dirfd(supplies.get()), entry->d_name);
    if (supply == Supply::kLine) return false;
    discharging = discharging || supply == Supply::kDischarging;
  }
  return discharging;
}

std::optional<double> ioPressurePercent(const char* file) {
  constexpr std::string_view kPrefix = "some avg10=";
  const SmallFile pressure(AT_FDCWD, file);
  std::string_view figure = pressure.line();
  if (!figure.starts_with(kPrefix)) return std::nullopt;
  figure.remove_prefix(kPrefix.size());
  figure = figure.substr(0, figure.find(' '));
  double percent = 0;
  const auto [end, error] = std::from_chars(figure.data(), figure.data() + figure.size(), percent);
  if (error != std::errc() || end != figure.data() + figure.size() || !std::isfinite(percent))
    return std::nullopt;
  return percent;
}

}  // namespace host
