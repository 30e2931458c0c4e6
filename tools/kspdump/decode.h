#pragma once

#include <functional>
#include <span>
#include <string>

#include "tools/kspdump/capture.h"

namespace kspdump {

/// What to decode a capture as, and which of its records to keep.
struct Decoding {
  Kind kind = Kind::kStats;
  /// Name statistics by their key number.
  bool byNumber = false;
  /// Shell pattern that a record's name must match; empty keeps all.
  std::string match;
  /// Called when many records are decoded, so that a caller can take them from the capture.
  std::function<void(Capture&)> whenMany = [](Capture&) {};
  /// The snapshot's header; empty for the fixed layout.
  std::span<const unsigned char> header;
};

/// Decodes a capture as far as it goes and names whatever is wrong with it; `capture` may hold another one.
void decode(std::span<const unsigned char> bytes, const std::string& source, const Decoding& decoding,
            Capture& capture);

}  // namespace kspdump
