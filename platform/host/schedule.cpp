// SPDX-License-Identifier: Apache-2.0
#include "platform/host/schedule.h"

namespace host {

std::chrono::seconds pauseAtStart(const ActivitySettings& settings) {
  return std::chrono::seconds(settings.startAfterSeconds);
}

std::optional<std::chrono::seconds> pauseAfter(Turn turn, const ActivitySettings& settings) {
  if (turn != Turn::kFinished) return std::chrono::seconds(settings.retrySeconds);
  if (settings.intervalSeconds == 0) return std::nullopt;
  return std::chrono::seconds(settings.intervalSeconds);
}

}  // namespace host
