// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <set>
#include <string>
#include <vector>

/// A platform that follows a script and records every call with its arguments, in order; `sleep` and `syslog`
/// are among them and cost no time.
namespace scripted {

struct StepAnswer {
  int32_t result = 0;
  uint32_t reply = 0;
};

struct OpenAnswer {
  int32_t result = 0;
  /// Left in the caller's handle; nothing is written where this is unset.
  bool setsHandle = true;
  uint32_t handle = 0x50;
};

struct Script {
  int state = 2;
  std::set<std::string> present;
  /// Classes for which no request can be built.
  std::set<std::string> unmatchable;
  /// Lookups that find nothing, by their number from 1, counting those for a present class.
  std::set<int> missingLookups;
  std::map<std::string, OpenAnswer> opens;
  std::vector<StepAnswer> steps;
  /// Answers to ActivityShouldDefer in turn; false behind the last.
  std::vector<bool> yields;
  int32_t closeResult = 0;
};

/// Starts a new recording.
void play(Script script);

/// What was called since `play`.
const std::vector<std::string>& calls();

}  // namespace scripted
