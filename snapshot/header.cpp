// SPDX-License-Identifier: Apache-2.0
#include "snapshot/header.h"

#include <algorithm>
#include <cstring>

#include "ksp/detail/little_endian.hpp"
#include "snapshot/word.h"

namespace ksp {

FieldDescriptor SnapshotHeader::descriptor(uint32_t index) const {
  const uint8_t* bytes =
      bytes_ + uint64_t{tableOffset()} + kTableFixedBytes + uint64_t{kDescriptorBytes} * index;
  return {
      .type = loadLittleEndian<uint16_t>(bytes),
      .offset = loadWord(bytes + 4),
      .size = loadWord(bytes + 8),
      .format = reinterpret_cast<const char*>(bytes + 12),
  };
}

uint32_t SnapshotHeader::endOfRecords(uint64_t length) const {
  const uint32_t last = std::max(recordCount(), 1U) - 1;
  if (recordSize() == 0) return last;
  return static_cast<uint32_t>(std::min<uint64_t>(last, length / recordSize()));
}

bool SnapshotHeader::holds(const FieldDescriptor& field) const {
  const uint64_t size = field.type == kFieldTriples ? field.size : kWordBytes;
  return uint64_t{field.offset} + size <= recordSize();
}

std::optional<uint32_t> SnapshotHeader::keyOffset() const {
  if (descriptorCount() == 0) return std::nullopt;
  const FieldDescriptor first = descriptor(0);
  if (!holds(first) || uint64_t{first.offset} + kWordBytes > recordSize()) return std::nullopt;
  return first.offset;
}

const char* snapshotHeaderFault(const void* header, uint64_t size) {
  if (size < SnapshotHeader::kFixedBytes) return "is shorter than its fixed 36 bytes";
  const SnapshotHeader reader(header);
  if (reader.hasTitle() &&
      std::memchr(reader.title(), '\0', static_cast<size_t>(size) - SnapshotHeader::kFixedBytes) == nullptr) {
    return "has a title without an end";
  }
  const uint64_t table = uint64_t{reader.tableOffset()} + SnapshotHeader::kTableFixedBytes;
  if (table > size) return "has its descriptor table behind its end";
  if (reader.descriptorCount() > (size - table) / SnapshotHeader::kDescriptorBytes) {
    return "counts more descriptors than it holds";
  }
  return nullptr;
}

}  // namespace ksp
