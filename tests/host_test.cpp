// The host port's plain functions: what the machine tells, what follows from it, and how it is told on.

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <sstream>

#include "platform/host/conditions.h"
#include "platform/host/metrics.h"
#include "platform/host/policy.h"
#include "platform/host/schedule.h"

namespace {

namespace fs = std::filesystem;
using host::Reason;
using std::chrono::milliseconds;
using std::chrono::seconds;

class Host : public testing::Test {
 protected:
  Host() : folder_(fs::path(testing::TempDir()) / ("machine" + std::to_string(getpid()))) {
    fs::create_directories(folder_);
  }
  ~Host() override { fs::remove_all(folder_); }

  std::string path(const std::string& name) const { return folder_ / name; }

  void write(const std::string& name, const std::string& text) {
    fs::create_directories((folder_ / name).parent_path());
    std::ofstream(folder_ / name) << text;
  }

  std::string read(const std::string& name) const {
    std::stringstream text;
    text << std::ifstream(folder_ / name).rdbuf();
    return text.str();
  }

  const fs::path folder_;
};

TEST_F(Host, RunsOnBatteryWhileOneDischargesAndNoSupplyIsOnLine) {
  using Supplies = std::vector<std::pair<std::string, std::string>>;
  const struct {
    const char* what;
    Supplies supplies;
    bool onBattery;
  } cases[] = {
      {"nothing", {}, false},
      {"a battery", {{"B/type", "Battery"}, {"B/status", "Discharging"}}, true},
      {"a full battery", {{"B/type", "Battery"}, {"B/status", "Full"}}, false},
      {"an uninterruptible supply",
       {{"U/type", "UPS"}, {"U/status", "Discharging"}, {"U/online", "1"}},
       true},
      {"a mouse", {{"B/type", "Battery"}, {"B/status", "Discharging"}, {"B/scope", "Device"}}, false},
      {"off line",
       {{"B/type", "Battery"}, {"B/status", "Discharging"}, {"A/type", "Mains"}, {"A/online", "0"}},
       true},
      {"on line",
       {{"B/type", "Battery"}, {"B/status", "Discharging"}, {"A/type", "Mains"}, {"A/online", "1"}},
       false},
      {"on line by contract",
       {{"B/type", "Battery"}, {"B/status", "Discharging"}, {"A/type", "USB"}, {"A/online", "2"}},
       false},
      {"a device's own supply",
       {{"B/type", "Battery"},
        {"B/status", "Discharging"},
        {"A/type", "USB"},
        {"A/online", "1"},
        {"A/scope", "Device"}},
       true},
      {"a supply that tells nothing",
       {{"B/type", "Battery"}, {"B/status", "Discharging"}, {"A/type", "Mains"}, {"A/online", ""}},
       true},
  };
  for (const auto& [what, supplies, onBattery] : cases) {
    fs::remove_all(folder_);
    fs::create_directories(folder_);
    for (const auto& [file, text] : supplies) write(file, text + "\n");
    EXPECT_EQ(host::runsOnBattery(folder_.c_str()), onBattery) << what;
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
  EXPECT_EQ(host::describe(Reason::kNone, both), "");
  EXPECT_EQ(host::describe(Reason::kStop, both), "the process is being stopped");
  EXPECT_EQ(host::describe(Reason::kCheck, both), "check 2");
  EXPECT_EQ(host::describe(Reason::kTime, both), "the run has lasted 6 s");
  EXPECT_EQ(host::describe(Reason::kBattery, both), "on battery");
  EXPECT_EQ(host::describe(Reason::kPressure, both), "I/O pressure above 40 %");
}

TEST(Schedule, EachTurnHasItsPause) {
  const host::ActivitySettings settings = {.startAfterSeconds = 1, .retrySeconds = 2, .intervalSeconds = 3};
  EXPECT_EQ(host::pauseAtStart(settings), seconds(1));
  EXPECT_EQ(host::pauseAfter(host::Turn::kDeferred, settings), seconds(2));
  EXPECT_EQ(host::pauseAfter(host::Turn::kHeldBack, settings), seconds(2));
  EXPECT_EQ(host::pauseAfter(host::Turn::kFinished, settings), seconds(3));
  EXPECT_EQ(host::pauseAfter(host::Turn::kFinished, {}), std::nullopt);
}

TEST(Metrics, WhatIsNotKnownYetIsLeftOut) {
  const std::string text =
      host::exposition({.runs = 1, .deferrals = {9, 1, 2, 3, 4, 5}, .runTime = milliseconds(12034)});
  EXPECT_EQ(
      text,
      "# HELP brellium_runs_total Runs of the activity that began.\n"
      "# TYPE brellium_runs_total counter\n"
      "brellium_runs_total 1\n"
      "# HELP brellium_steps_total Steps that the controller was asked for, by their result.\n"
      "# TYPE brellium_steps_total counter\n"
      "brellium_steps_total{result=\"pass\"} 0\n"
      "brellium_steps_total{result=\"fail\"} 0\n"
      "# HELP brellium_deferrals_total Runs that were deferred, or held back when they were due, by the "
      "reason to yield.\n"
      "# TYPE brellium_deferrals_total counter\n"
      "brellium_deferrals_total{reason=\"battery\"} 4\n"
      "brellium_deferrals_total{reason=\"pressure\"} 5\n"
      "brellium_deferrals_total{reason=\"time\"} 3\n"
      "brellium_deferrals_total{reason=\"stop\"} 1\n"
      "brellium_deferrals_total{reason=\"check\"} 2\n"
      "# HELP brellium_run_seconds_total Time that runs have lasted.\n"
      "# TYPE brellium_run_seconds_total counter\n"
      "brellium_run_seconds_total 12.034\n");
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
