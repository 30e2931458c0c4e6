// SPDX-License-Identifier: Apache-2.0
// The real handler on a scripted platform: every call and every line, in order.

#include <gtest/gtest.h>

#include "daemon/activity_handler.h"
#include "daemon/registration.h"
#include "ksp/exporter.h"
#include "tests/scripted_platform.h"

using scripted::Script;
using Calls = std::vector<std::string>;

namespace {

constexpr char kFlash[] = "VantorFlash3NVMeController";

Calls operator+(Calls left, const Calls& right) {
  left.insert(left.end(), right.begin(), right.end());
  return left;
}

const Calls kStart = {"state?", "log: running brellium"};
const Calls kStop = {"log: stopping brellium daemon\n", "clean"};
const Calls kDeferred = {"defer?", "log: deferring brellium daemon\n", "set state 3", "clean"};
const Calls kClosing = {"log: closing io service connection", "close 50", "release 101"};

Calls found(const std::string& className) {
  return {"notice: Fendrel: findNandExporter: Controller found: " + className + "\n", "open 101 type 0"};
}

Calls opened(const std::string& className) {
  return kStart + found(className) + Calls{"log: opened io service connection"};
}

Calls step(unsigned number, const std::string& outcome) {
  const std::string iteration = "log: iter# " + std::to_string(number);
  return {iteration + " - BEGIN",
          "call 50 method 9 27000000"
          "01040000"
          "00000000000000000000000000000000 out 00000000/4",
          iteration + " - KSP status " + outcome};
}

Calls sleeps(unsigned count) {
  Calls calls;
  for (unsigned check = 1; check <= count; ++check) {
    calls.push_back("defer?");
    calls.push_back("log:   - defer chck " + std::to_string(check) + "/6 - sleeping for 5s");
    calls.push_back("sleep 5");
  }
  return calls;
}

Calls yields(unsigned check, unsigned number) {
  return sleeps(check - 1) + Calls{"defer?",
                                   "log:   - defer chck " + std::to_string(check) + "/6 - deferring!!!!",
                                   "log: iter# " + std::to_string(number) + " - DONE for now - more BDR"};
}

Calls line(unsigned number, const std::string& text) {
  return {"log: iter# " + std::to_string(number) + " - " + text};
}

struct Case {
  const char* name;
  Script script;
  Calls calls;
};

const Calls kDone = line(1, "DONE - no more BDR") + kClosing + kStop;
const Calls kOpenFails = kStart + found(kFlash) + Calls{"release 101"} + kStop;

// What a host can bring about is seen in the daemon's own runs.
TEST(Handler, CallsAndLogsInOrder) {
  const std::set<std::string> flash = {kFlash};
  const Case cases[] = {
      {"CheckIn", {.state = 0, .present = flash}, {"state?"}},
      {"State1", {.state = 1, .present = flash}, {"state?"}},
      {"Deferred", {.state = 3, .present = flash}, {"state?"}},
      {"OpenFails", {.present = flash, .opens = {{kFlash, {.result = -1, .setsHandle = false}}}}, kOpenFails},
      {"OpenFailsAndLeavesAHandle", {.present = flash, .opens = {{kFlash, {.result = -1}}}}, kOpenFails},
      {"ZeroHandle", {.present = flash, .opens = {{kFlash, {.handle = 0}}}}, kOpenFails},
      {"DoneAtOnce",
       {.present = flash, .steps = {{0, 0}}},
       opened(kFlash) + step(1, "pass - is BDR done: YES (0)") + kDone},
      {"YieldWithdrawn",
       {.present = flash, .steps = {{0, 3}}, .yields = {false, true, false}},
       opened(kFlash) + step(1, "pass - is BDR done: NO (3)") + yields(2, 1) + kClosing + Calls{"defer?"} +
           kStop},
      {"YieldInSecondStep",
       {.present = flash,
        .steps = {{0, 1}, {0, 1}},
        .yields = {false, false, false, false, false, false, true, true}},
       opened(kFlash) + step(1, "pass - is BDR done: NO (1)") + sleeps(6) +
           line(1, "DONE sleeping - more BDR") + step(2, "pass - is BDR done: NO (1)") + yields(1, 2) +
           kClosing + kDeferred},
      {"FailedStepWithReply",
       {.present = flash, .steps = {{-5, 0xFFFFFFFF}}, .yields = {true, true}},
       opened(kFlash) + step(1, "fail - is BDR done: NO (4294967295)") + kDone},
      {"FailedClose",
       {.present = flash, .steps = {{0, 0}}, .closeResult = 1},
       opened(kFlash) + step(1, "pass - is BDR done: YES (0)") + line(1, "DONE - no more BDR") +
           Calls{"log: closing io service connection", "close 50", "log: error closing connection to service",
                 "release 101"} +
           kStop},
  };
  for (const auto& [name, script, calls] : cases) {
    scripted::play(script);
    activityHandler(nullptr);
    EXPECT_EQ(scripted::calls(), calls) << name;
  }
}

TEST(HandlerRow, WithoutTaskSchedulerReleasesTheServiceAndStops) {
  ExporterEntry& row = nand_exporters_tunnel[0];
  scripted::play({.present = {kFlash}});
  row.getTaskSchedulerSelectors = nullptr;
  activityHandler(nullptr);
  row.getTaskSchedulerSelectors = getTaskSchedulerSelectors;
  EXPECT_EQ(scripted::calls(), (kStart + Calls{found(kFlash).front(), "release 101"} + kStop));
}

TEST(Registration, ChecksIn) {
  scripted::play({});
  registerActivityHandler();
  EXPECT_EQ(scripted::calls(), Calls{"register com.vantor.brellium check-in"});
}

}  // namespace
