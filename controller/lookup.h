// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "ksp/exporter.h"
#include "platform/driver_service.h"

namespace ksp {

/// Walks the exporter table in order and hands each controller that is present to `accept`.
///
/// `accept(row, service)` is called with the row and the handle of its driver's service, which it takes over;
/// it returns whether the search ends with this row. Returns the row that was accepted, or the terminator
/// row.
template <class Accept>
ExporterEntry& findController(Accept accept) {
  ExporterEntry* row = nand_exporters_tunnel;
  for (; row->className != nullptr; ++row) {
    MatchingRequest* request = ServiceMatchByClass(row->className);
    if (request == nullptr) continue;
    const uint32_t service = GetMatchingService(DefaultRegistry, request);
    if (service != 0 && accept(*row, service)) break;
  }
  return *row;
}

/// Tells the system's log which controller `operation` found.
void noticeFound(const char* operation, const ExporterEntry& row);

}  // namespace ksp
