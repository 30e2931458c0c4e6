// Host files: what they may say, and the one line that names each fault.

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>

#include "platform/host/conditions.h"
#include "platform/host/host_file.h"

namespace {

namespace fs = std::filesystem;

constexpr char kActivity[] = "[activity]\nidentifier = \"a\"\n";

TEST(HostFile, EveryExampleIsAccepted) {
  int examples = 0;
  for (const auto& example : fs::directory_iterator(KSP_EXAMPLE_HOSTS)) {
    EXPECT_EQ(host::loadHostFile(example.path()).activity.identifier, "com.vantor.brellium")
        << example.path();
    ++examples;
  }
  EXPECT_GE(examples, 6);
}

TEST(HostFile, KeysReachTheirSettings) {
  const host::HostFile file = host::parseHostFile(
      "activity = { identifier = \"x\", start_after_s = 1, retry_s = 2, interval_s = 3 }\n"
      "yield = { on_battery = true, io_pressure_percent = 4, after_s = 5, at_check = 6 }\n"
      "[[controller]]\nclass = \"KSPStorage\"\nsteps = [7, { reply = 8, result = 0xFFFFFFFF }]\n"
      "open_result = 9\nclose_result = 10\ngone_after_lookups = 11\n",
      "name");
  EXPECT_EQ(file.activity.identifier, "x");
  EXPECT_EQ(file.activity.startAfterSeconds, 1u);
  EXPECT_EQ(file.activity.retrySeconds, 2u);
  EXPECT_EQ(file.activity.intervalSeconds, 3u);
  EXPECT_TRUE(file.yield.onBattery);
  EXPECT_EQ(file.yield.ioPressurePercent, 4u);
  EXPECT_EQ(file.yield.afterSeconds, 5u);
  EXPECT_EQ(file.yield.atCheck, 6u);
  ASSERT_EQ(file.controllers.size(), 1u);
  const host::ControllerSettings& controller = file.controllers[0];
  EXPECT_EQ(controller.tunnelMethod, 8u);
  ASSERT_EQ(controller.steps.size(), 2u);
  EXPECT_EQ(controller.steps[0].reply, 7u);
  EXPECT_EQ(controller.steps[1].reply, 8u);
  EXPECT_EQ(controller.steps[1].result, -1);
  EXPECT_EQ(controller.openResult, 9);
  EXPECT_EQ(controller.closeResult, 10);
  EXPECT_EQ(controller.goneAfterLookups, 11u);
}

TEST(HostFile, FaultsNameFileLineAndReason) {
  const std::string controller = std::string(kActivity) + "[[controller]]\n";
  const struct {
    std::string text;
    std::string start;
  } cases[] = {
      {"", "f.toml:1: there is no activity"},
      {"\nactivity = 1\n", "f.toml:2: 'activity' must be a table"},
      {"# nothing\n[activity]\n", "f.toml:2: the activity has no 'identifier'"},
      {"[activity]\nidentifier = 3\n", "f.toml:2: 'activity.identifier' must be a text"},
      {"[activity\n", "f.toml:1: "},
      {kActivity + std::string("retry_s = -1\n"),
       "f.toml:3: 'activity.retry_s' is -1, but must be from 1 to 31622400"},
      {kActivity + std::string("retry_s = 1.5\n"), "f.toml:3: 'activity.retry_s' must be a whole number"},
      {kActivity + std::string("retrys = 1\n"), "f.toml:3: unknown key 'activity.retrys'"},
      {kActivity + std::string("\"\\u001B[2J\" = 1\n"), "f.toml:3: unknown key 'activity.?[2J'"},
      {kActivity + std::string("[yields]\n"), "f.toml:3: unknown key 'yields'"},
      {kActivity + std::string("[yield]\nat_check = 0\n"),
       "f.toml:4: 'yield.at_check' is 0, but must be from 1"},
      {kActivity + std::string("[yield]\non_battery = 1\n"),
       "f.toml:4: 'yield.on_battery' must be true or false"},
      {kActivity + std::string("[yield]\nio_pressure_percent = 101\n"),
       "f.toml:4: 'yield.io_pressure_percent' is 101"},
      {"controller = [1]\n" + std::string(kActivity), "f.toml:1: 'controller' must be a list of tables"},
      {controller + "steps = []\n", "f.toml:3: the controller has no 'class'"},
      {controller + "class = \"Floppy\"\n",
       "f.toml:4: unknown class 'Floppy'; there are VantorFlash3NVMeController, "},
      {controller + "class = \"KSPStorage\"\nsteps = 1\n", "f.toml:5: 'controller.steps' must be a list"},
      {controller + "class = \"KSPStorage\"\nsteps = [\n0, 4294967296]\n",
       "f.toml:6: 'controller.steps' is 4294967296"},
      {controller + "class = \"KSPStorage\"\nsteps = [{ answer = 1 }]\n",
       "f.toml:5: unknown key 'controller.steps.answer'"},
  };
  for (const auto& [text, start] : cases) {
    try {
      host::parseHostFile(text, "f.toml");
      ADD_FAILURE() << "accepted: " << text;
    } catch (const host::HostFileError& fault) {
      EXPECT_TRUE(std::string(fault.what()).starts_with(start)) << fault.what();
      EXPECT_EQ(std::string(fault.what()).find('\n'), std::string::npos);
    }
  }
}

TEST(HostFile, UnreadableFilesSayWhy) {
  const struct {
    const char* path;
    std::string line;
  } cases[] = {
      {"no/such/file", "no/such/file: cannot be read: No such file or directory"},
      {"/", "/: cannot be read: Is a directory"},
      {"/dev/zero", "/dev/zero: cannot be read: it is larger than 1 MiB"},
  };
  for (const auto& [path, line] : cases) {
    try {
      host::loadHostFile(path);
      ADD_FAILURE() << "read " << path;
    } catch (const host::HostFileError& fault) {
      EXPECT_EQ(fault.what(), line);
    }
  }
}

class Conditions : public testing::Test {
 protected:
  Conditions() : folder_(fs::path(testing::TempDir()) / ("conditions" + std::to_string(getpid()))) {}
  ~Conditions() override { fs::remove_all(folder_); }

  void write(const std::string& name, const std::string& text) {
    const fs::path file = folder_ / name;
    fs::create_directories(file.parent_path());
    std::ofstream(file) << text << '\n';
  }

  const fs::path folder_;
};

TEST_F(Conditions, BatteryCountsWhileItDischargesAndNothingElseSupplies) {
  EXPECT_FALSE(host::runsOnBattery(folder_));
  write("BAT0/type", "Battery");
  write("BAT0/status", "Discharging");
  EXPECT_TRUE(host::runsOnBattery(folder_));
  write("AC/type", "Mains");
  write("AC/online", "0");
  EXPECT_TRUE(host::runsOnBattery(folder_));
  write("AC/online", "1");
  EXPECT_FALSE(host::runsOnBattery(folder_));
  write("AC/online", "0");
  write("BAT0/scope", "Device");
  EXPECT_FALSE(host::runsOnBattery(folder_)) << "a mouse's battery";
}

TEST_F(Conditions, PressureIsTheTenSecondAverageOfSomeTask) {
  EXPECT_EQ(host::ioPressurePercent(folder_ / "io"), std::nullopt);
  write("io",
        "some avg10=12.50 avg60=3.00 avg300=1.00 total=9\nfull avg10=99.00 avg60=0.00 avg300=0.00 total=1");
  EXPECT_EQ(host::ioPressurePercent(folder_ / "io"), 12.5);
  write("io", "some avg10=wrong");
  EXPECT_EQ(host::ioPressurePercent(folder_ / "io"), std::nullopt);
}

}  // namespace
