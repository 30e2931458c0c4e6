// Lookups and connections on a scripted platform: handles, rows, messages.

#include <gtest/gtest.h>

#include <algorithm>

#include "ksp/connection.h"
#include "tests/scripted_platform.h"

using scripted::Script;
using Calls = std::vector<std::string>;

namespace {

ExporterEntry* const kRows = nand_exporters_tunnel;
constexpr char kFlash[] = "VantorFlash3NVMeController";
constexpr char kEmbedded[] = "VantorEmbeddedNVMeController";
const scripted::OpenAnswer kRefused = {.result = -0x1FFFFD3B, .setsHandle = false, .handle = 0};

std::string notice(const std::string& operation, const std::string& className) {
  return "notice: Fendrel: " + operation + ": Controller found: " + className + "\n";
}

TEST(ExporterTable, RowsDifferInMethodsAndMediaStatistics) {
  EXPECT_LT(&statsSelector, &readStatsSelector);
  EXPECT_LT(&readStatsSelector, &mspStatsSelector);
  EXPECT_LT(&snapshotSelectors, &snapshotHeaderSelectors);
  for (int row = 0; row < 3; ++row) {
    EXPECT_EQ(kRows[row].getStatsSelector, getStatsSelector);
    EXPECT_EQ(kRows[row].getTaskSchedulerSelectors()->word1, 39u);
    EXPECT_EQ(kRows[row].getMspStatsSelector == nullptr, row != 0);
    EXPECT_EQ(kRows[row].tunnelMethod, row == 2 ? 8u : 9u);
    EXPECT_EQ(kRows[row].secondaryMethod, row == 2 ? 8u : 9u);
    EXPECT_EQ(kRows[row].extraMethod, row == 2 ? 5u : 0xFFFFFFFFu);
  }
  const auto* terminator = reinterpret_cast<const char*>(&kRows[3]);
  EXPECT_EQ(std::count(terminator, terminator + sizeof(ExporterEntry), 0), sizeof(ExporterEntry));
}

TEST(Lookup, TakesTheFirstRowThatIsPresent) {
  const struct {
    Script script;
    ExporterEntry* row;
  } cases[] = {
      {{}, kRows + 3},
      {{.present = {"KSPStorage"}}, kRows + 2},
      {{.present = {kEmbedded, "KSPStorage"}}, kRows + 1},
      {{.present = {kEmbedded, kFlash}}, kRows},
      {{.present = {kEmbedded, kFlash}, .unmatchable = {kFlash}}, kRows + 1},
  };
  for (const auto& [script, row] : cases) {
    scripted::play(script);
    ExporterEntry* entry = nullptr;
    const uint32_t service = findNandExporter(&entry);
    EXPECT_EQ(entry, row);
    EXPECT_EQ(service != 0, row != kRows + 3);
    EXPECT_EQ(scripted::calls(), service == 0 ? Calls{} : Calls{notice("findNandExporter", row->className)});
  }
}

TEST(FindAndOpen, PassesOverControllersThatRefuse) {
  scripted::play({.present = {kFlash, kEmbedded}, .opens = {{kFlash, kRefused}}});
  ExporterEntry* entry = nullptr;
  EXPECT_EQ(findNandExporterNew(&entry), 1);
  ASSERT_EQ(entry, kRows + 1);
  EXPECT_EQ(entry->connection, 0x50u);
  EXPECT_EQ(entry->service, 0x102u);
  EXPECT_EQ(kRows[0].connection, 0u);
  EXPECT_EQ(kRows[0].service, 0u);
  ReleaseIOInterfaces(entry);
  ReleaseIOInterfaces(entry);
  EXPECT_EQ(entry->connection, 0u);
  EXPECT_EQ(entry->service, 0u);
  EXPECT_EQ(scripted::calls(), (Calls{"open 101 type 0", "close 0", "release 101", "open 102 type 0",
                                      notice("findNandExporterNew", kEmbedded), "close 50", "release 102"}));
  EXPECT_EQ(scripted::unbalanced(), Calls{});
}

TEST(FindAndOpen, ClosesWhateverHandleARefusalLeft) {
  scripted::play({.present = {kFlash}, .opens = {{kFlash, {.result = 1, .handle = 0x77}}}});
  ExporterEntry* entry = nullptr;
  EXPECT_EQ(findNandExporterNew(&entry), 0);
  EXPECT_EQ(entry, kRows + 3);
  EXPECT_EQ(entry->connection, 0u);
  EXPECT_EQ(entry->service, 0u);
  EXPECT_EQ(scripted::calls(), (Calls{"open 101 type 0", "close 77", "release 101"}));
}

TEST(Connection, OpensThroughASecondLookupAndCloses) {
  scripted::play({.present = {kEmbedded}});
  KSPConnection connection = {7, 7, nullptr};
  testing::internal::CaptureStderr();
  EXPECT_EQ(openKSPConnection(&connection), 1);
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
  EXPECT_EQ(connection.service, 0x101u);
  EXPECT_EQ(connection.connection, 0x50u);
  EXPECT_EQ(connection.exporter, kRows + 1);
  closeKSPConnection(&connection);
  closeKSPConnection(&connection);
  EXPECT_EQ(kRows[1].connection, 0x50u) << "the row's copy stays";
  kRows[1].connection = 0;
  const std::string found = notice("findNandExporter", kEmbedded);
  EXPECT_EQ(scripted::calls(),
            (Calls{found, found, "open 102 type 0", "release 102", "close 50", "release 101"}));
  EXPECT_EQ(scripted::unbalanced(), Calls{});
}

TEST(Connection, FailuresSayWhyAndLeaveNothing) {
  const std::string cannot = "Can't get KSP Connection!\n";
  const std::string failed = "OpenServiceConnection failed for class 'VantorFlash3NVMeController', result 0x";
  const struct {
    Script script;
    ExporterEntry* row;
    std::string message;
    SelectorAccessor stats = getStatsSelector;
  } cases[] = {
      {{}, kRows + 3, "Can't get KSP Connection, no matching service!\n"},
      {{.present = {kFlash}, .missingLookups = {2}}, kRows + 3, "No class found" + cannot},
      {{.present = {kFlash}, .opens = {{kFlash, kRefused}}}, kRows, failed + "e00002c5\n" + cannot},
      {{.present = {kFlash}, .opens = {{kFlash, {.handle = 0}}}}, kRows, cannot},
      {{.present = {kFlash}}, kRows, cannot, getReadStatsSelector},
  };
  for (const auto& [script, row, message, stats] : cases) {
    scripted::play(script);
    kRows[0].getStatsSelector = stats;
    KSPConnection connection = {7, 7, nullptr};
    testing::internal::CaptureStderr();
    EXPECT_EQ(openKSPConnection(&connection), 0);
    EXPECT_EQ(testing::internal::GetCapturedStderr(), message);
    kRows[0].getStatsSelector = getStatsSelector;
    kRows[0].connection = 0;
    EXPECT_EQ(connection.service, 0u);
    EXPECT_EQ(connection.connection, 0u);
    EXPECT_EQ(connection.exporter, row);
    EXPECT_EQ(scripted::unbalanced(), Calls{});
  }
}

}  // namespace
