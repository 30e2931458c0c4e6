// SPDX-License-Identifier: Apache-2.0
// Lookups and connections on a scripted platform: handles, rows, messages.

#include <gtest/gtest.h>

#include <algorithm>
#include <sstream>

#include "ksp/ksp.h"
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

/// What tells one row from another: its names, its methods and the numbers of its selectors.
std::string textOf(const ExporterEntry& row) {
  std::ostringstream text;
  text << row.className << ", " << row.propertyKey << ", " << row.tunnelMethod << ' ' << row.secondaryMethod
       << ' ' << static_cast<int32_t>(row.extraMethod) << ',';
  for (const SelectorAccessor accessor :
       {row.getStatsSelector, row.getReadStatsSelector, row.getMspStatsSelector, row.getBandStatsSelector,
        row.getDefectsListSelector, row.getTelemetryListSelectors, row.getTaskSchedulerSelectors,
        row.getSnapshotSelectors, row.getSnapshotHeaderSelectors}) {
    const SelectorPair pair = accessor == nullptr ? SelectorPair{} : *accessor();
    text << ' ' << pair.word0;
    if (pair.word1 != pair.word0) text << '/' << pair.word1;
  }
  return text.str();
}

TEST(ExporterTable, RowsDifferInNamesMethodsAndMediaStatistics) {
  EXPECT_EQ(textOf(kRows[0]),
            std::string(kFlash) + ", Controller Characteristics, 9 9 -1, 13 10 221 11 15 17 39 22 145");
  EXPECT_EQ(textOf(kRows[1]),
            std::string(kEmbedded) + ", Controller Characteristics, 9 9 -1, 13 10 0 11 15 17 39 22 145");
  EXPECT_EQ(textOf(kRows[2]), "KSPStorage, PropertyMatch, 8 8 5, 13 10 0 11 15 17 39 22 145");
  for (int row = 0; row < 3; ++row) {
    const ExporterEntry& entry = kRows[row];
    EXPECT_EQ(entry.parseBuffer, KSPParseBufferToCxt);
    EXPECT_EQ(entry.releaseContext, KSPReleaseContext);
    EXPECT_EQ(entry.parseMspBuffer, row == 0 ? KSPMSPParseBufferToCxt : nullptr);
    EXPECT_EQ(entry.parseFtlBuffer, KSPFTLParseBufferToCxt);
    EXPECT_EQ(entry.parseStatKeyBuffer, KSPFTLParseStatKeyBufferToCxt);
    EXPECT_EQ(entry.releaseGenericContext, ReleaseGenericParserCxt);
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

TEST(FindAndOpen, TakesTheFirstControllerThatOpens) {
  const std::string found = notice("findNandExporterNew", kFlash);
  const struct {
    Script script;
    ExporterEntry* row;
    uint32_t connection;
    uint32_t service;
    Calls calls;
  } cases[] = {
      {{}, kRows + 3, 0, 0, {}},
      {{.present = {kFlash, kEmbedded}, .opens = {{kFlash, kRefused}}},
       kRows + 1,
       0x50,
       0x102,
       {"open 101 type 0", "close 0", "release 101", "open 102 type 0",
        notice("findNandExporterNew", kEmbedded), "close 50", "release 102"}},
      {{.present = {kFlash}, .opens = {{kFlash, {.result = 1, .handle = 0x77}}}},
       kRows + 3,
       0,
       0,
       {"open 101 type 0", "close 77", "release 101"}},
      {{.present = {kFlash}, .opens = {{kFlash, {.handle = 0}}}},
       kRows,
       0,
       0x101,
       {"open 101 type 0", found, "release 101"}},
  };
  for (const auto& [script, row, connection, service, calls] : cases) {
    scripted::play(script);
    ExporterEntry* entry = nullptr;
    EXPECT_EQ(findNandExporterNew(&entry), service != 0 ? 1 : 0);
    ASSERT_EQ(entry, row);
    EXPECT_EQ(entry->connection, connection);
    EXPECT_EQ(entry->service, service);
    for (int again = 0; again < 2; ++again) ReleaseIOInterfaces(entry);
    for (const ExporterEntry& each : nand_exporters_tunnel) EXPECT_EQ(each.connection + each.service, 0u);
    EXPECT_EQ(scripted::calls(), calls);
  }
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
}

TEST(Connection, JudgesByHandleAndAccessorAndSaysWhatFails) {
  const std::string cannot = "Can't get KSP Connection!\n";
  const std::string failed = "OpenServiceConnection failed for class 'VantorFlash3NVMeController', result 0x";
  const Calls looked = {"release 101"};
  const Calls refused = {"open 102 type 0", "release 102", "release 101"};
  const Calls closed = {"open 102 type 0", "release 102", "close 50", "release 101"};
  const struct {
    Script script;
    ExporterEntry* row;
    std::string message;
    Calls calls;
    int result = 0;
    SelectorAccessor stats = getStatsSelector;
  } cases[] = {
      {{}, kRows + 3, "Can't get KSP Connection, no matching service!\n", {}},
      {{.present = {kFlash}, .missingLookups = {2}}, kRows + 3, "No class found" + cannot, looked},
      {{.present = {kFlash}, .opens = {{kFlash, kRefused}}}, kRows, failed + "e00002c5\n" + cannot, refused},
      {{.present = {kFlash}, .opens = {{kFlash, {.handle = 0}}}}, kRows, cannot, refused},
      {{.present = {kFlash}}, kRows, cannot, closed, 0, getReadStatsSelector},
      {{.present = {kFlash}, .opens = {{kFlash, {.result = 0x2C5}}}}, kRows, failed + "2c5\n", closed, 1},
  };
  for (const auto& [script, row, message, calls, result, stats] : cases) {
    scripted::play(script);
    kRows[0].getStatsSelector = stats;
    KSPConnection connection = {7, 7, nullptr};
    testing::internal::CaptureStderr();
    EXPECT_EQ(openKSPConnection(&connection), result);
    EXPECT_EQ(testing::internal::GetCapturedStderr(), message);
    kRows[0].getStatsSelector = getStatsSelector;
    kRows[0].connection = 0;
    EXPECT_EQ(connection.service, result == 0 ? 0u : 0x101u);
    EXPECT_EQ(connection.connection, result == 0 ? 0u : 0x50u);
    EXPECT_EQ(connection.exporter, row);
    closeKSPConnection(&connection);
    Calls held = scripted::calls();
    std::erase_if(held, [](const std::string& call) { return call.starts_with("notice: "); });
    EXPECT_EQ(held, calls);
  }
}

}  // namespace
