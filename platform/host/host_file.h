// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace host {

/// When the activity runs.
struct ActivitySettings {
  /// Empty without a host file: any activity then runs by these defaults.
  std::string identifier;
  unsigned identifierLine = 0;
  uint32_t startAfterSeconds = 0;
  /// Between a deferred run and the next one; at least 1.
  uint32_t retrySeconds = 60;
  /// Between a finished run and the next one; 0 means that there is none and the process is ended.
  uint32_t intervalSeconds = 0;
};

/// When the activity must yield; what is not set never asks it to.
struct YieldSettings {
  bool onBattery = false;
  std::optional<uint32_t> ioPressurePercent;
  std::optional<uint32_t> afterSeconds;
  /// Number of the run's question, from 1, from which on the answer is yes.
  std::optional<uint32_t> atCheck;
};

/// What a step of an emulated controller answers.
struct Step {
  uint32_t reply = 0;
  int32_t result = 0;
};

struct ControllerSettings {
  std::string className;
  uint32_t tunnelMethod = 0;
  /// In turn, from the start again behind the last; without any the controller never has work.
  std::vector<Step> steps;
  int32_t openResult = 0;
  int32_t closeResult = 0;
  /// The driver is gone once it was looked up this often.
  std::optional<uint32_t> goneAfterLookups;
};

/// What a host file says. As it is here, it is what holds on a host without one: no controller.
struct HostFile {
  /// Name of the file, for messages; empty without one.
  std::string name;
  ActivitySettings activity;
  YieldSettings yield;
  /// Where the activity's metrics are kept; empty for nowhere.
  std::string metricsFile;
  std::vector<ControllerSettings> controllers;
};

/// A fault of a host file. `what()` is one line, "file:line: fault", or "file: fault" where there is no line.
class HostFileError : public std::runtime_error {
 public:
  HostFileError(std::string_view file, unsigned line, std::string_view fault);
};

/// Reads and checks the host file text; `name` stands in messages. Throws HostFileError.
HostFile parseHostFile(std::string_view text, std::string_view name);

/// Reads and checks a host file: a regular file of at most 64 KiB. Throws HostFileError, also when it cannot
/// be read.
HostFile loadHostFile(const std::string& path);

/// Looks for the host file: the one `named`, else `brellium_host.toml` in the folder `credentials`, else
/// `systemFile`, a link that leads nowhere included; returns the defaults where there is none. `named` and
/// `credentials` may be null. Throws HostFileError.
HostFile findHostFile(const char* named, const char* credentials, const char* systemFile);

/// The host file of this process, looked for at the first call: $KSP_HOST_FILE, then $CREDENTIALS_DIRECTORY,
/// then /etc/brellium/host.toml. Throws HostFileError.
const HostFile& hostFile();

}  // namespace host
