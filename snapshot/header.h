// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <optional>

#include "snapshot/word.h"

namespace ksp {

/// The kinds of field that a descriptor can announce; a field of any other kind is not printed.
enum FieldType : uint16_t {
  kFieldNumber = 0,
  kFieldOtherNumber = 1,  // printed like the first
  kFieldThousandths = 2,
  kFieldTriples = 3,
};

/// Tells where a field lies in a record and how it is printed. All of it may be hostile.
struct FieldDescriptor {
  uint16_t type;
  uint32_t offset;
  uint32_t size;       // of a triple array; any other field is one word
  const char* format;  // kFormatBytes bytes in the header itself, not necessarily with a NUL

  static constexpr uint32_t kFormatBytes = 16;
};

/// Reads a snapshot's header where it lies. The header outlives the reader.
class SnapshotHeader {
 public:
  static constexpr uint32_t kFixedBytes = 36;
  static constexpr uint32_t kTableFixedBytes = 8;
  static constexpr uint32_t kDescriptorBytes = 28;

  explicit SnapshotHeader(const void* bytes) : bytes_(static_cast<const uint8_t*>(bytes)) {}

  uint32_t version() const { return loadWord(bytes_ + 4); }
  uint32_t recordSize() const { return loadWord(bytes_ + 8); }
  uint32_t recordCount() const { return loadWord(bytes_ + 12); }
  uint32_t tableOffset() const { return loadWord(bytes_ + 24); }

  /// Older headers have no title; their first page explains the labels instead.
  bool hasTitle() const { return version() >= 6; }
  const char* title() const { return reinterpret_cast<const char*>(bytes_ + kFixedBytes); }

  uint32_t descriptorCount() const { return loadWord(bytes_ + tableOffset()); }
  FieldDescriptor descriptor(uint32_t index) const;

  /// Offset of a record from the first one: a product of 32 bits, as the controller computes it.
  uint32_t recordOffset(uint32_t index) const { return index * recordSize(); }

  /// The first record index that is not rendered, of records in `length` bytes: the last slot, or the first
  /// one that does not lie wholly in them.
  ///
  /// A product of 32 bits comes back into the buffer again and again, so the records that the buffer has room
  /// for are the bound: no start lies behind index times size, all of them are inside, and no walk over them
  /// is longer than the buffer.
  uint32_t endOfRecords(uint64_t length) const;

  /// Whether a field lies within a record.
  bool holds(const FieldDescriptor& field) const;

  /// Where a record's key lies in it: the first word of the first descriptor's field. Without one that can be
  /// read no slot is in use.
  std::optional<uint32_t> keyOffset() const;
  bool hasKey() const { return keyOffset().has_value(); }

 private:
  const uint8_t* bytes_;
};

/// Tells whether `size` bytes hold a whole snapshot header: its fixed part, the title with its NUL if it has
/// one, and the descriptor table with every descriptor that it counts. What the fields say is not judged.
///
/// Returns null for a whole header, else what is wrong, as the end of a sentence about the header ("the
/// header ..."). No byte behind `size` is read; `header` may be null if `size` is 0.
const char* snapshotHeaderFault(const void* header, uint64_t size);

}  // namespace ksp
