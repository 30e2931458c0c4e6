// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

#include "tools/kspdump/decode/decode.h"
#include "tools/kspdump/source/source.h"
#include "tools/kspdump/view/view.h"

namespace kspdump {

/// Exit statuses; the greatest that applies is the program's.
enum Status : int { kClean = 0, kFindings = 1, kUsage = 2, kUnreadable = 3 };

/// What the program can do.
enum class Task { kCaptures, kDifference, kTrend, kIdentify, kKeys };

/// What the command line asks for.
struct Options {
  Task task = Task::kCaptures;
  const Form* form = nullptr;
  /// Of `kKeys`, whose keys, and which.
  Decoding decoding;
  /// Of series, what is shown of them, and the statistic that a trend goes over; empty for the order given.
  Ranking ranking;
  std::string over;
  /// Whether each element of an array has a row of its own.
  bool expands = false;

  /// Files, or "-" for standard input.
  std::vector<std::string> sources;
  /// What standard input is called in the results; empty for "-".
  std::string label;
  /// File of more sources, each ended by a NUL, or "-"; empty for none.
  std::string sourcesFrom;
  /// The greatest capture that is read, in bytes.
  uint64_t mostBytes = Reading::kUsualGreatest;
  /// File of the snapshot's header; empty for none.
  std::string header;
  /// Captures decoded at a time.
  size_t jobs = 1;

  /// File to write to; empty for standard output.
  std::string output;
  /// Whether that may be a capture, which is lost then.
  bool overwrites = false;
};

/// A command line that cannot be followed; the text says why.
class UsageError : public std::runtime_error {
 public:
  using runtime_error::runtime_error;
};

/// Does what is asked for. Returns the exit status; throws UsageError, and any other std::exception where
/// nothing more can be done.
int run(const Options& options);

}  // namespace kspdump
