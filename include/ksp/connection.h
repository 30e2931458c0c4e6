// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_CONNECTION_H
#define KSP_CONNECTION_H

/*
 * Connections to a storage controller.
 *
 * There are two ways, each a pair of functions; use one pair or the other for a given connection:
 * `findNandExporterNew` keeps the handles in the row of the exporter table until `ReleaseIOInterfaces`;
 * `openKSPConnection` keeps them in the caller's record until `closeKSPConnection`. All but
 * `closeKSPConnection` write the exporter table's handle fields, so callers serialise them.
 */

#include <stdint.h>

#include "ksp/api.h"
#include "ksp/exporter.h"

KSP_BEGIN_DECLARATIONS

typedef struct KSPConnection {
  /** Service handle of the controller's driver, 0 when there is none. */
  uint32_t service;
  /** Handle of the open connection, 0 when there is none. */
  uint32_t connection;
  /** Row of the exporter table. */
  ExporterEntry* exporter;
} KSPConnection;

/**
 * Finds the first controller that accepts a connection and opens it.
 *
 * A controller that is present but refuses does not end the search. Sets `*entry`, which must not be null, to
 * the row that now holds both handles, or to the terminator row. Writes a notice to syslog on success.
 * Returns 1, or 0 when no controller could be opened; nothing stays open then.
 */
KSP_API int findNandExporterNew(ExporterEntry** entry);

/** Closes the row's connection and releases its service, where it holds them, and clears both handles. */
KSP_API void ReleaseIOInterfaces(ExporterEntry* entry);

/**
 * Finds the first present controller and opens a connection to it.
 *
 * `connection` must not be null and needs no initialisation. The connection handle is also copied into the
 * row, where it stays: the record owns it, so never hand that row to `ReleaseIOInterfaces`.
 * Returns 1; or 0 with the reason on standard error, both handles 0 and everything released.
 */
KSP_API int openKSPConnection(KSPConnection* connection);

/** Closes the connection and releases the service, where the record holds them, and clears both handles. */
KSP_API void closeKSPConnection(KSPConnection* connection);

KSP_END_DECLARATIONS

#endif
