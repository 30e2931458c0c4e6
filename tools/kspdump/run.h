#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "tools/kspdump/decode/decode.h"
#include "tools/kspdump/source/source.h"
#include "tools/kspdump/view/view.h"

namespace kspdump {

/// Exit statuses; the greatest that applies is the program's.
enum Status : int { kClean = 0, kFindings = 1, kUsage = 2, kUnreadable = 3 };

/// What the command line asks for.
struct Options {
  Subject subject = Subject::kStatistics;
  const Form* form = nullptr;
  Decoding decoding;
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
  /// File to write to; empty for standard output.
  std::string output;
  /// Captures decoded at a time.
  size_t jobs = 1;
};

/// Does what is asked for. Returns the exit status; throws std::exception where nothing more can be done.
int run(const Options& options);

}  // namespace kspdump
