// SPDX-License-Identifier: Apache-2.0
#include "daemon/activity_handler.h"

#include <unistd.h>

#include <bit>
#include <cstddef>
#include <cstdint>

#include "ksp/exporter.h"
#include "platform/driver_service.h"
#include "platform/system_log.h"

namespace {

constexpr uint32_t kConnectionType = 0;
constexpr uint32_t kStepParameter = 0x401;
constexpr unsigned kDeferChecks = 6;
constexpr unsigned kDeferCheckSeconds = 5;

/// What one step sends through the driver's tunnel method; numbers are little-endian.
struct BdrStepRequest {
  uint32_t selector;
  uint32_t parameter;
  uint8_t reserved[16];
};
static_assert(sizeof(BdrStepRequest) == 24);

/// What the controller answers: nonzero while BDR work remains.
struct BdrStepReply {
  uint32_t bdrPending;
};
static_assert(sizeof(BdrStepReply) == 4);

constexpr uint32_t littleEndian(uint32_t value) {
  return std::endian::native == std::endian::little ? value : __builtin_bswap32(value);
}

struct OpenController {
  const ExporterEntry& row;
  const SelectorPair& taskScheduler;
  uint32_t connection;
};

/// Sends one step. Returns whether BDR work remains; a step that failed leaves none.
bool runStep(const OpenController& controller, uint32_t iteration) {
  SystemLog("iter# %u - BEGIN", iteration);
  const BdrStepRequest request = {
      .selector = littleEndian(controller.taskScheduler.word1),
      .parameter = littleEndian(kStepParameter),
      .reserved = {},
  };
  BdrStepReply reply = {.bdrPending = 0};
  size_t replySize = sizeof reply;
  const int32_t status = CallStructMethod(controller.connection, controller.row.tunnelMethod, &request,
                                          sizeof request, &reply, &replySize);
  const uint32_t pending = littleEndian(reply.bdrPending);
  SystemLog("iter# %u - KSP status %s - is BDR done: %s (%u)", iteration, status == 0 ? "pass" : "fail",
            pending == 0 ? "YES" : "NO", pending);
  return status == 0 && pending != 0;
}

/// Waits between two steps. Returns true as soon as the platform asks to yield.
bool mustYieldWhileWaiting(Activity* activity) {
  for (unsigned check = 1; check <= kDeferChecks; ++check) {
    if (ActivityShouldDefer(activity)) {
      SystemLog("  - defer chck %u/%u - deferring!!!!", check, kDeferChecks);
      return true;
    }
    SystemLog("  - defer chck %u/%u - sleeping for %us", check, kDeferChecks, kDeferCheckSeconds);
    sleep(kDeferCheckSeconds);
  }
  return false;
}

/// Sends steps until no BDR work remains or the platform asks to yield. Returns whether work remains.
bool runSteps(Activity* activity, const OpenController& controller) {
  for (uint32_t iteration = 1;; ++iteration) {
    if (!runStep(controller, iteration)) {
      SystemLog("iter# %u - DONE - no more BDR", iteration);
      return false;
    }
    if (mustYieldWhileWaiting(activity)) {
      SystemLog("iter# %u - DONE for now - more BDR", iteration);
      return true;
    }
    SystemLog("iter# %u - DONE sleeping - more BDR", iteration);
  }
}

void closeConnection(uint32_t connection) {
  SystemLog("closing io service connection");
  if (CloseServiceConnection(connection) != 0) SystemLog("error closing connection to service");
}

/// Finds the controller, connects and runs its steps. Returns whether BDR work remains.
bool runPendingWork(Activity* activity) {
  ExporterEntry* row = nullptr;
  const uint32_t service = findNandExporter(&row);
  if (service == 0 || row == nullptr) return false;

  bool workRemains = false;
  uint32_t connection = 0;
  if (row->getTaskSchedulerSelectors != nullptr) {
    const SelectorPair* taskScheduler = row->getTaskSchedulerSelectors();
    if (OpenServiceConnection(service, getpid(), kConnectionType, &connection) == 0 && connection != 0) {
      SystemLog("opened io service connection");
      workRemains = runSteps(activity, {*row, *taskScheduler, connection});
      closeConnection(connection);
    }
  }
  ReleaseServiceObject(service);
  return workRemains;
}

}  // namespace

void activityHandler(Activity* activity) {
  if (GetActivityState(activity) != ActivityStateRun) return;

  SystemLog("running brellium");
  const bool workRemains = runPendingWork(activity);
  if (workRemains && ActivityShouldDefer(activity)) {
    SystemLog("deferring brellium daemon\n");
    SetActivityState(activity, ActivityStateDefer);
  } else {
    SystemLog("stopping brellium daemon\n");
  }
  ExitTransactionClean();
}
