// SPDX-License-Identifier: Apache-2.0
#include "ksp/exporter.h"

#include <cstddef>
#include <cstdint>

#include "ksp/media_statistics.h"
#include "ksp/statistics.h"
#include "platform/driver_service.h"

// Clients of other languages read these structures by offset.
static_assert(sizeof(SelectorPair) == 8 && offsetof(SelectorPair, word0) == 0 &&
              offsetof(SelectorPair, word1) == 4);
#ifdef __LP64__
static_assert(offsetof(ExporterEntry, className) == 0 && offsetof(ExporterEntry, propertyKey) == 8 &&
              offsetof(ExporterEntry, connection) == 16 && offsetof(ExporterEntry, service) == 20 &&
              offsetof(ExporterEntry, extraMethod) == 24 && offsetof(ExporterEntry, tunnelMethod) == 28 &&
              offsetof(ExporterEntry, secondaryMethod) == 32 &&
              offsetof(ExporterEntry, getStatsSelector) == 40 &&
              offsetof(ExporterEntry, getReadStatsSelector) == 48 &&
              offsetof(ExporterEntry, getMspStatsSelector) == 56 &&
              offsetof(ExporterEntry, getDefectsListSelector) == 64 &&
              offsetof(ExporterEntry, getTelemetryListSelectors) == 72 &&
              offsetof(ExporterEntry, getTaskSchedulerSelectors) == 80 &&
              offsetof(ExporterEntry, getSnapshotSelectors) == 88 &&
              offsetof(ExporterEntry, getSnapshotHeaderSelectors) == 96 &&
              offsetof(ExporterEntry, getBandStatsSelector) == 104 &&
              offsetof(ExporterEntry, parseBuffer) == 112 && offsetof(ExporterEntry, releaseContext) == 120 &&
              offsetof(ExporterEntry, parseMspBuffer) == 128 &&
              offsetof(ExporterEntry, parseFtlBuffer) == 136 &&
              offsetof(ExporterEntry, parseStatKeyBuffer) == 144 &&
              offsetof(ExporterEntry, releaseGenericContext) == 152 && sizeof(ExporterEntry) == 160);
#endif

// Selector numbers of the controller's commands.
const SelectorPair statsSelector = {13, 13};
const SelectorPair readStatsSelector = {10, 10};
const SelectorPair mspStatsSelector = {221, 221};
const SelectorPair bandStatsSelector = {11, 11};
const SelectorPair defectsListSelector = {15, 15};
const SelectorPair telemetryListSelectors = {17, 17};
const SelectorPair taskSchedulerSelectors = {39, 39};
const SelectorPair snapshotSelectors = {22, 22};
const SelectorPair snapshotHeaderSelectors = {145, 145};

const SelectorPair* getStatsSelector() {
  return &statsSelector;
}
const SelectorPair* getReadStatsSelector() {
  return &readStatsSelector;
}
const SelectorPair* getMspStatsSelector() {
  return &mspStatsSelector;
}
const SelectorPair* getDefectsListSelector() {
  return &defectsListSelector;
}
const SelectorPair* getTelemetryListSelectors() {
  return &telemetryListSelectors;
}
const SelectorPair* getTaskSchedulerSelectors() {
  return &taskSchedulerSelectors;
}
const SelectorPair* getSnapshotSelectors() {
  return &snapshotSelectors;
}
const SelectorPair* getSnapshotHeaderSelectors() {
  return &snapshotHeaderSelectors;
}
const SelectorPair* getBandStatsSelector() {
  return &bandStatsSelector;
}

namespace {

struct Methods {
  uint32_t extra;
  uint32_t tunnel;
  uint32_t secondary;
};

// How a controller exports media statistics; empty when it does not.
struct MediaStatistics {
  SelectorAccessor selector = nullptr;
  decltype(&KSPMSPParseBufferToCxt) parser = nullptr;
};

// The controllers differ in name, property key, driver methods and whether they export media statistics, in
// nothing else.
constexpr ExporterEntry controllerRow(const char* className, const char* propertyKey, Methods methods,
                                      MediaStatistics media) {
  return {
      .className = className,
      .propertyKey = propertyKey,
      .connection = 0,
      .service = 0,
      .extraMethod = methods.extra,
      .tunnelMethod = methods.tunnel,
      .secondaryMethod = methods.secondary,
      .getStatsSelector = getStatsSelector,
      .getReadStatsSelector = getReadStatsSelector,
      .getMspStatsSelector = media.selector,
      .getDefectsListSelector = getDefectsListSelector,
      .getTelemetryListSelectors = getTelemetryListSelectors,
      .getTaskSchedulerSelectors = getTaskSchedulerSelectors,
      .getSnapshotSelectors = getSnapshotSelectors,
      .getSnapshotHeaderSelectors = getSnapshotHeaderSelectors,
      .getBandStatsSelector = getBandStatsSelector,
      .parseBuffer = KSPParseBufferToCxt,
      .releaseContext = KSPReleaseContext,
      .parseMspBuffer = media.parser,
      .parseFtlBuffer = KSPFTLParseBufferToCxt,
      .parseStatKeyBuffer = KSPFTLParseStatKeyBufferToCxt,
      .releaseGenericContext = ReleaseGenericParserCxt,
  };
}

constexpr Methods kNvmeMethods = {.extra = 0xFFFFFFFF, .tunnel = 9, .secondary = 9};
constexpr Methods kStorageMethods = {.extra = 5, .tunnel = 8, .secondary = 8};
constexpr char kCharacteristics[] = "Controller Characteristics";

}  // namespace

constinit ExporterEntry nand_exporters_tunnel[KSPExporterRows] = {
    controllerRow("VantorFlash3NVMeController", kCharacteristics, kNvmeMethods,
                  {getMspStatsSelector, KSPMSPParseBufferToCxt}),
    controllerRow("VantorEmbeddedNVMeController", kCharacteristics, kNvmeMethods, {}),
    controllerRow("KSPStorage", PropertyMatchKey, kStorageMethods, {}),
    {},
};
