// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_EXPORTER_H
#define KSP_EXPORTER_H

/*
 * The storage controllers that the library knows, and the lookup that finds which of them is present.
 */

#include <stdint.h>

#include "ksp/api.h"
#include "ksp/context.h"

KSP_BEGIN_DECLARATIONS

/** Names one controller command by its selector number. Both words hold the same number. */
typedef struct SelectorPair {
  uint32_t word0;
  uint32_t word1;
} SelectorPair;

typedef const SelectorPair* (*SelectorAccessor)(void);

/**
 * One row of the exporter table: a controller's driver and how to talk to it.
 *
 * A null accessor or parser slot means that the controller does not offer that export. A parser that fills a
 * context is paired with the release function for that kind of context.
 */
typedef struct ExporterEntry {
  /** Driver class; null in the terminator row alone. */
  const char* className;
  /** Key of a property of the driver; for clients. */
  const char* propertyKey;
  /** Handle of the open connection, 0 when there is none; see <ksp/connection.h>. */
  uint32_t connection;
  /** Handle of the driver's service, 0 when there is none; see <ksp/connection.h>. */
  uint32_t service;
  /** For clients. */
  uint32_t extraMethod;
  /** Driver method through which commands are sent. */
  uint32_t tunnelMethod;
  /** For clients. */
  uint32_t secondaryMethod;
  SelectorAccessor getStatsSelector;
  SelectorAccessor getReadStatsSelector;
  SelectorAccessor getMspStatsSelector;
  SelectorAccessor getDefectsListSelector;
  SelectorAccessor getTelemetryListSelectors;
  SelectorAccessor getTaskSchedulerSelectors;
  SelectorAccessor getSnapshotSelectors;
  SelectorAccessor getSnapshotHeaderSelectors;
  SelectorAccessor getBandStatsSelector;
  /** `KSPParseBufferToCxt`, paired with `releaseContext`. */
  int (*parseBuffer)(KSPParseContext* context, const void* stream, uint32_t length);
  void (*releaseContext)(KSPParseContext* context);
  /** `KSPMSPParseBufferToCxt`, paired with `releaseGenericContext`; filled where `getMspStatsSelector` is. */
  uint32_t (*parseMspBuffer)(GenericParserContext* context, const void* buffer, uint32_t length);
  /** `KSPFTLParseBufferToCxt`, paired with `releaseGenericContext`. */
  uint32_t (*parseFtlBuffer)(GenericParserContext* context, const void* stream, uint32_t length);
  /** `KSPFTLParseStatKeyBufferToCxt`, paired with `releaseGenericContext`. */
  uint32_t (*parseStatKeyBuffer)(GenericParserContext* context, const void* stream, uint32_t length);
  void (*releaseGenericContext)(GenericParserContext* context);
} ExporterEntry;

enum { KSPExporterRows = 4 };

/** The known controllers in the order in which they are tried, then the all-zero terminator row. */
KSP_API extern ExporterEntry nand_exporters_tunnel[KSPExporterRows];

KSP_API extern const SelectorPair statsSelector;
KSP_API extern const SelectorPair readStatsSelector;
KSP_API extern const SelectorPair mspStatsSelector;
KSP_API extern const SelectorPair bandStatsSelector;
KSP_API extern const SelectorPair defectsListSelector;
KSP_API extern const SelectorPair telemetryListSelectors;
KSP_API extern const SelectorPair taskSchedulerSelectors;
KSP_API extern const SelectorPair snapshotSelectors;
KSP_API extern const SelectorPair snapshotHeaderSelectors;

/* Each accessor returns the address of the selector pair that it is named after. */
KSP_API const SelectorPair* getStatsSelector(void);
KSP_API const SelectorPair* getReadStatsSelector(void);
KSP_API const SelectorPair* getMspStatsSelector(void);
KSP_API const SelectorPair* getDefectsListSelector(void);
KSP_API const SelectorPair* getTelemetryListSelectors(void);
KSP_API const SelectorPair* getTaskSchedulerSelectors(void);
KSP_API const SelectorPair* getSnapshotSelectors(void);
KSP_API const SelectorPair* getSnapshotHeaderSelectors(void);
KSP_API const SelectorPair* getBandStatsSelector(void);

/**
 * Finds the first controller of the exporter table whose driver is present.
 *
 * Sets `*entry`, which must not be null, to the controller's row, or to the terminator row when there is
 * none. Returns the driver's service handle, which the caller releases with the platform's
 * `ReleaseServiceObject`, or 0. Writes a notice to syslog when a controller is found. Opens nothing and only
 * reads the table, so any thread may call it.
 */
KSP_API uint32_t findNandExporter(ExporterEntry** entry);

KSP_END_DECLARATIONS

#endif
