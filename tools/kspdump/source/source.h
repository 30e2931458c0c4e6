#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace kspdump {

/// A capture as it comes from a source: its bytes, or why it cannot be read.
struct Input {
  std::string name;
  std::vector<unsigned char> bytes;
  /// Empty for a capture that was read.
  std::string fault;
};

/// Where captures come from, one after another.
class Source {
 public:
  Source() = default;
  Source(const Source&) = delete;
  Source& operator=(const Source&) = delete;
  virtual ~Source() = default;

  /// Takes the next capture. Returns false, `input` as it was, when there is none. Several threads may call.
  virtual bool next(Input& input) = 0;
};

/// Reads a whole file, or standard input for "-", into `bytes`. Returns an empty text, or why it cannot be
/// read.
std::string readFile(const std::string& path, std::vector<unsigned char>& bytes);

}  // namespace kspdump
