// Host files: what they may say, and the one line that names each fault.

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>

#include "platform/host/conditions.h"
#include "platform/host/host_file.h"

namespace {

namespace fs = std::filesystem;

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

std::string faultOf(const std::string& path) {
  try {
    host::loadHostFile(path);
    return "accepted";
  } catch (const host::HostFileError& fault) {
    return fault.what();
  }
}

// Beside each wrong file stands what is said of it behind its name: line and reason.
TEST(HostFile, FaultsNameFileLineAndReason) {
  int faults = 0;
  for (const auto& entry : fs::directory_iterator(KSP_TEST_DATA "/hosts")) {
    const fs::path& file = entry.path();
    if (file.extension() != ".toml") continue;
    const std::string said = faultOf(file);
    std::string expected;
    std::getline(std::ifstream(fs::path(file).replace_extension(".txt")), expected);
    // The parser's own words for broken TOML go on behind the expected ones.
    EXPECT_EQ(said.substr(0, file.string().size() + 1 + expected.size()), file.string() + ":" + expected);
    EXPECT_EQ(said.find('\n'), std::string::npos);
    ++faults;
  }
  EXPECT_GE(faults, 20);
}

TEST(HostFile, UnreadableFilesSayWhy) {
  EXPECT_EQ(faultOf("no/such/file"), "no/such/file: cannot be read: No such file or directory");
  EXPECT_EQ(faultOf("/"), "/: cannot be read: Is a directory");
  EXPECT_EQ(faultOf("/dev/zero"), "/dev/zero: cannot be read: it is larger than 1 MiB");
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
