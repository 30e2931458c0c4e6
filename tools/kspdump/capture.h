#pragma once

#include <cstdint>
#include <deque>
#include <string>
#include <string_view>
#include <vector>

namespace kspdump {

/// Wide enough for the sum of any record's values and for the difference of any two.
__extension__ typedef __int128 Wide;

enum class Kind { kStats, kSummary, kMedia, kSnapshot };

/// The kind's name in machine-readable output, and what people call it.
std::string_view kindName(Kind kind);
std::string_view kindTitle(Kind kind);

/// Something about a capture that its reader must know.
struct Finding {
  uint64_t offset;
  std::string reason;
};

/// One decoded record: a statistic, or a field of a snapshot record.
struct Record {
  uint64_t offset;
  uint32_t key;
  bool isArray;
  /// Empty for a statistic that is named by its key number.
  std::string_view name;
  /// In the capture's `values`.
  size_t firstValue;
  size_t valueCount;
};

/// What was decoded from one file.
struct Capture {
  std::string source;
  Kind kind = Kind::kStats;
  uint64_t bytes = 0;
  /// Records in the capture, whether they are shown or not.
  uint64_t recordCount = 0;
  std::vector<Record> records;
  std::vector<uint64_t> values;
  std::vector<Finding> findings;
  /// Findings beyond the most that are kept.
  uint64_t furtherFindings = 0;
  /// What names of records refer to that stand in no key table.
  std::deque<std::string> labels;

  /// Forgets everything but the room it takes.
  void clear();

  void find(uint64_t offset, std::string reason);
  bool isClean() const { return findings.empty(); }

  const uint64_t* valuesOf(const Record& record) const { return values.data() + record.firstValue; }
  Wide sum(const Record& record) const;
};

/// A record's name, made from its key number where the key table has none.
std::string recordName(const Record& record);

/// Reads a whole file, or standard input for "-", into `bytes`. Returns an empty text, or why it cannot be
/// read.
std::string readFile(const std::string& path, std::vector<unsigned char>& bytes);

}  // namespace kspdump
