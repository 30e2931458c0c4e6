#pragma once

#include <functional>
#include <span>
#include <string>
#include <string_view>

#include "tools/kspdump/capture.h"

namespace kspdump {

using Bytes = std::span<const unsigned char>;

/// Returns null for a header that can be used, else what is wrong with it.
const char* headerFault(Bytes header);

/// Names what is wrong with a snapshot, of the fixed layout or, where `header` is not empty, of its own.
void findSnapshotFaults(Capture& capture, Bytes records, Bytes header);

/// Hands every field of a snapshot's records to `add(offset, record, label, isArray, offsets)`, where the
/// offsets are those of the field's words. The labels are those of the report; they live in the capture.
using AddField = std::function<void(uint64_t offset, uint32_t record, std::string_view label, bool isArray,
                                    std::span<const uint64_t> words)>;
void decodeSnapshot(Capture& capture, Bytes records, Bytes header, const AddField& add);

/// Writes the text report of all records, page by page.
void reportSnapshot(Capture& capture, Bytes records, Bytes header,
                    const std::function<void(std::string_view)>& write);

}  // namespace kspdump
