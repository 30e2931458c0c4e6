#include "snapshot/header.h"

#include <cstring>

namespace ksp {

FieldDescriptor SnapshotHeader::descriptor(uint32_t index) const {
  const uint8_t* bytes =
      bytes_ + uint64_t{tableOffset()} + kTableFixedBytes + uint64_t{kDescriptorBytes} * index;
  return {
      .type = static_cast<uint16_t>(bytes[0] | bytes[1] << 8),
      .offset = loadWord(bytes + 4),
      .size = loadWord(bytes + 8),
      .format = reinterpret_cast<const char*>(bytes + 12),
  };
}

const char* snapshotHeaderFault(const void* header, uint64_t size) {
  if (size < SnapshotHeader::kFixedBytes) return "is shorter than its fixed 36 bytes";
  const SnapshotHeader reader(header);
  if (reader.hasTitle() && std::memchr(reader.title(), '\0', size - SnapshotHeader::kFixedBytes) == nullptr) {
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
