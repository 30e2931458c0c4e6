#include "platform/host/conditions.h"

#include <fstream>
#include <string>

namespace host {

namespace {

std::string firstWord(const std::filesystem::path& file) {
  std::string word;
  std::ifstream(file) >> word;
  return word;
}

}  // namespace

bool runsOnBattery(const std::filesystem::path& supplies) {
  bool discharging = false;
  std::error_code unreadable;
  for (std::filesystem::directory_iterator it(supplies, unreadable), end; !unreadable && it != end;
       it.increment(unreadable)) {
    const std::filesystem::path& supply = it->path();
    if (firstWord(supply / "type") != "Battery") {
      if (firstWord(supply / "online") == "1") return false;
    } else if (firstWord(supply / "scope") != "Device" && firstWord(supply / "status") == "Discharging") {
      discharging = true;
    }
  }
  return discharging;
}

std::optional<double> ioPressurePercent(const std::filesystem::path& file) {
  std::ifstream stream(file);
  std::string kind;
  std::string average;
  constexpr std::string_view kPrefix = "avg10=";
  if (!(stream >> kind >> average) || kind != "some" || !average.starts_with(kPrefix)) return std::nullopt;
  try {
    return std::stod(average.substr(kPrefix.size()));
  } catch (const std::logic_error&) {
    return std::nullopt;
  }
}

}  // namespace host
