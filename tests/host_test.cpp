// SPDX-License-Identifier: Apache-2.0
// The host port's plain functions: what the machine tells, what follows from it, and how it is told on.

#include <sys/stat.h>

#include <cerrno>
#include <sstream>

#include "platform/host/conditions.h"
#include "platform/host/metrics.h"
#include "platform/host/policy.h"
#include "tests/folder.h"

namespace {

namespace fs = std::filesystem;
using host::Reason;
using std::chrono::milliseconds;
using std::chrono::seconds;

class Host : public FolderTest {};

TEST_F(Host, RunsOnBatteryWhileOneDischargesAndNoSupplyIsOnLine) {
  const std::string battery = "B/type=Battery B/status=Discharging ";
  const struct {
    std::string supplies;
    bool onBattery;
  } cases[] = {
      {"", false},
      {battery, true},
      {"B/type=Battery B/status=Full", false},
      {"U/type=UPS U/status=Discharging U/online=1", true},
      {battery + "B/scope=Device", false},
      {battery + "A/type=Mains A/online=0", true},
      {battery + "A/type=Mains A/online=1", false},
      {battery + "A/type=USB A/online=2", false},
      {battery + "A/type=USB A/online=1 A/scope=Device", true},
      {battery + "A/type=Mains A/online=", true},
  };
  for (const auto& [supplies, onBattery] : cases) {
    fs::remove_all(folder_);
    fs::create_directories(folder_);
    std::istringstream files(supplies);
    for (std::string file; files >> file;) {
      const size_t equals = file.find('=');
      write(file.substr(0, equals), file.substr(equals + 1));
    }
    EXPECT_EQ(host::runsOnBattery(folder_.c_str()), onBattery) << supplies;
  }
  EXPECT_EQ(host::runsOnBattery(path("none").c_str()), std::nullopt);
}

TEST_F(Host, PressureIsTheFiniteTenSecondAverageOfSomeTask) {
  const struct {
    const char* text;
    std::optional<double> percent;
  } cases[] = {
      {"some avg10=12.50 avg60=3.00 avg300=1.00 total=9\nfull avg10=99.00 avg60=0.00\n", 12.5},
      {"some avg10=0.00", 0.0},
      {"some avg10=1.5x avg60=0.00", std::nullopt},
      {"some avg10=nan avg60=0.00", std::nullopt},
      {"some avg10=inf avg60=0.00", std::nullopt},
      {"some avg10= avg60=0.00", std::nullopt},
      {"full avg10=12.50 avg60=3.00", std::nullopt},
      {"", std::nullopt},
  };
  for (const auto& [text, percent] : cases) {
    write("io", text);
    EXPECT_EQ(host::ioPressurePercent(path("io").c_str()), percent) << text;
  }
  EXPECT_EQ(host::ioPressurePercent(path("none").c_str()), std::nullopt);
  EXPECT_EQ(host::ioPressurePercent(folder_.c_str()), std::nullopt) << "it opens, but cannot be read";
}

TEST(Policy, TheRunsOwnReasonsInTheirOrder) {
  const host::YieldSettings settings = {.afterSeconds = 10, .atCheck = 3};
  const struct {
    host::RunFigures figures;
    Reason reason;
  } cases[] = {
      {{false, 1, milliseconds(9999)}, Reason::kNone},  {{false, 2, milliseconds(10000)}, Reason::kTime},
      {{false, 3, milliseconds(9999)}, Reason::kCheck}, {{false, 4, seconds(99)}, Reason::kCheck},
      {{true, 4, milliseconds(10000)}, Reason::kStop},
  };
  for (const auto& [figures, reason] : cases) EXPECT_EQ(host::reasonOfRun(settings, figures), reason);
  EXPECT_EQ(host::reasonOfRun({}, {false, 1000, seconds(1000)}), Reason::kNone);
  EXPECT_EQ(host::reasonOfRun({.afterSeconds = 0}, {}), Reason::kTime);
}

TEST(Policy, TheMachinesReasonsAndTheirWords) {
  const host::YieldSettings both = {
      .onBattery = true, .ioPressurePercent = 40, .afterSeconds = 6, .atCheck = 2};
  EXPECT_EQ(host::reasonOfMachine(both, {true, 99.0}), Reason::kBattery);
  EXPECT_EQ(host::reasonOfMachine(both, {false, 40.5}), Reason::kPressure);
  EXPECT_EQ(host::reasonOfMachine(both, {false, 40.0}), Reason::kNone);
  EXPECT_EQ(host::reasonOfMachine(both, {}), Reason::kNone) << "nothing is told";
  EXPECT_EQ(host::reasonOfMachine({}, {true, 99.0}), Reason::kNone) << "nothing is asked";
  EXPECT_EQ(host::describe(Reason::kPressure, both), "I/O pressure above 40 %");
}

TEST_F(Host, WhatIsNotKnownYetIsLeftOut) {
  EXPECT_EQ(host::exposition({.runs = 1, .deferrals = {9, 1, 2, 3, 4, 5}, .runTime = milliseconds(12034)}),
            textOf(KSP_TEST_DATA "/first_run.prom"));
}

TEST_F(Host, AFileIsReplacedWholeOrNotAtAll) {
  const mode_t before = umask(0077);
  write("metrics", "old");
  EXPECT_EQ(host::replaceFile(path("metrics"), "new"), 0);
  umask(before);
  EXPECT_EQ(read("metrics"), "new");
  EXPECT_EQ(fs::status(path("metrics")).permissions(), fs::perms(0644)) << "the exporter reads it";

  EXPECT_EQ(host::replaceFile(path("no/metrics"), "new"), ENOENT);
  fs::create_directories(path("folder/full"));
  EXPECT_EQ(host::replaceFile(path("folder"), "new"), EISDIR);
  fs::create_symlink("metrics", path("metrics.new"));
  EXPECT_EQ(host::replaceFile(path("metrics"), "newer"), ELOOP) << "no link is followed";
  EXPECT_EQ(read("metrics"), "new");
  fs::remove(path("metrics.new"));
  int left = 0;
  for (const auto& entry : fs::directory_iterator(folder_))
    left += entry.path().extension() == ".new" ? 1 : 0;
  EXPECT_EQ(left, 0) << "nothing lies about";
}

}  // namespace
