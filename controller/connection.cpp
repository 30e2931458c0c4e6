// SPDX-License-Identifier: Apache-2.0
#include "ksp/connection.h"

#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>

#include "controller/lookup.h"
#include "platform/driver_service.h"

// Clients of other languages read it by offset.
static_assert(offsetof(KSPConnection, service) == 0 && offsetof(KSPConnection, connection) == 4 &&
              offsetof(KSPConnection, exporter) == 8 && sizeof(KSPConnection) == 8 + sizeof(void*));

namespace {

constexpr uint32_t kConnectionType = 0;

// Closing and releasing are the same for a row and for a caller's record; both hold a pair of handles.
template <class Holder>
void giveBack(Holder& holder) {
  if (holder.connection != 0) {
    CloseServiceConnection(holder.connection);
    holder.connection = 0;
  }
  if (holder.service != 0) {
    ReleaseServiceObject(holder.service);
    holder.service = 0;
  }
}

// Looks the controller up once more and opens it through that lookup's own service handle, which does not
// outlive the call. Returns the connection's handle, 0 for none.
uint32_t openThroughOwnLookup(ExporterEntry*& row) {
  const uint32_t service = findNandExporter(&row);
  if (service == 0) {
    std::fputs("No class found", stderr);
    return 0;
  }
  uint32_t connection = 0;
  const int32_t result = OpenServiceConnection(service, getpid(), kConnectionType, &connection);
  ReleaseServiceObject(service);
  row->connection = connection;
  if (result != 0) {
    std::fprintf(stderr, "OpenServiceConnection failed for class '%s', result 0x%x\n", row->className,
                 static_cast<uint32_t>(result));
  }
  return connection;
}

int refuse(KSPConnection& connection, const char* reason) {
  std::fputs(reason, stderr);
  closeKSPConnection(&connection);
  return 0;
}

}  // namespace

int findNandExporterNew(ExporterEntry** entry) {
  *entry = nullptr;
  uint32_t connection = 0;
  uint32_t openedService = 0;
  ExporterEntry& row = ksp::findController([&](const ExporterEntry& candidate, uint32_t service) {
    if (OpenServiceConnection(service, getpid(), kConnectionType, &connection) == 0) {
      ksp::noticeFound("findNandExporterNew", candidate);
      openedService = service;
      return true;
    }
    CloseServiceConnection(connection);
    connection = 0;
    ReleaseServiceObject(service);
    return false;
  });
  row.connection = connection;
  row.service = openedService;
  *entry = &row;
  return openedService != 0 ? 1 : 0;
}

void ReleaseIOInterfaces(ExporterEntry* entry) {
  giveBack(*entry);
}

int openKSPConnection(KSPConnection* connection) {
  connection->connection = 0;
  connection->service = findNandExporter(&connection->exporter);
  if (connection->service == 0) {
    return refuse(*connection, "Can't get KSP Connection, no matching service!\n");
  }
  connection->connection = openThroughOwnLookup(connection->exporter);
  if (connection->exporter->getStatsSelector == getStatsSelector && connection->connection != 0) return 1;
  return refuse(*connection, "Can't get KSP Connection!\n");
}

void closeKSPConnection(KSPConnection* connection) {
  giveBack(*connection);
}
