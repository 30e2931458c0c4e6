// SPDX-License-Identifier: Apache-2.0
#include "tools/kspdump/decode/capture.h"

namespace kspdump {

std::string_view kindName(Kind kind) {
  constexpr std::string_view kNames[] = {"stats", "summary", "media", "snapshot"};
  return kNames[static_cast<size_t>(kind)];
}

std::string_view kindTitle(Kind kind) {
  constexpr std::string_view kTitles[] = {"statistics", "statistics summary", "media statistics", "snapshot"};
  return kTitles[static_cast<size_t>(kind)];
}

std::string counted(uint64_t count, const char* noun) {
  return std::to_string(count) + " " + noun + (count == 1 ? "" : "s");
}

void Capture::clear() {
  recordCount = 0;
  shownCount = 0;
  share = {};
  findings.clear();
  furtherFindings = 0;
  labels.clear();
}

void Capture::find(uint64_t offset, std::string reason) {
  if (findings.size() < kMostFindings) {
    findings.push_back({offset, std::move(reason)});
  } else {
    ++furtherFindings;
  }
}

}  // namespace kspdump
